#include "vintf_manifest.h"

#include <stdio.h>
#include <unistd.h>

#include <memory>
#include <string>

#include <android/binder_manager.h>
#include <binder_host/host.h>
#include <gtest/gtest.h>

namespace {

using ndk::host::VintfManifest;

struct ManifestCase {
  const char* name;
  const char* xml;
  bool loads;
  const char* declared;      // a name the manifest must declare, or null
  const char* not_declared;  // a name it must not declare, or null
  int version;
};

const ManifestCase kCases[] = {
    {"FqName", "<manifest><hal format='aidl'><name>a.b</name><version>2</version>"
               "<fqname>IFoo/default</fqname></hal></manifest>",
     true, "a.b.IFoo/default", "a.b.IFoo/other", 2},
    {"InterfaceBlock", "<manifest><hal format='aidl'><name>a.b</name><interface><name>IFoo"
                       "</name><instance>x</instance><instance>y</instance></interface></hal>"
                       "</manifest>",
     true, "a.b.IFoo/y", "a.c.IFoo/x", 1},
    {"HidlEntriesDeclareNoAidl", "<manifest><hal format='hidl'><name>a.b</name>"
                                 "<fqname>@1.0::IFoo/default</fqname></hal></manifest>",
     true, nullptr, "a.b.IFoo/default", 0},
    {"NotWellFormed", "<manifest><hal format='aidl'><name>a.b</name></manifest>", false, nullptr, nullptr, 0},
    {"WrongRoot", "<compatibility-matrix/>", false, nullptr, nullptr, 0},
    {"VersionNotANumber", "<manifest><hal format='aidl'><name>a.b</name><version>1x</version>"
                          "<fqname>IFoo/default</fqname></hal></manifest>", false, nullptr, nullptr, 0},
    {"VersionZero", "<manifest><hal format='aidl'><name>a.b</name><version>0</version>"
                    "<fqname>IFoo/default</fqname></hal></manifest>", false, nullptr, nullptr, 0},
    {"FqNameWithoutInstance", "<manifest><hal format='aidl'><name>a.b</name>"
                              "<fqname>IFoo/</fqname></hal></manifest>", false, nullptr, nullptr, 0},
    {"NoInstance", "<manifest><hal format='aidl'><name>a.b</name></hal></manifest>", false, nullptr, nullptr, 0},
};

class VintfManifestTest : public ::testing::TestWithParam<ManifestCase> {};

TEST_P(VintfManifestTest, Loads) {
  const ManifestCase& c = GetParam();
  char path[] = "/tmp/vintf_manifest_test_XXXXXX";
  const int fd = mkstemp(path);
  ASSERT_GE(fd, 0);
  ASSERT_EQ(static_cast<ssize_t>(strlen(c.xml)), write(fd, c.xml, strlen(c.xml)));
  close(fd);
  std::string error;
  std::optional<VintfManifest> manifest = VintfManifest::Load(path, &error);
  unlink(path);
  ASSERT_EQ(c.loads, manifest.has_value()) << error;
  if (!c.loads) {
    EXPECT_NE(std::string::npos, error.find(path)) << error;
    return;
  }
  if (c.declared != nullptr) {
    EXPECT_TRUE(manifest->Declares(c.declared));
    EXPECT_EQ(c.version, manifest->instances().front().version);
  }
  EXPECT_FALSE(manifest->Declares(c.not_declared));
}

INSTANTIATE_TEST_SUITE_P(Manifests, VintfManifestTest, ::testing::ValuesIn(kCases),
                         [](const auto& info) { return std::string(info.param.name); });

class IThing : public ndk::ICInterface {};
class Thing : public ndk::BnCInterface<IThing> {
  ndk::SpAIBinder createBinder() override {
    return ndk::host::NewLocalBinder("test.IThing", ref<ndk::ICInterface>());
  }
};

// The registry takes only what the service's fragment declares, as the
// device's service manager does.
TEST(ServiceManagerTest, RegistersOnlyDeclaredInstances) {
  ndk::host::ResetForTesting();
  std::string error;
  std::optional<VintfManifest> manifest = VintfManifest::Load(DALIX_VINTF_FRAGMENT, &error);
  ASSERT_TRUE(manifest.has_value()) << error;
  ASSERT_FALSE(manifest->instances().empty());
  const std::string declared = manifest->instances().front().Name();
  auto thing = ndk::SharedRefBase::make<Thing>();
  for (const std::string& name : {declared + "2", "x" + declared, std::string("test.IThing")}) {
    EXPECT_EQ(EX_ILLEGAL_ARGUMENT, AServiceManager_addService(thing->asBinder().get(),
                                                              name.c_str())) << name;
    EXPECT_EQ(nullptr, AServiceManager_checkService(name.c_str())) << name;
  }
  EXPECT_EQ(EX_NONE, AServiceManager_addService(thing->asBinder().get(), declared.c_str()));
  ndk::SpAIBinder found(AServiceManager_checkService(declared.c_str()));
  EXPECT_EQ(thing->asBinder().get(), found.get());
  ndk::host::ResetForTesting();
}

}  // namespace
