// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "apps/zarn/dataset.h"
#include "apps/zarn/windows.h"
#include "processes/filters/cutline/polygonparam.h"

namespace zarn::app {

/// Which polygons of a vector file are meant.
struct CutlineRequest {
  std::string file;   ///< anything that OGR reads
  std::string layer;  ///< empty: the only one
  std::string where;  ///< SQL condition that features must meet; empty: all
};

/// A polygon in the raster coordinates of a mosaic.
class RasterPolygon {
 public:
  /// Takes over arrays that come from array new.
  explicit RasterPolygon(const processes::filters::PolygonParam& polygon);

  const processes::filters::PolygonParam& Param() const { return param_; }
  /// Hands the arrays to whoever releases them from now on.
  processes::filters::PolygonParam Release();
  /// The pixels of a raster of that size that the polygon may have to do with when it reaches
  /// `reach` pixels beyond its edges; of no size where there are none.
  Window PixelsWithin(WindowSize raster, std::int64_t reach) const;

 private:
  std::unique_ptr<double[]> vertices_;
  std::unique_ptr<std::int32_t[]> parts_;
  processes::filters::PolygonParam param_;
};

/// The area that the polygons asked for cover together, in the raster coordinates of `mosaic`.
///
/// Rings of one feature count by the even-odd rule, so they may cross. Features that touch are
/// united, so that no edge runs where two of them meet. Coordinates are brought into the system of
/// `mosaic`, along edges that follow the way of the original ones to an eighth of a pixel; where
/// either names no system they are taken as they are. Open rings are closed; rings that enclose
/// nothing are left out with a warning. Throws `RunError`, naming file and feature, for what is no
/// polygon, for vertices that are not finite or cannot be converted, and when nothing is left;
/// `UsageError` for a layer or condition that does not work.
RasterPolygon LoadCutline(const CutlineRequest& request, const RasterSource& mosaic);

}  // namespace zarn::app
