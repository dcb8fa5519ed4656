#pragma once

// The AIDL HALs that a device's VINTF manifest declares, read from one XML
// fragment. The service manager consults it before it lets a process
// register an instance. Immutable once read, so any thread may ask it.

#include <optional>
#include <string>
#include <vector>

namespace ndk {
namespace host {

class VintfManifest {
 public:
  // One declared instance: "<package>.<interface>/<instance>" at |version|.
  struct Instance {
    std::string package;
    int version = 1;
    std::string interface;
    std::string instance;

    std::string Name() const { return package + "." + interface + "/" + instance; }
  };

  // Reads the fragment at |path|. Null, with the reason in |error|, when the
  // file cannot be read, is not well-formed XML, or an AIDL entry lacks its
  // name or instance or carries a version that is not a positive number.
  static std::optional<VintfManifest> Load(const std::string& path, std::string* error);

  // Whether |name|, in the form a service registers under, is declared.
  bool Declares(const std::string& name) const;

  const std::vector<Instance>& instances() const { return instances_; }

 private:
  std::vector<Instance> instances_;
};

}  // namespace host
}  // namespace ndk
