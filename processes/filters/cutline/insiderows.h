// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "processes/filters/cutline/pixelbits.h"
#include "processes/filters/cutline/polygonrowindex.h"

namespace zarn::processes::filters {

/// Which pixels of a row are inside a polygon, exactly as `PolygonRowIndex::IsInside` has it.
///
/// Seen from one edge the pixels of a row fall in two: those left of some column count it, the
/// others do not. So each edge is turned into its column once, and the columns toggle.
class InsideRows {
 public:
  /// For rows of `width` pixels from column `left` on. Keeps the address of `index`; `most` is
  /// the most that `Prepare` will meet.
  InsideRows(const PolygonRowIndex& index, std::int64_t left, std::size_t width,
             const PolygonRowIndex::Crowd& most);

  /// Collects the edges of the rows `first` .. `last`.
  void Prepare(std::int64_t first, std::int64_t last);
  /// Writes the bits of one of these rows.
  void Compute(std::int64_t row, PixelBits& inside);

 private:
  std::size_t ColumnOf(const PolygonEdge& edge, double y) const;

  const PolygonRowIndex& index_;
  double left_;
  std::size_t width_;
  // The edges of the rows at hand, side by side for vector loops.
  std::size_t count_ = 0;
  std::vector<const PolygonEdge*> edges_;
  std::vector<double> numbers_;
};

}  // namespace zarn::processes::filters
