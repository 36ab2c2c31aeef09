// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace zarn::ogc::cs {

/// Where the pixels of a raster lie: the corner (column, row) of a pixel is at
/// x = `xOffset` + column * `xPerColumn` + row * `xPerRow`, and y likewise.
struct GeocodingInfo {
  double xOffset = 0;
  double xPerColumn = 1;
  double xPerRow = 0;
  double yOffset = 0;
  double yPerColumn = 0;
  double yPerRow = 1;

  bool operator==(const GeocodingInfo&) const = default;
};

}  // namespace zarn::ogc::cs
