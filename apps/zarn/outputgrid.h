// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <ogr_spatialref.h>

#include <array>

namespace zarn::app {

/// The pixel grid of an output that differs from its input's.
struct OutputGrid {
  int width = 0;
  int height = 0;
  std::array<double, 6> transform{};  ///< from pixel corners to coordinates, as GDAL has it
  OGRSpatialReference crs;            ///< may be empty
};

}  // namespace zarn::app
