// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <type_traits>
#include <utility>

namespace zarn::testsupport {

// Long-winded second spellings of the conversion rules, to compare the library with. Integers go
// through wide integers here, where the library stays in the sample type; up to 32 bits.

/// Clamped to `T`, fraction cut off; NaN gives 0.
template <typename T>
std::int64_t ReferenceWhole(double value) {
  if (std::isnan(value)) return 0;
  const double low = std::numeric_limits<T>::min();
  const double high = std::numeric_limits<T>::max();
  if (value < low) return std::numeric_limits<T>::min();
  if (value > high) return std::numeric_limits<T>::max();
  return static_cast<std::int64_t>(value);
}

inline double ReferenceNearestEven(double value) {
  const double below = std::floor(value);
  const double fraction = value - below;
  if (fraction < 0.5) return below;
  if (fraction > 0.5) return below + 1;
  return std::fmod(below, 2.0) == 0 ? below : below + 1;
}

/// One entry of a no-data list.
template <typename T>
T ReferenceListEntry(double value) {
  if constexpr (std::is_floating_point_v<T>) {
    return static_cast<T>(value);
  } else {
    return static_cast<T>(ReferenceWhole<T>(value < 0 ? value - 0.5 : value + 0.5));
  }
}

/// A background value.
template <typename T>
T ReferenceBackground(double value) {
  if constexpr (std::is_floating_point_v<T>) {
    return static_cast<T>(value);
  } else {
    return static_cast<T>(ReferenceWhole<T>(value));
  }
}

template <typename T>
T ReferenceIntegerResult(double value, double low, double high, std::optional<double> noData) {
  std::int64_t lo = ReferenceWhole<T>(low);
  std::int64_t hi = ReferenceWhole<T>(high);
  if (lo > hi) std::swap(lo, hi);
  bool avoiding = false;
  std::int64_t nd = 0;
  if (noData) {
    nd = ReferenceWhole<T>(*noData);
    avoiding = lo < nd && nd < hi;
    const bool isLow = nd == lo;
    const bool isHigh = nd == hi;
    if (isLow) lo = nd + 1;
    if (isHigh) hi = nd - 1;
    // Both bounds were the no-data value, at an end of the type: only one neighbour exists.
    if (lo > std::numeric_limits<T>::max()) lo = hi;
    if (hi < std::numeric_limits<T>::min()) hi = lo;
  }
  if (std::isnan(value)) return static_cast<T>(lo);
  const double rounded = ReferenceNearestEven(value);
  std::int64_t result = 0;
  if (rounded < static_cast<double>(lo)) {
    result = lo;
  } else if (rounded > static_cast<double>(hi)) {
    result = hi;
  } else {
    result = static_cast<std::int64_t>(rounded);
  }
  if (avoiding && result == nd) result = nd + 1 > hi ? nd - 1 : nd + 1;
  return static_cast<T>(result);
}

template <typename T>
T ReferenceFloatingResult(double value, double low, double high, std::optional<double> noData) {
  constexpr double kTolerance = 1e-5;
  constexpr T kMax = std::numeric_limits<T>::max();
  const auto bounded = [](double v) {
    if (v > static_cast<double>(kMax)) return kMax;
    if (v < -static_cast<double>(kMax)) return -kMax;
    return static_cast<T>(v);
  };
  const auto distance = [](T a, T b) {
    return std::fabs(static_cast<double>(a) - static_cast<double>(b));
  };
  T lo = bounded(low);
  T hi = bounded(high);
  if (lo > hi) std::swap(lo, hi);
  bool avoiding = false;
  T nd = 0;
  T above = 0;
  T below = 0;
  if (noData) {
    nd = bounded(*noData);
    above = static_cast<T>(static_cast<double>(nd) + kTolerance);
    if (above == nd) above = std::nextafter(nd, std::numeric_limits<T>::infinity());
    below = static_cast<T>(static_cast<double>(nd) - kTolerance);
    if (below == nd) below = std::nextafter(nd, -std::numeric_limits<T>::infinity());
    const bool nearLow = distance(lo, nd) < kTolerance;
    const bool nearHigh = distance(hi, nd) < kTolerance;
    avoiding = !nearLow && !nearHigh && lo <= nd && nd <= hi;
    if (nearLow) lo = above;
    if (nearHigh) hi = below;
    // Both bounds were the no-data value, at an end of the type: only one neighbour exists.
    if (std::isinf(lo)) lo = hi;
    if (std::isinf(hi)) hi = lo;
  }
  if (std::isnan(value)) return std::numeric_limits<T>::quiet_NaN();
  T result = 0;
  if (value < static_cast<double>(lo)) {
    result = lo;
  } else if (value > static_cast<double>(hi)) {
    result = hi;
  } else {
    result = static_cast<T>(value);
  }
  if (avoiding && distance(result, nd) < kTolerance) result = above > hi ? below : above;
  return result;
}

/// A computed double as a sample within the bounds and away from the no-data value.
template <typename T>
T ReferenceResult(double value, double low, double high, std::optional<double> noData) {
  if constexpr (std::is_floating_point_v<T>) {
    return ReferenceFloatingResult<T>(value, low, high, noData);
  } else {
    return ReferenceIntegerResult<T>(value, low, high, noData);
  }
}

}  // namespace zarn::testsupport
