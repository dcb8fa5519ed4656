#pragma once

#include <memory>
#include <string>

#include <android/binder_ibinder.h>

namespace hardware {
namespace dalix {
namespace tools {

// The diagnostic dump of the service behind |binder|, as dumpsys shows it;
// a line saying why when it cannot be had. Blocks the caller until the
// service has written it.
std::string DumpService(AIBinder* binder);

}  // namespace tools
}  // namespace dalix
}  // namespace hardware
