// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

#include "processes/filters/cutline/groupededges.h"
#include "processes/filters/cutline/pixelbits.h"
#include "processes/filters/cutline/polygonedge.h"

namespace zarn::processes::filters {

/// A row of squared distances, whole words long, and the place of its pixels: that in column i has
/// its centre at (left + i + 0.5, y).
struct DistanceRow {
  double* squared;
  double left;
  std::int64_t row;
};

/// Edges of one polygon that lie together, `kMostGrouped` at the most. No distance to any of them
/// that is computed in the row is below that to the box from `minX` to `maxX`, `above` the row.
struct NearEdges {
  const PolygonEdge* edges;
  std::size_t count;
  double minX;
  double maxX;
  double above;
  const GroupedEdges* grouped = nullptr;  ///< given where the row is in the band of all edges
  std::size_t place = 0;                  ///< of the first one there
};

/// Lowers the squared distances of the columns `first` .. `end` - 1, and maybe of others in the
/// same words, to those that `SquaredDistance` gives for the edges of the row's band.
void LowerDistances(const NearEdges& near, std::size_t first, std::size_t end,
                    const DistanceRow& row);

/// An edge that few columns of some rows have to do with.
struct NarrowEdge {
  double x0;
  double y0;
  double x1;
  double y1;
  std::int64_t firstRow;
  std::int64_t lastRow;
  std::uint32_t firstColumn;
  std::uint32_t endColumn;
};

/// Does the same for each of `edges` whose rows the row is among, in the edge's own columns.
void LowerNarrowDistances(const NarrowEdge* edges, std::size_t count, const DistanceRow& row);

/// Turns the squared distances of one word into weights, negative where the pixel is not inside.
/// Returns the bits of those between -1 and 1.
std::uint64_t WeighDistances(double* squared, std::uint64_t inside, double blend);

/// Turns the weights of one word into the squares of what no pixel in the row below is farther away
/// than, `step` more than here, or `most` where that is less.
void BoundBelow(double* weights, double blend, double step, double most);

}  // namespace zarn::processes::filters
