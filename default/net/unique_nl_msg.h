#pragma once

#include <netlink/msg.h>

#include <android-base/logging.h>

namespace hardware {
namespace dalix {

// Owns one libnl message for the duration of a request. A failed allocation
// is fatal; its line goes under |log_tag|, which callers give as their own
// LOG_TAG (the tag is a parameter, not the macro, so that every file sees the
// same inline body), or under the process's default tag when none is given.
class UniqueNlMsg {
 public:
  UniqueNlMsg() : UniqueNlMsg(nullptr) {}
  explicit UniqueNlMsg(const char* log_tag) : msg_(nlmsg_alloc()) {
    if (msg_ == nullptr) {
      android::base::LogMessage(__FILE__, __LINE__, android::base::FATAL, log_tag, -1).stream()
          << "Check failed: msg_ BAD ALLOC IN UniqueNlMsg constructor";
    }
  }
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
