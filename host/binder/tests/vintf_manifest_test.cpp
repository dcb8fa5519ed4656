#include "vintf_manifest.h"

#include <cstdio>
#include <fstream>
#include <optional>
#include <string>

#include <gtest/gtest.h>

namespace {

using ndk::host::VintfManifest;

// An AIDL entry of package a.b with |body| inside.
std::string Aidl(const std::string& body) {
  return "<manifest><hal format='aidl'><name>a.b</name>" + body + "</hal></manifest>";
}

TEST(VintfManifestTest, DeclaresTheAidlInstancesOfAWellFormedManifestOnly) {
  const struct {
    std::string xml;
    const char* declared = nullptr;      // declared, at |version|, as the first instance
    const char* not_declared = nullptr;  // not declared; null: the manifest must not load
    int version = 0;
  } cases[] = {
      {Aidl("<version>2</version><fqname>IFoo/default</fqname>"), "a.b.IFoo/default",
       "a.b.IFoo/other", 2},
      {Aidl("<interface><name>IFoo</name><instance>x</instance><instance>y</instance></interface>"),
       "a.b.IFoo/x", "a.c.IFoo/y", 1},
      {"<manifest><hal format='hidl'><name>a.b</name><fqname>@1.0::IFoo/default</fqname></hal>"
       "</manifest>",
       nullptr, "a.b.IFoo/default"},
      {"<manifest><hal format='aidl'><name>a.b</name></manifest>"},  // not well-formed
      {"<compatibility-matrix/>"},
      {Aidl("<version>1x</version><fqname>IFoo/default</fqname>")},
      {Aidl("<version>0</version><fqname>IFoo/default</fqname>")},
      {Aidl("<fqname>IFoo/</fqname>")},
      {Aidl("")},
  };
  const std::string path = ::testing::TempDir() + "vintf_manifest_test.xml";
  for (const auto& c : cases) {
    SCOPED_TRACE(c.xml);
    std::ofstream(path) << c.xml;
    std::string error;
    std::optional<VintfManifest> manifest = VintfManifest::Load(path, &error);
    ASSERT_EQ(c.not_declared != nullptr, manifest.has_value()) << error;
    if (!manifest.has_value()) {
      EXPECT_NE(std::string::npos, error.find(path)) << error;
      continue;
    }
    if (c.declared != nullptr) {
      EXPECT_TRUE(manifest->Declares(c.declared));
      EXPECT_EQ(c.declared, manifest->instances().front().Name());
      EXPECT_EQ(c.version, manifest->instances().front().version);
    }
    EXPECT_FALSE(manifest->Declares(c.not_declared));
  }
  std::remove(path.c_str());
}

}  // namespace
