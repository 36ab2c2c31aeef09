// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "processes/filters/enhancement/cellgrid.h"
#include "processes/filters/enhancement/glutparameters.h"
#include "processes/filters/enhancement/trimmethod.h"

namespace zarn::processes::filters {

/// The pixels of one tile within a block that is wider: `stride` pixels from row to row.
template <typename T>
struct TilePixels {
  const T* samples;  ///< pixel-interleaved
  const std::uint8_t* valid;
  std::size_t width;
  std::size_t height;
  std::size_t stride;
};

/// Finds the stretch of a cell from the histogram of its tile.
///
/// The trim method settles which levels are stretched, [low, high]. The offset low - 1 makes `low`
/// the level from which the curve rises, and the gain lets it reach the top at `high`: since a
/// curve reaches the top one level before gain * (level - offset)^power does, and cuts off to whole
/// levels, it is laid through the top at 1.5 levels beyond `high`, where rounding in single
/// precision cannot move it to another level.
template <typename T>
class CellEstimator {
 public:
  CellEstimator(const GLUTParameters& parameters, const ITrimMethod& trim)
      : parameters_(parameters), trim_(trim) {}

  /// Grey levels: the size of a histogram.
  static std::size_t Levels();

  /// Sets gains and offsets of a cell and tells its status: without data when less than a
  /// sixteenth of a whole tile is valid, invalid when a channel has no levels to stretch.
  /// `histogram` has `Levels()` zeros before and after.
  CellStatus Estimate(const TilePixels<T>& tile, CellGrid& grid, std::size_t cell,
                      std::uint64_t* histogram) const;

 private:
  bool SetStretch(const HistogramBins& bins, CellGrid& grid, std::size_t cell, int channel) const;

  const GLUTParameters& parameters_;
  const ITrimMethod& trim_;
};

extern template class CellEstimator<std::uint8_t>;
extern template class CellEstimator<std::uint16_t>;

}  // namespace zarn::processes::filters
