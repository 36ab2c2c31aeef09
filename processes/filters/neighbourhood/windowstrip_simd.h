// SPDX-License-Identifier: Apache-2.0

// How the vector kernels of the square-window filters read and write a strip of columns, compiled
// once per vector target: see boxsums_simd.h for how to include it.

#if defined(ZARN_NEIGHBOURHOOD_WINDOWSTRIP_SIMD_H) == defined(HWY_TARGET_TOGGLE)
#ifdef ZARN_NEIGHBOURHOOD_WINDOWSTRIP_SIMD_H
#undef ZARN_NEIGHBOURHOOD_WINDOWSTRIP_SIMD_H
#else
#define ZARN_NEIGHBOURHOOD_WINDOWSTRIP_SIMD_H
#endif

#include <hwy/cache_control.h>
#include <hwy/highway.h>

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "processes/filters/neighbourhood/boxsums_simd.h"
#include "processes/filters/neighbourhood/windowscratch.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

/// The input and the output of a call in output columns `firstColumn` .. + `width` - 1.
template <typename T>
class WindowStrip {
 public:
  WindowStrip(const WindowJob<T>& job, const StripScratch<T>& scratch, std::ptrdiff_t firstColumn,
              std::size_t width)
      : job_(job),
        scratch_(scratch),
        firstColumn_(firstColumn),
        width_(width),
        channels_(static_cast<std::size_t>(job.input.Channels())) {}

  /// The pixels of row y that its windows reach, where the kernels may read on into the padding: in
  /// place, or else in `copy`.
  const T* WindowRow(std::ptrdiff_t y, T* copy) const {
    return InputRow(firstColumn_ - job_.half, y, WindowPixels(), copy);
  }
  /// Where they are in the input; null where there is no such row.
  const T* InputWindowRow(std::ptrdiff_t y) const {
    if (y >= job_.input.Height() + job_.input.MarginY()) return nullptr;
    return job_.input.Pixel(firstColumn_ - job_.half, y);
  }
  /// Asks for the memory of that row of input, if there is one: results that are written in between
  /// keep the machine from looking ahead by itself.
  void PrefetchRow(std::ptrdiff_t y) const {
    constexpr std::size_t kLine = 64 / sizeof(T);
    const T* const row = InputWindowRow(y);
    if (row == nullptr) return;
    for (std::size_t i = 0; i < WindowPixels() * channels_; i += kLine) hwy::Prefetch(row + i);
  }
  std::size_t WindowPixels() const { return width_ + 2 * static_cast<std::size_t>(job_.half); }

  /// What excludes pixels of that row.
  ExclusionTests<T> Tests(std::ptrdiff_t y) const {
    const WindowRules<T>& rules = job_.rules;
    return {
        rules.HasInputNoData() ? rules.inputNoData().data() : nullptr,
        rules.HasBackground() ? rules.background().data() : nullptr,
        MaskRow(firstColumn_ - job_.half, y, WindowPixels()),
    };
  }

  /// The first output sample of row y.
  T* Output(std::ptrdiff_t y) const { return job_.output.Pixel(firstColumn_, y); }
  std::size_t Outputs() const { return width_ * channels_; }

  /// Writes output row y where pixels are excluded: `results`, in a padded row, for those that
  /// count. `excluded(x)` tells for pixels of the strip; it is asked only where there are no
  /// vectors of pixels.
  template <class Excluded>
  HWY_ATTR void Merge(std::ptrdiff_t y, T* results, const Excluded& excluded) const {
    if (!WithPixelVectors(channels_,
                          [&](auto constant) HWY_ATTR { MergeVectors<constant()>(y, results); })) {
      MergePixels(y, results, excluded);
    }
  }

