// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "processes/filters/neighbourhood/noiserows.h"
#include "processes/filters/neighbourhood/windowscratch.h"

namespace zarn::processes::filters {

/// How the vector kernels go about one call.
struct NoisePlan {
  std::size_t taps;      ///< side of the window
  std::size_t channels;  ///< samples per pixel
  std::size_t strip;     ///< columns that are processed at a time, so that their rows stay in cache
  bool integers;         ///< bytes whose sums and variances fit 32 bits
  bool small;            ///< bytes in windows of up to five by five
  bool compares;         ///< the decision is made by comparing squares where that is sure

  std::size_t Window() const { return taps * taps; }
  /// Pixels and samples of an input row of a strip.
  std::size_t Pixels() const { return strip + taps - 1; }
  std::size_t Samples() const { return Pixels() * channels; }
  /// Samples of an output row of a strip.
  std::size_t Outputs() const { return strip * channels; }

  template <typename T>
  static NoisePlan Of(const NoiseJob<T>& job) {
    constexpr std::size_t kStripTaps = 16;
    constexpr bool kBytes = std::is_same_v<T, std::uint8_t>;
    constexpr bool kFewBits = kBytes || std::is_same_v<T, std::uint16_t>;
    NoisePlan plan{};
    plan.taps = 2 * static_cast<std::size_t>(job.half) + 1;
    plan.channels = static_cast<std::size_t>(job.input.Channels());
    plan.integers = kBytes && plan.Window() <= kMostIntegers;
    plan.small = kBytes && plan.taps <= kMostSmallTaps;
    plan.compares = kFewBits && plan.Window() <= kMostCompared;
    const std::size_t samples = plan.small ? 2048 : 1024;
    plan.strip = std::min(
        std::max(samples / std::max<std::size_t>(plan.channels, 1), kStripTaps * plan.taps),
        static_cast<std::size_t>(job.output.Width()));
    return plan;
  }

 private:
  // n * sum of squares <= n * n * 255 * 255 < 2^31.
  static constexpr std::size_t kMostIntegers = 181;
  // See `JudgeSmall`.
  static constexpr std::size_t kMostSmallTaps = 5;
  // See `JudgeSquares`.
  static constexpr std::size_t kMostCompared = 4096;
};

/// Scratch of one band, cut from a single allocation. Rows of sums are long enough for double.
template <typename T>
struct NoiseScratch {
  WindowRow<T>* ring;   ///< `taps` + 1 rows
  const T** ordered;    ///< the rows of the window, from the top
  std::uint8_t* clean;  ///< a row without flags
  double* columns;      ///< sums of samples by column
  double* squareColumns;
  double* excludedColumns;
  double* levels;  ///< rows of shared sums
  std::size_t pitch;
  double* sums;  ///< of the windows
  double* squares;
  double* excluded;           ///< pixels that do not count
  double* excludedSamples;    ///< the same for each sample
  std::uint8_t* coreColumns;  ///< excluded ones in three rows
  std::uint8_t* isolated;     ///< flags of pixels
  std::uint8_t* isolatedSamples;
  std::uint8_t* noise;  ///< flags of samples
  T* results;
  StripScratch<T> strip;

  static NoiseScratch Cut(const NoisePlan& plan, bool onlyCount, ScratchCutter& cutter) {
    NoiseScratch s{};
    const std::size_t slots = plan.taps + 1;
    const auto doubles = [&](std::size_t count) { return cutter.Row<double>(count); };
    const auto bytes = [&](std::size_t count) { return cutter.Row<std::uint8_t>(count); };
    s.ring = reinterpret_cast<WindowRow<T>*>(cutter.Take(slots * sizeof(WindowRow<T>)));
    for (std::size_t slot = 0; slot < slots; ++slot) {
      T* const samples = cutter.Row<T>(plan.Samples());
      std::uint8_t* const flags = bytes(plan.Pixels());
      if (!onlyCount) s.ring[slot] = {samples, flags, samples, flags, {}, false};
    }
    s.ordered = reinterpret_cast<const T**>(cutter.Take(plan.taps * sizeof(T*)));
    s.clean = bytes(plan.Pixels());
    s.columns = doubles(plan.Samples());
    s.squareColumns = doubles(plan.Samples());
    s.excludedColumns = doubles(plan.Pixels());
    s.pitch = plan.Samples() + kRowPadding;
    s.levels = doubles(SharedLevels(plan.taps) * s.pitch);
    s.sums = doubles(plan.Outputs());
    s.squares = doubles(plan.Outputs());
    s.excluded = doubles(plan.strip);
    s.excludedSamples = doubles(plan.Outputs());
    s.coreColumns = bytes(plan.Pixels());
    s.isolated = bytes(plan.strip);
    s.isolatedSamples = bytes(plan.Outputs());
    s.noise = bytes(plan.Outputs());
    s.results = cutter.Row<T>(plan.Outputs());
    s.strip = StripScratch<T>::Cut(cutter, plan.Outputs(), plan.Pixels());
    return s;
  }
};

}  // namespace zarn::processes::filters
