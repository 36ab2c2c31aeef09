// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <vector>

#include "host/gobs/saturatecast.h"

namespace zarn::processes::filters {

/// The highest grey level of a sample type.
template <typename T>
inline constexpr int kTopLevel = std::numeric_limits<T>::max();

/// The stretch of one cell and channel: 0 below `low`, the top level from `high` on, and
/// gain * (level - low)^power, cut off to a whole level, in between.
struct PowerCurve {
  int low = 0;
  int high = 0;
  float gain = 0;
};

/// i^power for every grey level; 0 for level 0 whatever the power.
template <typename T>
std::vector<float> PowerTable(float power) {
  std::vector<float> table(static_cast<std::size_t>(kTopLevel<T>) + 1);
  for (std::size_t i = 1; i < table.size(); ++i) {
    table[i] = std::pow(static_cast<float>(i), power);
  }
  return table;
}

/// The curve between the levels at which gain * (level - offset)^power leaves 0 and reaches the
/// top. Any gain, offset and power give one.
template <typename T>
PowerCurve MakePowerCurve(float gain, float offset, float power) {
  constexpr int kTop = kTopLevel<T>;
  const auto level = [](float value, std::int64_t correction) {
    const std::int64_t whole = gobs::SaturateCast<std::int32_t>(static_cast<double>(value));
    return static_cast<int>(std::clamp<std::int64_t>(whole + correction, 0, kTop));
  };
  const int low = level(offset, 1);
  const float reach = std::pow(static_cast<float>(kTop) / gain, 1.0F / power);
  const int high = level(reach + offset, -1);
  return {std::min(low, high), std::max(low, high), gain};
}

/// What the curve makes of a grey level.
template <typename T>
T CurveValue(const PowerCurve& curve, const float* powers, int level) {
  if (level < curve.low) return 0;
  if (level >= curve.high) return static_cast<T>(kTopLevel<T>);
  return gobs::SaturateCast<T>(static_cast<double>(curve.gain * powers[level - curve.low]));
}

}  // namespace zarn::processes::filters
