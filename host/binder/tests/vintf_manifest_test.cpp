#include "vintf_manifest.h"

#include <stdlib.h>
#include <unistd.h>

#include <optional>
#include <string>

#include <gtest/gtest.h>

namespace {

using ndk::host::VintfManifest;

// An AIDL entry of package a.b with |body| inside.
std::string Aidl(const std::string& body) {
  return "<manifest><hal format='aidl'><name>a.b</name>" + body + "</hal></manifest>";
}

struct ManifestCase {
  const char* name;
  std::string xml;
  const char* declared = nullptr;      // declared, at |version|, as the first instance
  const char* not_declared = nullptr;  // not declared; null: the manifest must not load
  int version = 0;
};

const ManifestCase kCases[] = {
    {"FqName", Aidl("<version>2</version><fqname>IFoo/default</fqname>"), "a.b.IFoo/default",
     "a.b.IFoo/other", 2},
    {"InterfaceBlock",
     Aidl("<interface><name>IFoo</name><instance>x</instance><instance>y</instance></interface>"),
     "a.b.IFoo/x", "a.c.IFoo/y", 1},
    {"HidlEntriesDeclareNoAidl",
     "<manifest><hal format='hidl'><name>a.b</name><fqname>@1.0::IFoo/default</fqname></hal>"
     "</manifest>",
     nullptr, "a.b.IFoo/default"},
    {"NotWellFormed", "<manifest><hal format='aidl'><name>a.b</name></manifest>"},
    {"WrongRoot", "<compatibility-matrix/>"},
    {"VersionNotANumber", Aidl("<version>1x</version><fqname>IFoo/default</fqname>")},
    {"VersionZero", Aidl("<version>0</version><fqname>IFoo/default</fqname>")},
    {"FqNameWithoutInstance", Aidl("<fqname>IFoo/</fqname>")},
    {"NoInstance", Aidl("")},
};

class VintfManifestTest : public ::testing::TestWithParam<ManifestCase> {};

TEST_P(VintfManifestTest, Loads) {
  const ManifestCase& c = GetParam();
  char path[] = "/tmp/vintf_manifest_test_XXXXXX";
  const int fd = mkstemp(path);
  ASSERT_GE(fd, 0);
  ASSERT_EQ(static_cast<ssize_t>(c.xml.size()), write(fd, c.xml.data(), c.xml.size()));
  close(fd);
  std::string error;
  std::optional<VintfManifest> manifest = VintfManifest::Load(path, &error);
  unlink(path);
  ASSERT_EQ(c.not_declared != nullptr, manifest.has_value()) << error;
  if (!manifest.has_value()) {
    EXPECT_NE(std::string::npos, error.find(path)) << error;
    return;
  }
  if (c.declared != nullptr) {
    EXPECT_TRUE(manifest->Declares(c.declared));
    EXPECT_EQ(c.declared, manifest->instances().front().Name());
    EXPECT_EQ(c.version, manifest->instances().front().version);
  }
  EXPECT_FALSE(manifest->Declares(c.not_declared));
}

INSTANTIATE_TEST_SUITE_P(Manifests, VintfManifestTest, ::testing::ValuesIn(kCases),
                         [](const auto& info) { return std::string(info.param.name); });

}  // namespace
