#pragma once

// Iteration over the values of a generated enumeration.

#include <array>

namespace ndk {
namespace internal {

// Specialized by the generated header of every enumeration.
template <typename EnumType>
extern const std::array<EnumType, 0> enum_values;

}  // namespace internal

// for (auto value : ndk::enum_range<DeviceType>()) ... visits every declared value.
template <typename EnumType>
struct enum_range {
  constexpr auto begin() const { return std::begin(internal::enum_values<EnumType>); }
  constexpr auto end() const { return std::end(internal::enum_values<EnumType>); }
};

}  // namespace ndk
