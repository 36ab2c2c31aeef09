// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <type_traits>
#include <utility>
#include <vector>

#include "host/gobs/saturatecast.h"
#include "processes/filters/cutline/pixelbits.h"
#include "processes/filters/cutline/sourcemapwriter.h"
#include "processes/filters/framework/nodata.h"

namespace zarn::processes::filters {

/// `source * a + mosaic * (1 - a)`, truncated towards zero for integers.
template <typename T>
T Blended(T source, T mosaic, double a) {
  return gobs::SaturateCast<T>(static_cast<double>(source) * a +
                               static_cast<double>(mosaic) * (1 - a));
}

/// What becomes of the pixels of a row.
struct RowPlan {
  PixelBits copied;
  PixelBits blended;
  const double* weights = nullptr;  ///< of the blended pixels; by column
};

/// Writes rows of one sample type. A pixel has `components` numbers: its channels, or both parts of
/// each when they are complex.
template <typename T>
class BlendRows {
 public:
  /// Empty no-data pixels match none; `mask` may be null. `stop`: excluded source pixels that are
  /// wanted end the work.
  BlendRows(const T* source, T* mosaic, const std::uint8_t* mask, std::size_t width,
            std::size_t components, std::vector<T> sourceNoData, std::vector<T> mosaicNoData,
            const SourceMapWriter& map, bool stop)
      : source_(source),
        mosaic_(mosaic),
        mask_(mask),
        width_(width),
        components_(components),
        sourceNoData_(std::move(sourceNoData)),
        mosaicNoData_(std::move(mosaicNoData)),
        map_(map),
        stop_(stop) {}

  /// Carries the plan out, after it has struck the excluded pixels off it. False: the work ended in
  /// this row.
  bool Apply(std::size_t row, RowPlan& plan) const {
    const std::size_t begin = row * width_;
    const bool goesOn = StrikeExcluded(begin, plan);
    ForEachRun(plan.copied,
               [&](std::size_t first, std::size_t end) { Copy(begin + first, begin + end); });
    ForEachRun(plan.blended, [&](std::size_t first, std::size_t end) {
      Blend(begin + first, begin + end, plan.weights + first);
    });
    return goesOn;
  }

 private:
  bool Excluded(std::size_t pixel) const {
    if (mask_ != nullptr && mask_[pixel] == 0) return true;
    return !sourceNoData_.empty() &&
           PixelEquals(source_ + pixel * components_, sourceNoData_.data(), components_);
  }

  bool StrikeExcluded(std::size_t begin, RowPlan& plan) const {
    if (mask_ == nullptr && sourceNoData_.empty()) return true;
    for (std::size_t w = 0; w < plan.copied.size(); ++w) {
      std::uint64_t wanted = plan.copied[w] | plan.blended[w];
      std::uint64_t excluded = 0;
      for (std::uint64_t left = wanted; left != 0; left &= left - 1) {
        const auto bit = static_cast<std::size_t>(std::countr_zero(left));
        const std::size_t column = w * kWordColumns + bit;
        if (!Excluded(begin + column)) continue;
        const bool isCopied = (plan.copied[w] >> bit & 1) != 0;
        if (stop_ && (isCopied || plan.weights[column] > 0)) {
          // What lies to the left is written all the same.
          const std::uint64_t before = (std::uint64_t{1} << bit) - 1;
          Keep(w, before & ~excluded, plan);
          std::fill(plan.copied.begin() + static_cast<std::ptrdiff_t>(w) + 1, plan.copied.end(), 0);
          std::fill(plan.blended.begin() + static_cast<std::ptrdiff_t>(w) + 1, plan.blended.end(),
                    0);
          return false;
        }
        excluded |= std::uint64_t{1} << bit;
      }
      Keep(w, ~excluded, plan);
    }
    return true;
  }

  static void Keep(std::size_t word, std::uint64_t bits, RowPlan& plan) {
    plan.copied[word] &= bits;
    plan.blended[word] &= bits;
  }

  void Copy(std::size_t first, std::size_t end) const {
    if (source_ != mosaic_) {
      std::memcpy(mosaic_ + first * components_, source_ + first * components_,
                  (end - first) * components_ * sizeof(T));
    }
    map_.Write(first, end);
  }

  void Blend(std::size_t first, std::size_t end, const double* weights) const {
    for (std::size_t p = first; p < end; ++p) {
      const T* const s = source_ + p * components_;
      T* const t = mosaic_ + p * components_;
      if (!mosaicNoData_.empty() && PixelEquals(t, mosaicNoData_.data(), components_)) {
        Copy(p, p + 1);
        continue;
      }
      const double a = 0.5 * weights[p - first] + 0.5;
      for (std::size_t c = 0; c < components_; ++c) t[c] = Blended(s[c], t[c], a);
      if (a >= 0.5) map_.Write(p, p + 1);
    }
  }

  const T* source_;
  T* mosaic_;
  const std::uint8_t* mask_;
  std::size_t width_;
  std::size_t components_;
  std::vector<T> sourceNoData_;
  std::vector<T> mosaicNoData_;
  SourceMapWriter map_;
  bool stop_;
};

}  // namespace zarn::processes::filters
