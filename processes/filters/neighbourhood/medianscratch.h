// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "processes/filters/framework/orderedkeys.h"
#include "processes/filters/neighbourhood/medianrows.h"
#include "processes/filters/neighbourhood/windowmedians_simd.h"
#include "processes/filters/neighbourhood/windowscratch.h"

namespace zarn::processes::filters {

/// How the vector kernels go about one call.
struct MedianPlan {
  std::size_t taps;      ///< side of the window
  std::size_t channels;  ///< samples per pixel
  std::size_t strip;     ///< columns that are processed at a time, so that their rows stay in cache

  /// Pixels and samples of an input row of a strip.
  std::size_t Pixels() const { return strip + taps - 1; }
  std::size_t Samples() const { return Pixels() * channels; }
  /// Samples of an output row of a strip.
  std::size_t Outputs() const { return strip * channels; }

  template <typename T>
  static MedianPlan Of(const MedianJob<T>& job) {
    constexpr std::size_t kRowBytes = 16384;
    constexpr std::size_t kLeastStrip = 128;
    MedianPlan plan{};
    plan.taps = 2 * static_cast<std::size_t>(job.half) + 1;
    plan.channels = static_cast<std::size_t>(job.input.Channels());
    const std::size_t pixels = kRowBytes / sizeof(T) / std::max<std::size_t>(plan.channels, 1);
    plan.strip =
        std::min(std::max(pixels, kLeastStrip), static_cast<std::size_t>(job.output.Width()));
    return plan;
  }
};

/// One input row of a window.
template <typename T>
struct MedianRow {
  using Key = OrderedKey<T>;

  const Key* bits;      ///< of the samples: the input itself where that is possible, else a copy
  const Key* excluded;  ///< all bits set where the pixel of the sample is excluded, else 0
  T* ownSamples;        ///< where a copy goes
  Key* ownKeys;         ///< the ordered keys, once they are asked for
  Key* ownExcluded;
  bool hasKeys;
  bool dirty;      ///< whether any pixel is excluded
  bool sortsBits;  ///< whether the samples that count sort as their bits do
};

/// Scratch of one band, cut from a single allocation.
template <typename T>
struct MedianScratch {
  using Key = OrderedKey<T>;

  MedianRow<T> ring[kMostMedianTaps];
  Key* clean;    ///< a row without exclusions
  Key* windows;  ///< of `FindMedians`
  Key* medians;
  StripScratch<T> strip;

  static MedianScratch Cut(const MedianPlan& plan, ScratchCutter& cutter) {
    MedianScratch s{};
    for (std::size_t slot = 0; slot < plan.taps; ++slot) {
      s.ring[slot].ownSamples = cutter.Row<T>(plan.Samples());
      s.ring[slot].ownKeys = cutter.Row<Key>(plan.Samples());
      s.ring[slot].ownExcluded = cutter.Row<Key>(plan.Samples());
    }
    s.clean = cutter.Row<Key>(plan.Samples());
    s.windows = cutter.Row<Key>(MedianScratchKeys<Key>(plan.taps, plan.channels));
    s.medians = cutter.Row<Key>(plan.Outputs());
    s.strip = StripScratch<T>::Cut(cutter, plan.Outputs(), plan.Pixels());
    return s;
  }
};

}  // namespace zarn::processes::filters
