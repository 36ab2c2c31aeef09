// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <type_traits>
#include <vector>

#include "host/gobs/saturatecast.h"

namespace zarn::processes::filters {

/// One entry of a no-data list as a sample.
using gobs::RoundToSample;

/// A background value as a sample: truncated towards zero and saturated.
template <typename T>
T TruncateToSample(double value) {
  return gobs::SaturateCast<T>(value);
}

/// A no-data list as samples; an empty list stays empty (the feature is off).
template <typename T>
std::vector<T> ConvertNoData(const std::vector<double>& list) {
  std::vector<T> samples(list.size());
  std::transform(list.begin(), list.end(), samples.begin(), RoundToSample<T>);
  return samples;
}

/// Exact equality of whole pixels; NaN never equals anything.
template <typename T>
bool PixelEquals(const T* pixel, const T* value, std::size_t channels) {
  for (std::size_t c = 0; c < channels; ++c) {
    if (!(pixel[c] == value[c])) return false;
  }
  return true;
}

/// Whether any of some samples equals a value. Where none does, no pixel among them equals one that
/// has this value in a channel, which is quickly told.
template <typename T>
bool AnySampleEquals(const T* samples, std::size_t count, T value) {
  std::uint8_t any = 0;
  for (std::size_t i = 0; i < count; ++i) any |= static_cast<std::uint8_t>(samples[i] == value);
  return any != 0;
}

/// Differences below this do not tell a floating sample from a no-data value.
inline constexpr double kNoDataTolerance = 2.220446049250313e-16;

/// Equality of whole pixels: exact for integers; for floating types the difference of each channel,
/// in double, must stay below the tolerance.
template <typename T>
bool PixelNearlyEquals(const T* pixel, const T* value, std::size_t channels) {
  if constexpr (std::is_floating_point_v<T>) {
    for (std::size_t c = 0; c < channels; ++c) {
      const double difference = static_cast<double>(pixel[c]) - static_cast<double>(value[c]);
      if (!(std::abs(difference) < kNoDataTolerance)) return false;
    }
    return true;
  } else {
    return PixelEquals(pixel, value, channels);
  }
}

}  // namespace zarn::processes::filters
