#pragma once

#include <netlink/msg.h>

#include <android-base/logging.h>

namespace hardware {
namespace dalix {

// Owns one libnl message for the duration of a request. Header-only, so a
// failed allocation is reported under the including file's log tag.
class UniqueNlMsg {
 public:
  UniqueNlMsg() : msg_(nlmsg_alloc()) { CHECK(msg_) << "BAD ALLOC IN UniqueNlMsg constructor"; }
  ~UniqueNlMsg() {
    if (msg_ != nullptr) nlmsg_free(msg_);
  }

  UniqueNlMsg(UniqueNlMsg&& other) noexcept : msg_(other.msg_) { other.msg_ = nullptr; }
  UniqueNlMsg& operator=(UniqueNlMsg&& other) noexcept {
    if (this != &other) {
      if (msg_ != nullptr) nlmsg_free(msg_);
      msg_ = other.msg_;
      other.msg_ = nullptr;
    }
    return *this;
  }
  UniqueNlMsg(const UniqueNlMsg&) = delete;
  UniqueNlMsg& operator=(const UniqueNlMsg&) = delete;

  nl_msg* get() const { return msg_; }

 private:
  nl_msg* msg_;
};

}  // namespace dalix
}  // namespace hardware
