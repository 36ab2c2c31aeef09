// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <type_traits>

#include "host/gobs/datatypes.h"

namespace zarn::testsupport {

/// The sample types that the filters handle.
using HandledTypes = ::testing::Types<std::uint8_t, std::int8_t, std::uint16_t, std::int16_t,
                                      std::uint32_t, std::int32_t, float, double>;

/// The code of blocks of type `T`, spelled out apart from the library's own tables.
template <typename T>
constexpr gobs::NativeDataTypeCode CodeFor() {
  constexpr auto kPair = [](std::uint32_t unsignedCode) {
    return static_cast<gobs::NativeDataTypeCode>(unsignedCode + (std::is_signed_v<T> ? 1U : 0U));
  };
  if constexpr (std::is_same_v<T, float>) return static_cast<gobs::NativeDataTypeCode>(6);
  if constexpr (std::is_same_v<T, double>) return static_cast<gobs::NativeDataTypeCode>(9);
  if constexpr (sizeof(T) == 1) return kPair(0);
  if constexpr (sizeof(T) == 2) return kPair(2);
  return kPair(4);
}

/// Suffixes of typed test suites.
struct TypeNames {
  template <typename T>
  static std::string GetName(int) {
    if (std::is_floating_point_v<T>) return sizeof(T) == 4 ? "float" : "double";
    return (std::is_signed_v<T> ? "int" : "uint") + std::to_string(8 * sizeof(T));
  }
};

}  // namespace zarn::testsupport
