#pragma once

#include <map>
#include <string>

namespace hardware {
namespace dalix {

// Removes leading and trailing blanks and 0x09-0x0D characters in place.
void trim(std::string* str);

// Ordered key/value store loaded from "key = value" text files (HAL
// properties, calibration). Keys and values are opaque strings. Used on the
// service thread only.
class ConfigUtils {
 public:
  using Map = std::map<std::string, std::string>;

  ConfigUtils() = default;
  virtual ~ConfigUtils() = default;

  // Adds the file's entries to the store, later lines and files winning.
  virtual bool Load(const char* path);
  // Writes every entry as "key = value" with no separator between entries.
  virtual bool Save(const char* path);
  virtual void Clear();
  virtual bool IsEmpty();
  virtual void Dump();
  virtual const char* GetValue(const char* key);
  // Iterates over keys: GetNext(true) starts over; null marks the end and
  // rewinds, so the next call starts from the first key again.
  virtual const char* GetNext(bool restart);
  // Stores the pair unchanged and rewinds the GetNext cursor.
  virtual bool Set(const char* key, const char* value);

  Map::iterator GetIterator() { return map_.begin(); }
  Map::iterator GetEnd() { return map_.end(); }

 private:
  void ParseLine(const std::string& line);

  Map map_;
  Map::iterator cursor_{};
  bool cursor_set_ = false;
};

}  // namespace dalix
}  // namespace hardware
