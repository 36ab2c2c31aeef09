// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <type_traits>
#include <vector>

#include "host/gobs/raster.h"
#include "host/gobs/saturatecast.h"
#include "processes/filters/attribute/labelraster.h"
#include "processes/filters/framework/blockview.h"
#include "processes/filters/framework/nodata.h"

namespace zarn::processes::filters {

/// One cell of a kernel.
struct PoolOffset {
  std::ptrdiff_t dx;
  std::ptrdiff_t dy;
};

/// How far the cells of a kernel lie from its centre.
struct PoolReach {
  std::ptrdiff_t x = 0;
  std::ptrdiff_t y = 0;
};

/// Everything that one call of an attribute filter shares between its threads, and the rule that
/// all three filters have in common: which neighbours are pooled.
template <typename T>
struct PoolingJob {
  BlockView<const T> input;
  BlockView<T> output;
  BlockView<const std::uint8_t> inputMask;
  BlockView<const std::uint8_t> outputMask;
  bool hasInputMask;
  bool hasOutputMask;
  std::vector<T> noData;      ///< one value per channel; empty: every pixel is data
  const LabelRaster* labels;  ///< null: one label everywhere
  std::vector<PoolOffset> offsets;
  PoolReach reach;

  /// Whether the pixel at (nx, ny) is pooled for the one at (x, y).
  bool Pools(std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t nx, std::ptrdiff_t ny) const {
    return Exists(nx, ny) && (labels == nullptr || labels->Pools(x, y, nx, ny)) &&
           !Excluded(nx, ny);
  }
  /// Whether the input reaches as far as (x, y). Rows past the margin of the output's height do not
  /// count, even where the input is taller.
  bool Exists(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return x >= -input.MarginX() && x < input.Width() + input.MarginX() && RowExists(y);
  }
  bool RowExists(std::ptrdiff_t y) const {
    return y >= -input.MarginY() && y < output.Height() + input.MarginY();
  }
  /// Whether no pool has the pixel, because of its mask byte or its value.
  bool Excluded(std::ptrdiff_t x, std::ptrdiff_t y) const {
    if (hasInputMask && *inputMask.Pixel(x, y) == 0) return true;
    return !noData.empty() && PixelNearlyEquals(input.Pixel(x, y), noData.data(), noData.size());
  }
  bool Writes(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return !hasOutputMask || *outputMask.Pixel(x, y) != 0;
  }
};

/// The definition of the three filters, for output rows `begin` .. `end` - 1: each channel becomes
/// `Statistic::Of` of the samples of the pool, in the order of the kernel's cells. `pool` and
/// `samples` have room for one entry per cell.
template <class Statistic, typename T>
void ReduceRows(const PoolingJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end, const T** pool,
                T* samples) {
  for (std::ptrdiff_t y = begin; y < end; ++y) {
    for (std::ptrdiff_t x = 0; x < job.output.Width(); ++x) {
      if (!job.Writes(x, y)) continue;
      std::size_t count = 0;
      for (const PoolOffset& offset : job.offsets) {
        const std::ptrdiff_t nx = x + offset.dx;
        const std::ptrdiff_t ny = y + offset.dy;
        if (job.Pools(x, y, nx, ny)) pool[count++] = job.input.Pixel(nx, ny);
      }
      if (count == 0) continue;
      T* const out = job.output.Pixel(x, y);
      for (std::ptrdiff_t c = 0; c < job.output.Channels(); ++c) {
        for (std::size_t i = 0; i < count; ++i) samples[i] = pool[i][c];
        out[c] = Statistic::Of(samples, count);
      }
    }
  }
}

}  // namespace zarn::processes::filters
