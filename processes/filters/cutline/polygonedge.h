// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cmath>
#include <cstddef>
#include <cstdint>

namespace zarn::processes::filters {

/// How near to a crossing, or to the end of an edge, still counts as on it.
inline constexpr double kEdgeTolerance = 1.1920928955078125e-7;

/// An edge of a polygon from (x0, y0) to (x1, y1), and the rows that it has to do with. Row r is
/// that of the centres at r + 0.5.
struct PolygonEdge {
  double x0 = 0;
  double y0 = 0;
  double x1 = 0;
  double y1 = 0;
  std::int64_t firstRow = 0;   ///< tests for inside count the edge from this row on
  std::int64_t endRow = 0;     ///< up to here, exclusively; horizontal edges count nowhere
  std::int64_t firstBand = 0;  ///< distances are measured to the edge from this row on
  std::int64_t lastBand = 0;   ///< up to here, inclusively
};

/// Edges that lie together are looked at together, so many at the most.
inline constexpr std::size_t kMostGrouped = 16;

/// Whether an edge that spans the row of (x, y) is crossed by the ray from there towards +x.
inline bool CrossesRay(const PolygonEdge& edge, double x, double y) {
  if (x - edge.x0 > kEdgeTolerance && x - edge.x1 > kEdgeTolerance) return false;
  if (y - edge.y0 > kEdgeTolerance && y - edge.y1 > kEdgeTolerance) return false;
  if (!(std::abs(edge.y1 - edge.y0) >= 1e-10)) return false;
  const double crossing = (edge.x1 - edge.x0) * (y - edge.y0) / (edge.y1 - edge.y0) + edge.x0;
  return crossing > x || std::abs(crossing - x) < kEdgeTolerance;
}

/// The squared distance of (x, y) to the edge.
inline double SquaredDistance(const PolygonEdge& edge, double x, double y) {
  const double dx = edge.x1 - edge.x0;
  const double dy = edge.y1 - edge.y0;
  const double fromX = x - edge.x0;
  const double fromY = y - edge.y0;
  const double toX = edge.x1 - x;
  const double toY = edge.y1 - y;
  if (dx * fromX + dy * fromY < 0) return fromX * fromX + fromY * fromY;
  if (dx * toX + dy * toY < 0) return toX * toX + toY * toY;
  if (dx == 0 && dy == 0) return fromX * fromX + fromY * fromY;
  const double cross = dx * fromY - dy * fromX;
  return cross * cross / (dx * dx + dy * dy);
}

}  // namespace zarn::processes::filters
