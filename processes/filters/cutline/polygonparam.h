// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace zarn::processes::filters {

/// A polygon of one or more rings in raster coordinates of the mosaic: pixel (c, r) covers
/// [c, c + 1) x [r, r + 1), its centre is (c + 0.5, r + 0.5).
///
/// A plain record: copies share the arrays, which are released by who owns them. Rings are not
/// closed by themselves: each repeats its first vertex at its end. Null vertices, or none, mean
/// that there is no polygon.
struct PolygonParam {
  double* vertices = nullptr;     ///< x and y of each vertex
  std::uint32_t vertexCount = 0;  ///< vertices, not doubles
  /// The number n of rings, then the index of each ring's first vertex, ascending: n + 1 numbers.
  /// Null: one ring.
  std::int32_t* parts = nullptr;

  bool Exists() const { return vertices != nullptr && vertexCount > 0; }
};

}  // namespace zarn::processes::filters
