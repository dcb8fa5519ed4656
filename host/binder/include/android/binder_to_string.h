#pragma once

// Text forms used by the toString() of generated parcelables: decimal
// numbers (bytes signed, byte-array elements unsigned), "true"/"false",
// enumerations through their generated toString, nested parcelables through
// their own toString(), and "[a, b]" lists.

#include <memory>
#include <optional>
#include <string>
#include <type_traits>
#include <vector>

namespace android {
namespace internal {

template <typename T, typename = void>
struct HasToStringMember : std::false_type {};
template <typename T>
struct HasToStringMember<T, std::void_t<decltype(std::declval<const T&>().toString())>>
    : std::true_type {};

template <typename T>
std::string ToString(const T& value);

template <typename T>
std::string ToString(const std::vector<T>& values) {
  std::string text = "[";
  for (size_t i = 0; i < values.size(); ++i) {
    if (i > 0) text += ", ";
    text += ToString(values[i]);
  }
  return text + "]";
}

template <typename T>
std::string ToString(const std::optional<T>& value) {
  return value.has_value() ? ToString(*value) : "(null)";
}

template <typename T>
std::string ToString(const std::shared_ptr<T>& value) {
  return value ? "(interface)" : "(null)";
}

template <typename T>
std::string ToString(const T& value) {
  if constexpr (std::is_same_v<T, bool>) {
    return value ? "true" : "false";
  } else if constexpr (std::is_same_v<T, std::string>) {
    return value;
  } else if constexpr (std::is_enum_v<T>) {
    return toString(value);  // the generated free function, found by ADL
  } else if constexpr (std::is_arithmetic_v<T>) {
    // int8_t and uint8_t promote to int, so bytes print as numbers.
    return std::to_string(value);
  } else {
    static_assert(HasToStringMember<T>::value, "no text form for this type");
    return value.toString();
  }
}

}  // namespace internal
}  // namespace android
