#include "vintf_manifest.h"

#include <stdlib.h>

#include <tinyxml2.h>

namespace ndk {
namespace host {
namespace {

using tinyxml2::XMLElement;

const char* TextOf(const XMLElement* parent, const char* child) {
  const XMLElement* element = parent->FirstChildElement(child);
  return element != nullptr && element->GetText() != nullptr ? element->GetText() : "";
}

// "IFoo/default" as the <fqname> form writes an interface and instance.
bool SplitFqName(const std::string& fqname, std::string* interface, std::string* instance) {
  const size_t slash = fqname.find('/');
  if (slash == std::string::npos || slash == 0 || slash + 1 == fqname.size()) return false;
  *interface = fqname.substr(0, slash);
  *instance = fqname.substr(slash + 1);
  return true;
}

bool ParseVersion(const XMLElement* hal, int* version) {
  const XMLElement* element = hal->FirstChildElement("version");
  if (element == nullptr) return true;  // an AIDL entry without one means version 1
  const char* text = element->GetText();
  if (text == nullptr) return false;
  char* end = nullptr;
  const long value = strtol(text, &end, 10);
  if (*end != '\0' || value < 1 || value > 0x7fffffff) return false;
  *version = static_cast<int>(value);
  return true;
}

}  // namespace

std::optional<VintfManifest> VintfManifest::Load(const std::string& path, std::string* error) {
  tinyxml2::XMLDocument document;
  if (document.LoadFile(path.c_str()) != tinyxml2::XML_SUCCESS) {
    *error = path + ": " + document.ErrorStr();
    return std::nullopt;
  }
  const XMLElement* root = document.RootElement();
  if (std::string(root->Name()) != "manifest") {
    *error = path + ": the root element is not <manifest>";
    return std::nullopt;
  }
  VintfManifest manifest;
  for (const XMLElement* hal = root->FirstChildElement("hal"); hal != nullptr;
       hal = hal->NextSiblingElement("hal")) {
    const char* format = hal->Attribute("format");
    if (format == nullptr || std::string(format) != "aidl") continue;
    Instance entry;
    entry.package = TextOf(hal, "name");
    if (entry.package.empty() || !ParseVersion(hal, &entry.version)) {
      *error = path + ": an AIDL <hal> without a name or with a bad <version>";
      return std::nullopt;
    }
    bool any = false;
    for (const XMLElement* fq = hal->FirstChildElement("fqname"); fq != nullptr;
         fq = fq->NextSiblingElement("fqname")) {
      any = true;
      if (fq->GetText() == nullptr || !SplitFqName(fq->GetText(), &entry.interface,
                                                   &entry.instance)) {
        *error = path + ": <fqname> of " + entry.package + " is not <interface>/<instance>";
        return std::nullopt;
      }
      manifest.instances_.push_back(entry);
    }
    for (const XMLElement* iface = hal->FirstChildElement("interface"); iface != nullptr;
         iface = iface->NextSiblingElement("interface")) {
      entry.interface = TextOf(iface, "name");
      for (const XMLElement* inst = iface->FirstChildElement("instance"); inst != nullptr;
           inst = inst->NextSiblingElement("instance")) {
        any = true;
        entry.instance = inst->GetText() != nullptr ? inst->GetText() : "";
        if (entry.interface.empty() || entry.instance.empty()) {
          *error = path + ": an <interface> of " + entry.package + " without name or instance";
          return std::nullopt;
        }
        manifest.instances_.push_back(entry);
      }
    }
    if (!any) {
      *error = path + ": " + entry.package + " declares no instance";
      return std::nullopt;
    }
  }
  return manifest;
}

bool VintfManifest::Declares(const std::string& name) const {
  for (const Instance& entry : instances_) {
    if (entry.Name() == name) return true;
  }
  return false;
}

}  // namespace host
}  // namespace ndk
