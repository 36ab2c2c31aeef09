// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <ogr_spatialref.h>

#include <array>
#include <cstdint>
#include <optional>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/windows.h"

namespace zarn::app {

/// A rectangle in map coordinates; empty unless left < right and bottom < top.
struct Extent {
  double left;
  double bottom;
  double right;
  double top;

  bool Empty() const { return !(left < right && bottom < top); }
  double Area() const { return Empty() ? 0.0 : (right - left) * (top - bottom); }
};

Extent Intersection(const Extent& a, const Extent& b);
/// The smallest rectangle around both.
Extent Union(const Extent& a, const Extent& b);

/// Where the pixels of an image lie on the map.
class Ground {
 public:
  explicit Ground(const RasterSource& source);

  const WindowSize& Size() const { return size_; }
  /// False: the file does not say where it lies, and map coordinates are pixels.
  bool Georeferenced() const { return georeferenced_; }
  /// Map coordinates of the point `column`, `row`; the first pixel's centre is 0.5, 0.5.
  double X(double column, double row) const {
    return transform_[0] + column * transform_[1] + row * transform_[2];
  }
  double Y(double column, double row) const {
    return transform_[3] + column * transform_[4] + row * transform_[5];
  }
  /// The column and row of a point of the map.
  double Column(double x, double y) const {
    return inverse_[0] + x * inverse_[1] + y * inverse_[2];
  }
  double Row(double x, double y) const { return inverse_[3] + x * inverse_[4] + y * inverse_[5]; }
  const Extent& Bounds() const { return bounds_; }
  /// Width and height that a pixel takes along the axes of the map.
  double PixelWidth() const;
  double PixelHeight() const;
  double PixelArea() const;
  /// The pixels, at least, that lie in `extent`; width or height 0 where there are none.
  Window PixelsIn(const Extent& extent) const;

 private:
  std::array<double, 6> transform_;
  std::array<double, 6> inverse_;
  bool georeferenced_;
  WindowSize size_;
  Extent bounds_;
};

/// Whether two coordinate systems are the same, whatever the order of their axes.
bool SameSystem(const OGRSpatialReference& a, const OGRSpatialReference& b);

/// Throws `RunError` unless both images name the same coordinate system, or neither names one.
void RequireSameSystem(const RasterSource& first, const RasterSource& other);

/// Throws `RunError` unless both have one sample type and number of channels.
void RequireSameSamples(const RasterSource& first, const RasterSource& other);

/// Throws `RunError` unless both have one sample type, number of channels and coordinate system.
void RequireComparable(const RasterSource& first, const RasterSource& other);

/// A place on the pixel grid of a raster.
struct GridPlace {
  std::int64_t column = 0;
  std::int64_t row = 0;
};

/// Where the first pixel of `other` lies on the grid of `first`; nothing unless its pixels fall on
/// whole pixels there, to a tenth of a pixel at every corner. Both are taken to lie in one
/// coordinate system.
std::optional<GridPlace> FindOnGrid(const Ground& first, const Ground& other);

/// The same for rasters. Throws `RunError` unless
/// they fit so and name the same coordinate system. Images without georeference are taken to lie on
/// one another and must be of one size.
GridPlace PlaceOnGrid(const RasterSource& first, const RasterSource& other);

/// The grounds of images that are to be compared pixel by pixel. Throws `RunError` unless all have
/// the sample type, the number of channels and the coordinate system of the first one. Images
/// without georeference are taken to lie on one another and must be of one size.
std::vector<Ground> ComparableGrounds(const std::vector<RasterSource>& sources);

}  // namespace zarn::app