 private:
  template <typename U>
  static const U* Padded(const U* from, std::size_t count, const U* end, U* copy) {
    if (end - from >= static_cast<std::ptrdiff_t>(count + kRowPadding)) return from;
    std::memcpy(copy, from, count * sizeof(U));
    return copy;
  }
  const T* InputRow(std::ptrdiff_t x, std::ptrdiff_t y, std::size_t pixels, T* copy) const {
    const BlockView<const T>& input = job_.input;
    return Padded(input.Pixel(x, y), pixels * channels_,
                  input.Pixel(-input.MarginX(), input.Height() + input.MarginY()), copy);
  }
  // Null when there is no mask.
  const std::uint8_t* MaskRow(std::ptrdiff_t x, std::ptrdiff_t y, std::size_t pixels) const {
    if (job_.rules.mask() == nullptr) return nullptr;
    const BlockView<const std::uint8_t>& mask = job_.mask;
    return Padded(mask.Pixel(x, y), pixels,
                  mask.Pixel(-mask.MarginX(), mask.Height() + mask.MarginY()), scratch_.bytes);
  }

  // Chooses between result, no-data, background and the old value, a vector of pixels at a time.
  template <std::size_t kChannels>
  HWY_ATTR void MergeVectors(std::ptrdiff_t y, T* results) const {
    using D = hn::ScalableTag<T>;
    using Vectors = PixelVectors<D, kChannels>;
    const D d;
    const WindowRules<T>& rules = job_.rules;
    T* const out = Output(y);
    const std::uint8_t* const mask = MaskRow(firstColumn_, y, width_);
    const T* const pixels = InputRow(firstColumn_, y, width_, scratch_.centre);
    const T* const background = rules.HasBackground() ? rules.background().data() : nullptr;
    const T* const noData = rules.HasInputNoData() ? rules.inputNoData().data() : nullptr;
    const T* const written = rules.HasOutputNoData() ? rules.outputNoData().data() : nullptr;
    // Merges the vector of pixels from x on; `old` and `to` are what the output holds there and
    // where the result goes.
    const auto merge = [&](std::size_t x, const T* old, T* to) HWY_ATTR {
      const Vectors pixel(d, pixels + x * kChannels);
      Vectors v(d, results + x * kChannels);
      if (background != nullptr) v.Replace(pixel.Equal(background), background);
      if (noData != nullptr) {
        const auto isNoData = pixel.Equal(noData);
        written != nullptr ? v.Replace(isNoData, written) : v.Replace(isNoData, Vectors(d, old));
      }
      if (mask != nullptr) {
        v.Replace(hn::Not(LoadFlags(d, mask + x)), Vectors(d, old));
      }
      v.Store(to);
    };
    const std::size_t whole = width_ - width_ % hn::Lanes(d);
    for (std::size_t x = 0; x < whole; x += hn::Lanes(d)) {
      T* const to = out + x * kChannels;
      merge(x, to, to);
    }
    // The last vector would pass the end of the row.
    const std::size_t rest = (width_ - whole) * kChannels;
    std::memcpy(scratch_.old, out + whole * kChannels, rest * sizeof(T));
    merge(whole, scratch_.old, results + whole * kChannels);
    std::memcpy(out + whole * kChannels, results + whole * kChannels, rest * sizeof(T));
  }

  template <class Excluded>
  HWY_ATTR void MergePixels(std::ptrdiff_t y, const T* results, const Excluded& excluded) const {
    T* const out = Output(y);
    for (std::size_t x = 0; x < width_; ++x) {
      if (excluded(x)) {
        const Exclusion reason = job_.Classify(firstColumn_ + static_cast<std::ptrdiff_t>(x), y);
        job_.rules.WriteExcluded(reason, out + x * channels_);
      } else {
        std::memcpy(out + x * channels_, results + x * channels_, channels_ * sizeof(T));
      }
    }
  }

  const WindowJob<T>& job_;
  const StripScratch<T>& scratch_;
  std::ptrdiff_t firstColumn_;
  std::size_t width_;
  std::size_t channels_;
};

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#endif
