// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/hostexport.h"

/// The georeference of a raster.
class ZARN_HOST_EXPORT JOLTGeoref {
 public:
  JOLTGeoref() = default;
  JOLTGeoref(const JOLTGeoref&) = delete;
  JOLTGeoref& operator=(const JOLTGeoref&) = delete;
  virtual ~JOLTGeoref();

  /// The fractional column and line of a point in map coordinates: pixel (c, r) covers
  /// [c, c + 1) x [r, r + 1). Tells whether the point could be converted; the results keep their
  /// values where it could not.
  virtual bool GeorefToRaster(double x, double y, double* column, double* line) const = 0;
};
