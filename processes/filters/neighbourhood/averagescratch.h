// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <type_traits>

#include "processes/filters/neighbourhood/averagerows.h"
#include "processes/filters/neighbourhood/boxrows.h"
#include "processes/filters/neighbourhood/windowscratch.h"

namespace zarn::processes::filters {

/// What the vector kernels add up in: the narrowest type that holds every sum of a window exactly.
enum class SumType { kUInt16, kInt32, kDouble };

/// Rounded division of 16-bit sums by a constant, as a multiplication:
/// (sum + bias) * multiplier >> (16 + shift). An odd divisor leaves no ties.
struct Reciprocal16 {
  std::uint16_t multiplier = 0;
  std::uint16_t bias = 0;
  int shift = 0;
  bool exact = false;

  /// For an odd divisor and sums of at most 255 * divisor. With m = ceil(2^p / d) and
  /// e = m * d - 2^p, floor(n * m / 2^p) = floor(n / d) as long as n * e < 2^p.
  static constexpr Reciprocal16 Of(std::uint64_t divisor) {
    const std::uint64_t most = 255 * divisor + divisor / 2;
    if (most > 0xFFFF) return {};
    Reciprocal16 best;
    for (int shift = 0; shift < 16; ++shift) {
      const std::uint64_t power = std::uint64_t{1} << (16 + shift);
      const std::uint64_t multiplier = (power + divisor - 1) / divisor;
      if (multiplier > 0xFFFF) break;
      if (most * (multiplier * divisor - power) >= power) continue;
      best = {static_cast<std::uint16_t>(multiplier), static_cast<std::uint16_t>(divisor / 2),
              shift, true};
    }
    return best;
  }
};

/// How the vector kernels go about one call.
struct AveragePlan {
  std::size_t taps;      ///< side of the window
  std::size_t channels;  ///< samples per pixel
  std::size_t strip;     ///< columns that are processed at a time, so that their rows stay in cache
  SumType sum;
  Reciprocal16 reciprocal;
  bool floatDivides;      ///< division in single precision rounds every mean correctly
  bool floatMultiplies;   ///< so does multiplication by the reciprocal, for whole windows
  bool doubleMultiplies;  ///< the same in double precision

  std::uint64_t Window() const { return std::uint64_t{taps} * taps; }
  /// Pixels and samples of an input row of a strip.
  std::size_t Pixels() const { return strip + taps - 1; }
  std::size_t Samples() const { return Pixels() * channels; }
  /// Samples of an output row of a strip.
  std::size_t Outputs() const { return strip * channels; }

  template <typename T>
  static AveragePlan Of(const AverageJob<T>& job) {
    AveragePlan plan{};
    plan.taps = 2 * static_cast<std::size_t>(job.half) + 1;
    plan.channels = static_cast<std::size_t>(job.input.Channels());
    const std::uint64_t window = plan.Window();
    plan.sum = SumTypeFor(std::is_integral_v<T> ? sizeof(T) : 8, window);
    // Wide windows read the columns at a strip's ends twice, so their strips must be wide, too.
    const std::size_t samples = plan.sum == SumType::kUInt16 ? kNarrowSums : kWideSums;
    plan.strip = std::min(
        std::max(samples / std::max<std::size_t>(plan.channels, 1), kStripTaps * plan.taps),
        static_cast<std::size_t>(job.output.Width()));
    plan.reciprocal = Reciprocal16::Of(window);
    // Quotients stay below 2^bits. A float quotient is off by up to 2^(bits - 24), a product with a
    // rounded reciprocal by twice as much; in double by 2^(bits - 53) and its double. That must not
    // reach the distance 1 / (2 * window) between a quotient and a tie.
    constexpr int kBits = 8 * static_cast<int>(sizeof(T));
    if constexpr (kBits <= 16) {
      plan.floatDivides = (window << kBits) < (std::uint64_t{1} << 23);
      plan.floatMultiplies = (window << kBits) < (std::uint64_t{1} << 22);
    }
    if constexpr (kBits <= 32) {
      plan.doubleMultiplies = window < (std::uint64_t{1} << (51 - kBits));
    }
    return plan;
  }

 private:
  static constexpr std::size_t kNarrowSums = 4096;
  static constexpr std::size_t kWideSums = 2048;
  static constexpr std::size_t kStripTaps = 16;

