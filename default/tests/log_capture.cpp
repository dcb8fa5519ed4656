#include "tests/log_capture.h"

#include <algorithm>

namespace hardware {
namespace dalix {

LogCapture::LogCapture()
    : previous_minimum_(android::base::SetMinimumLogSeverity(android::base::VERBOSE)) {
  android::base::SetLogger([this](android::base::LogId, android::base::LogSeverity severity,
                                  const char* tag, const char*, unsigned int, const char* message) {
    std::lock_guard<std::mutex> lock(mutex_);
    entries_.push_back({severity, tag ? tag : "", message ? message : ""});
  });
}

LogCapture::~LogCapture() {
  android::base::SetLogger(android::base::StderrLogger);
  android::base::SetMinimumLogSeverity(previous_minimum_);
}

std::vector<LogCapture::Entry> LogCapture::Entries() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return entries_;
}

int LogCapture::Count(android::base::LogSeverity severity, const std::string& message,
                      const char* tag) const {
  std::lock_guard<std::mutex> lock(mutex_);
  return std::count_if(entries_.begin(), entries_.end(), [&](const Entry& entry) {
    return entry.severity == severity && entry.message == message &&
           (tag == nullptr || entry.tag == tag);
  });
}

std::string LogCapture::Text() const {
  std::lock_guard<std::mutex> lock(mutex_);
  std::string text;
  for (const Entry& entry : entries_) {
    text += std::to_string(entry.severity) + " " + entry.tag + ": " + entry.message + "\n";
  }
  return text;
}

void LogCapture::Reset() {
  std::lock_guard<std::mutex> lock(mutex_);
  entries_.clear();
}

}  // namespace dalix
}  // namespace hardware
