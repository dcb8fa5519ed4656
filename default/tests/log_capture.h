#pragma once

#include <mutex>
#include <string>
#include <vector>

#include <android-base/logging.h>

namespace hardware {
namespace dalix {

// Records every libbase log line while it is alive, so that tests can assert
// the exact lines that operators and clients rely on. Lines may come from any
// thread; the records are guarded.
class LogCapture {
 public:
  struct Entry {
    android::base::LogSeverity severity;
    std::string tag;
    std::string message;
  };

  LogCapture();
  ~LogCapture();
  LogCapture(const LogCapture&) = delete;
  LogCapture& operator=(const LogCapture&) = delete;

  std::vector<Entry> Entries() const;
  // Number of lines equal to |message| at |severity|, under |tag| unless it is null.
  int Count(android::base::LogSeverity severity, const std::string& message,
            const char* tag = nullptr) const;
  bool Contains(android::base::LogSeverity severity, const std::string& message,
                const char* tag = nullptr) const {
    return Count(severity, message, tag) > 0;
  }
  // Every recorded line, one per row, for failure messages.
  std::string Text() const;
  void Reset();

 private:
  mutable std::mutex mutex_;
  std::vector<Entry> entries_;
  android::base::LogSeverity previous_minimum_;
};

}  // namespace dalix
}  // namespace hardware
