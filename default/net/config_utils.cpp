#define LOG_TAG "dalix.uwb.CongifUtils"

#include "net/config_utils.h"

#include <stdio.h>

#include <memory>

#include <android-base/logging.h>

namespace hardware {
namespace dalix {
namespace {

bool IsTrimmed(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

struct FileCloser {
  void operator()(FILE* file) const { fclose(file); }
};
using UniqueFile = std::unique_ptr<FILE, FileCloser>;

}  // namespace

void trim(std::string* str) {
  size_t end = str->size();
  while (end > 0 && IsTrimmed((*str)[end - 1])) --end;
  size_t begin = 0;
  while (begin < end && IsTrimmed((*str)[begin])) ++begin;
  *str = str->substr(begin, end - begin);
}

bool ConfigUtils::Load(const char* path) {
  if (path == nullptr) {
    LOG(ERROR) << "Load Bad argument";
    return false;
  }
  UniqueFile file(fopen(path, "r"));
  if (!file) {
    LOG(ERROR) << "Load Cannot open file: " << path;
    return false;
  }
  // getline sizes its buffer to the line, so no line is ever cut in two.
  char* raw = nullptr;
  size_t capacity = 0;
  ssize_t length;
  while ((length = getline(&raw, &capacity, file.get())) >= 0) {
    std::string line(raw, static_cast<size_t>(length));
    if (!line.empty() && line.back() == '\n') line.pop_back();
    ParseLine(line);
  }
  free(raw);
  return true;
}

void ConfigUtils::ParseLine(const std::string& line) {
  if (line.empty()) return;
  const size_t comment = line.find_first_of(";#");
  const size_t equals = line.find('=');
  if (equals == std::string::npos || equals + 1 == line.size()) return;
  if (comment != std::string::npos && comment < equals) return;
  std::string key = line.substr(0, equals);
  std::string value = line.substr(
      equals + 1, comment == std::string::npos ? std::string::npos : comment - equals - 1);
  trim(&key);
  trim(&value);
  map_[key] = value;
}

bool ConfigUtils::Save(const char* path) {
  if (path == nullptr) {
    LOG(ERROR) << "Save Bad argument";
    return false;
  }
  UniqueFile file(fopen(path, "w"));
  if (!file) {
    LOG(ERROR) << "Save Cannot open file: " << path;
    return false;
  }
  // Written by length: a value read from a line holding a NUL keeps it.
  for (const auto& [key, value] : map_) {
    const std::string entry = key + " = " + value;
    fwrite(entry.data(), 1, entry.size(), file.get());
  }
  return true;
}

void ConfigUtils::Clear() {
  map_.clear();
  // The cursor stays where it is by contract (iteration restarts only with
  // GetNext(true)), but it now points into freed nodes: never follow it.
  cursor_set_ = false;
}

bool ConfigUtils::IsEmpty() { return map_.empty(); }

void ConfigUtils::Dump() {
  for (const auto& [key, value] : map_) {
    LOG(INFO) << "Dump " << key << "=" << value;
  }
}

const char* ConfigUtils::GetValue(const char* key) {
  if (key == nullptr) {
    LOG(ERROR) << "GetValue Bad argument";
    return nullptr;
  }
  auto it = map_.find(key);
  return it == map_.end() ? nullptr : it->second.c_str();
}

const char* ConfigUtils::GetNext(bool restart) {
  if (restart) {
    cursor_ = map_.begin();
    cursor_set_ = true;
  }
  // A cursor that was never placed, or was invalidated by Clear(), reads as
  // the end: the caller gets null and the next call starts from the first key.
  if (!cursor_set_ || cursor_ == map_.end()) {
    cursor_ = map_.begin();
    cursor_set_ = true;
    return nullptr;
  }
  LOG(INFO) << "GetNext " << cursor_->first << "=" << cursor_->second;
  const char* key = cursor_->first.c_str();
  ++cursor_;
  return key;
}

bool ConfigUtils::Set(const char* key, const char* value) {
  if (key == nullptr || value == nullptr) {
    LOG(ERROR) << "Set Bad argument";
    return false;
  }
  map_[key] = value;
  cursor_ = map_.begin();
  cursor_set_ = true;
  return true;
}

}  // namespace dalix
}  // namespace hardware
