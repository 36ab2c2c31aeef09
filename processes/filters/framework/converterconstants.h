// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <limits>
#include <type_traits>

#include "processes/filters/framework/outputconverter.h"

namespace zarn::processes::filters {

/// Added to a double below 2^51, this leaves the nearest integer, ties to even, in the low bits of
/// the sum, as the unit in the last place is 1 next to 1.5 * 2^52.
inline constexpr double kIntegersInLowBits = 6755399441055744.0;

/// What a converter's vector twin compares with, as doubles. Its bounds do not cross, as those of a
/// converter may that had the no-data value for both. No-data values of integer types come
/// with `kIntegersInLowBits` added; where nothing is avoided they are NaN, which equals nothing.
template <typename T>
struct ConverterConstants {
  explicit ConverterConstants(const OutputConverter<T>& converter)
      : low(static_cast<double>(converter.low())),
        high(static_cast<double>(converter.high())),
        avoids(converter.avoids()) {
    if (!avoids) return;
    constexpr double kAdded = std::is_floating_point_v<T> ? 0.0 : kIntegersInLowBits;
    noData = static_cast<double>(converter.noData()) + kAdded;
    replacement = static_cast<double>(converter.replacement()) + kAdded;
  }

  /// Whether the two convert alike.
  bool operator==(const ConverterConstants& other) const {
    const bool avoidAlike = !avoids || (noData == other.noData && replacement == other.replacement);
    return low == other.low && high == other.high && avoids == other.avoids && avoidAlike;
  }

  double low;
  double high;
  double noData = std::numeric_limits<double>::quiet_NaN();
  double replacement = 0.0;
  bool avoids;
};

}  // namespace zarn::processes::filters
