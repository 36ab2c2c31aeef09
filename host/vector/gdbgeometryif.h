// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "host/hostexport.h"

/// A geometry turned into plain arrays. Both come from the C allocator; whoever asked for the shape
/// releases them with `free`.
struct GDBShape {
  double* vertices = nullptr;     ///< x, y, z of each vertex
  std::uint32_t vertexCount = 0;  ///< vertices, not doubles
  std::int32_t* parts = nullptr;  ///< as `GDBGeometryIF::Parts`; may be null
};

/// A vector geometry of the host, in map coordinates. Rings repeat their first vertex at their end.
class ZARN_HOST_EXPORT GDBGeometryIF {
 public:
  /// Geometries of this code hold no plain arrays (curves, collections): ask for their shape.
  static constexpr std::int32_t kNeedsConversion = 7;

  GDBGeometryIF() = default;
  GDBGeometryIF(const GDBGeometryIF&) = delete;
  GDBGeometryIF& operator=(const GDBGeometryIF&) = delete;
  virtual ~GDBGeometryIF();

  virtual std::int32_t GeometryType() const = 0;
  /// x, y, z of each vertex; owned by the geometry.
  virtual const double* Vertices() const = 0;
  virtual std::uint32_t VertexCount() const = 0;
  /// The number n of rings, then the index of each ring's first vertex, ascending: n + 1 numbers,
  /// owned by the geometry. Null where all vertices form one chain.
  virtual const std::int32_t* Parts() const = 0;
  /// Fills a zeroed shape with arrays of its own. Leaves it empty where the geometry cannot be
  /// converted, as here.
  virtual void FillShape(GDBShape& shape) const;
};

/// Fills `*shape`, which must be empty, from a geometry that needs conversion.
ZARN_HOST_EXPORT void ConvertGeometryToGDBShape(const GDBGeometryIF* geometry, GDBShape* shape);
