// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "apps/zarn/outputgrid.h"
#include "apps/zarn/windowbuffers.h"
#include "apps/zarn/windows.h"

namespace zarn::app {

/// Which pixels of a mosaic a picture of it shows: all of a small one, else some, evenly spread.
class PictureGrid {
 public:
  /// Columns and rows of the largest picture.
  static constexpr int kMostPixels = 1200;

  explicit PictureGrid(const OutputGrid& mosaic);

  int Width() const { return static_cast<int>(columns_.size()); }
  int Height() const { return static_cast<int>(rows_.size()); }
  std::size_t Pixels() const { return columns_.size() * rows_.size(); }
  /// The column and row of the mosaic that the picture shows at its own; they ascend.
  const std::vector<std::int64_t>& Columns() const { return columns_; }
  const std::vector<std::int64_t>& Rows() const { return rows_; }
  /// Pixels of the picture along one of the mosaic, at most 1.
  double ScaleX() const { return Width() / mosaicWidth_; }
  double ScaleY() const { return Height() / mosaicHeight_; }

 private:
  double mosaicWidth_;
  double mosaicHeight_;
  std::vector<std::int64_t> columns_;
  std::vector<std::int64_t> rows_;
};

/// Counts which scenes the pixels of a mosaic come from while its tiles are made, and keeps a small
/// picture of that.
class SourceTally {
 public:
  SourceTally(const OutputGrid& mosaic, std::size_t scenes);

  /// `map` has the number of the scene of each pixel of `window`, counted from 1, or 0, in samples
  /// of 1, 2 or 4 bytes. Each pixel of the mosaic comes once.
  void Take(const Window& window, const Plane& map);

  const PictureGrid& Grid() const { return grid_; }
  /// Pixels by number of the scene; the first one those of none.
  const std::vector<std::int64_t>& Counts() const { return counts_; }
  /// Numbers of the scenes at the pixels of the picture, row by row.
  const std::vector<std::uint32_t>& Picture() const { return picture_; }

 private:
  template <typename Number>
  void Take(const Window& window, const Number* numbers);

  PictureGrid grid_;
  std::vector<std::int64_t> counts_;
  std::vector<std::uint32_t> picture_;
};

}  // namespace zarn::app
