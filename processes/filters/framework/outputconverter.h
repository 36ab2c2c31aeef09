// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cmath>
#include <limits>
#include <optional>
#include <type_traits>
#include <utility>

#include "host/gobs/saturatecast.h"

namespace zarn::processes::filters {

/// Whether a result counts as the no-data value: exactly for integers, within 1e-5 for floating
/// types.
template <typename T>
bool TouchesNoData(T value, T noData) {
  if constexpr (std::is_floating_point_v<T>) {
    return std::abs(static_cast<double>(value) - static_cast<double>(noData)) < 1e-5;
  } else {
    return value == noData;
  }
}

/// Brings a computed double back into the sample type of one channel, within bounds, and never onto
/// the channel's output no-data value.
///
/// Integers round to the nearest, ties to even; NaN gives the low bound. Floating results are not
/// rounded; NaN stays NaN, and the no-data value is avoided with a tolerance of 1e-5.
template <typename T>
class OutputConverter {
 public:
  /// Bounds outside the type are clamped to it and swapped when `low` exceeds `high`. Without
  /// `noData` only the bounds apply.
  OutputConverter(double low, double high, std::optional<double> noData = std::nullopt) {
    low_ = ToType(low);
    high_ = ToType(high);
    if (low_ > high_) std::swap(low_, high_);
    if (!noData) return;
    noData_ = ToType(*noData);
    const bool atLow = Touches(low_);
    const bool atHigh = Touches(high_);
    if (atLow) low_ = Above(noData_);
    if (atHigh) high_ = Below(noData_);
    if (atLow && atHigh) KeepWithinType();
    avoids_ = !atLow && !atHigh && low_ <= noData_ && noData_ <= high_;
  }

  T operator()(double value) const {
    const T result = Bounded(value);
    return avoids_ && Touches(result) ? replacement() : result;
  }

  T low() const { return low_; }
  T high() const { return high_; }
  /// Whether a result within the bounds can be the no-data value and is then replaced.
  bool avoids() const { return avoids_; }
  T noData() const { return noData_; }
  /// What a result equal to the no-data value becomes.
  T replacement() const { return Above(noData_) <= high_ ? Above(noData_) : Below(noData_); }

 private:
  using Limits = std::numeric_limits<T>;
  static constexpr bool kFloating = std::is_floating_point_v<T>;
  static constexpr double kTolerance = 1e-5;

  static T ToType(double value) {
    if constexpr (kFloating) {
      constexpr auto kMax = static_cast<double>(Limits::max());
      return static_cast<T>(std::clamp(value, -kMax, kMax));
    } else {
      return gobs::SaturateCast<T>(value);
    }
  }

  bool Touches(T value) const { return TouchesNoData(value, noData_); }

  // The nearest admissible values on either side of the no-data value. At large magnitudes the
  // tolerance is less than half a unit in the last place and would round back onto it.
  static T Above(T noData) {
    if constexpr (kFloating) {
      const T moved = static_cast<T>(static_cast<double>(noData) + kTolerance);
      return moved > noData ? moved : std::nextafter(noData, Limits::infinity());
    } else {
      return noData < Limits::max() ? static_cast<T>(noData + 1) : noData;
    }
  }
  static T Below(T noData) {
    if constexpr (kFloating) {
      const T moved = static_cast<T>(static_cast<double>(noData) - kTolerance);
      return moved < noData ? moved : std::nextafter(noData, -Limits::infinity());
    } else {
      return noData > Limits::min() ? static_cast<T>(noData - 1) : noData;
    }
  }

  // Both bounds were the no-data value. At an end of the type one neighbour does not exist; the
  // other one then serves for both.
  void KeepWithinType() {
    if (low_ == noData_ || !(low_ <= Limits::max())) low_ = high_;
    if (high_ == noData_ || !(high_ >= Limits::lowest())) high_ = low_;
  }

  T Bounded(double value) const {
    if constexpr (kFloating) {
      if (value < static_cast<double>(low_)) return low_;
      if (value > static_cast<double>(high_)) return high_;
      return static_cast<T>(value);
    } else {
      // Clamping after the saturating cast equals comparing as doubles, and holds the bounds even
      // where a 64-bit bound is not representable.
      const double rounded = std::nearbyint(value);
      if (std::isnan(rounded)) return low_;
      const T result = gobs::SaturateCast<T>(rounded);
      return result < low_ ? low_ : result > high_ ? high_ : result;
    }
  }

  T low_{};
  T high_{};
  T noData_{};
  bool avoids_ = false;
};

}  // namespace zarn::processes::filters
