// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/cutline/groupededges.h"

#include <algorithm>
#include <limits>

namespace zarn::processes::filters {

GroupedEdges::GroupedEdges(std::size_t mostPlaces) {
  constexpr std::size_t kWidestVector = 8;
  for (std::vector<double>& numbers : edges) numbers.resize(mostPlaces + kWidestVector);
  for (std::vector<double>& bounds : boxes) bounds.resize(mostPlaces / kPart + kWidestVector);
}

std::size_t GroupedEdges::Put(const PolygonEdge* group, std::size_t count, double tolerance,
                              std::size_t place) {
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  for (std::size_t begin = 0; begin < count; begin += kPart) {
    double minX = kInfinity;
    double maxX = -kInfinity;
    double minY = kInfinity;
    double maxY = -kInfinity;
    const std::size_t part = place / kPart;
    for (std::size_t i = begin; i < begin + kPart; ++i, ++place) {
      const PolygonEdge& e = group[std::min(i, count - 1)];
      const double dx = e.x1 - e.x0;
      const double dy = e.y1 - e.y0;
      const double length = dx * dx + dy * dy;
      const double numbers[kNumbers] = {e.x0, e.y0, e.x1,   e.y1,
                                        dx,   dy,   length, BoundingInverse(length)};
      for (std::size_t n = 0; n < kNumbers; ++n) edges[n][place] = numbers[n];
      minX = std::min({minX, e.x0, e.x1});
      maxX = std::max({maxX, e.x0, e.x1});
      minY = std::min({minY, e.y0, e.y1});
      maxY = std::max({maxY, e.y0, e.y1});
    }
    boxes[kMinX][part] = minX - tolerance;
    boxes[kMaxX][part] = maxX + tolerance;
    boxes[kMinY][part] = minY - tolerance;
    boxes[kMaxY][part] = maxY + tolerance;
  }
  return place;
}

}  // namespace zarn::processes::filters
