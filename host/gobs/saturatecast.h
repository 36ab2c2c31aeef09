// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <limits>
#include <type_traits>

namespace zarn::gobs {

/// Converts a double to `T` by truncation towards zero. Integer types saturate and turn NaN into 0,
/// because an out-of-range cast is undefined; floating types narrow as IEEE 754 does (overflow
/// gives an infinity, NaN stays NaN).
template <typename T>
constexpr T SaturateCast(double value) {
  if constexpr (std::is_floating_point_v<T>) {
    return static_cast<T>(value);
  } else {
    // Both limits become exact doubles: the lowest value is a power of two or zero, and one past
    // the highest is a power of two.
    constexpr auto kLow = static_cast<double>(std::numeric_limits<T>::min());
    constexpr double kPastHigh = 2.0 * static_cast<double>(std::numeric_limits<T>::max() / 2 + 1);
    if (value >= kPastHigh) return std::numeric_limits<T>::max();
    if (value > kLow) return static_cast<T>(value);
    return value <= kLow ? std::numeric_limits<T>::min() : T{0};
  }
}

/// A value that somebody wrote down, as a sample: integers are rounded half away from zero and
/// clamped to the type (NaN becomes 0); floating types narrow.
template <typename T>
constexpr T RoundToSample(double value) {
  if constexpr (std::is_floating_point_v<T>) {
    return SaturateCast<T>(value);
  } else {
    return SaturateCast<T>(value >= 0 ? value + 0.5 : value - 0.5);
  }
}

}  // namespace zarn::gobs
