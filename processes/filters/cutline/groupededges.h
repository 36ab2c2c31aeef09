// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "processes/filters/cutline/polygonedge.h"

namespace zarn::processes::filters {

/// The square of a number times this is no more than that square divided by `squaredLength`: 0
/// where the inverse might overflow.
inline double BoundingInverse(double squaredLength) {
  return squaredLength > 1e-290 ? (1 - 0x1p-48) / squaredLength : 0.0;
}

/// Groups of edges laid out for vectors, in parts of `kPart` consecutive edges: the last edge of a
/// group is repeated until its part is whole.
struct GroupedEdges {
  static constexpr std::size_t kPart = 4;
  /// Of each edge: its ends, from one to the other, the square of that length and the bounding
  /// inverse of it.
  enum Number : std::uint8_t { kX0, kY0, kX1, kY1, kDx, kDy, kLength, kInverse, kNumbers };
  /// Of each part: the box that no distance computed to it is below that to.
  enum Bound : std::uint8_t { kMinX, kMaxX, kMinY, kMaxY, kBounds };

  /// How many places a group of so many edges takes up.
  static constexpr std::size_t PlacesFor(std::size_t count) {
    return (count + kPart - 1) / kPart * kPart;
  }

  /// Has room for so many places.
  explicit GroupedEdges(std::size_t mostPlaces);

  /// Lays a group out from `place` on, a multiple of `kPart`; returns the place after it. A
  /// computed distance may differ from the true one by `tolerance`.
  std::size_t Put(const PolygonEdge* group, std::size_t count, double tolerance, std::size_t place);

  // Vectors may be read past the last edge and the last part.
  std::vector<double> edges[kNumbers];
  std::vector<double> boxes[kBounds];
};

}  // namespace zarn::processes::filters