  static SumType SumTypeFor(std::size_t bytes, std::uint64_t window) {
    if (bytes == 1 && window * 0xFF <= 0xFFFF) return SumType::kUInt16;
    // The counts beside the sums have 16 bits.
    const std::uint64_t most = bytes == 1 ? 0xFF : 0xFFFF;
    if (bytes <= 2 && window <= 0xFFFF && window * most <= 0x7FFFFFFF) return SumType::kInt32;
    return SumType::kDouble;
  }
};

/// Scratch of one band, cut from a single allocation. Every row is padded, and long enough for the
/// widest accumulator.
template <typename T>
struct AverageScratch {
  WindowRow<T>* ring;   ///< `taps` + 1 rows
  const T** ordered;    ///< the rows of the window, from the top
  std::uint8_t* clean;  ///< a row without flags
  std::size_t pitch;    ///< elements from one row of shared sums to the next
  std::byte* columns;
  std::byte* excludedColumns;
  std::byte* levels;  ///< rows of shared sums
  std::byte* counts;
  T* means;
  T* bounds;
  StripScratch<T> strip;

  static std::size_t Bytes(const AveragePlan& plan) {
    ScratchCutter cutter(nullptr);
    Layout(plan, nullptr, cutter);
    return cutter.Size();
  }
  static AverageScratch Take(const AveragePlan& plan, std::byte* memory) {
    ScratchCutter cutter(memory);
    AverageScratch scratch = Layout(plan, memory, cutter);
    std::fill_n(scratch.clean, plan.Pixels() + kRowPadding, std::uint8_t{0});
    return scratch;
  }

 private:
  static AverageScratch Layout(const AveragePlan& plan, const std::byte* memory,
                               ScratchCutter& cutter) {
    using Widest = double;
    const auto widestRow = [&](std::size_t elements) {
      return reinterpret_cast<std::byte*>(cutter.Row<Widest>(elements));
    };
    const auto flags = [&] { return cutter.Row<std::uint8_t>(plan.Pixels()); };
    AverageScratch s{};
    const std::size_t slots = plan.taps + 1;
    s.ring = reinterpret_cast<WindowRow<T>*>(cutter.Take(slots * sizeof(WindowRow<T>)));
    for (std::size_t slot = 0; slot < slots; ++slot) {
      T* const ownSamples = cutter.Row<T>(plan.Samples());
      std::uint8_t* const ownFlags = flags();
      if (memory != nullptr) s.ring[slot] = {ownSamples, ownFlags, ownSamples, ownFlags, {}, false};
    }
    s.ordered = reinterpret_cast<const T**>(cutter.Take(plan.taps * sizeof(T*)));
    s.clean = flags();
    s.columns = widestRow(plan.Samples());
    s.excludedColumns = widestRow(plan.Pixels());
    s.pitch = plan.Samples() + kRowPadding;
    s.levels = cutter.Take((SharedLevels(plan.taps) + 1) * s.pitch * sizeof(Widest));
    s.counts = widestRow(plan.Outputs());
    s.means = cutter.Row<T>(plan.Outputs());
    s.bounds = cutter.Row<T>(4 * (plan.channels + kRowPadding));
    s.strip = StripScratch<T>::Cut(cutter, plan.Outputs(), plan.Pixels());
    return s;
  }
};

/// The output converters' constants, repeated with the channels so that a vector loads the right
/// ones at any phase.
template <typename T>
struct BoundPattern {
  const T* low = nullptr;
  const T* high = nullptr;
  const T* noData = nullptr;  ///< where nothing is to be avoided: no mean comes near it
  const T* replacement = nullptr;
  std::size_t channels = 1;
  bool active = false;  ///< whether any mean can be changed at all
  bool uniform = true;  ///< whether all channels have the same constants

  /// `memory` has room for 4 * (channels + kRowPadding) samples.
  static BoundPattern Of(const AverageJob<T>& job, T* memory) {
    BoundPattern pattern;
    pattern.channels = job.converters.size();
    if (pattern.channels == 0) return pattern;
    const std::size_t length = pattern.channels + kRowPadding;
    T* const low = memory;
    T* const high = low + length;
    T* const noData = high + length;
    T* const replacement = noData + length;
    using Limits = std::numeric_limits<T>;
    for (std::size_t i = 0; i < length; ++i) {
      const OutputConverter<T>& converter = job.converters[i % pattern.channels];
      low[i] = converter.low();
      high[i] = converter.high();
      if (converter.avoids()) {
        noData[i] = converter.noData();
        replacement[i] = converter.replacement();
      } else {
        noData[i] = replacement[i] = std::is_floating_point_v<T> ? Limits::quiet_NaN() : low[i];
      }
      // Means of floating samples leave the bounds when a sample is infinite.
      pattern.active = pattern.active || std::is_floating_point_v<T> || converter.avoids() ||
                       low[i] != Limits::lowest() || high[i] != Limits::max();
      pattern.uniform = pattern.uniform && low[i] == low[0] && high[i] == high[0] &&
                        converter.avoids() == job.converters[0].avoids() &&
                        (!converter.avoids() || noData[i] == noData[0]);
    }
    pattern.low = low;
    pattern.high = high;
    pattern.noData = noData;
    pattern.replacement = replacement;
    return pattern;
  }
};

}  // namespace zarn::processes::filters
