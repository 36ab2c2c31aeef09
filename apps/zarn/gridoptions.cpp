// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/gridoptions.h"

#include <cpl_error.h>

#include <algorithm>
#include <cmath>
#include <limits>

#include "apps/zarn/errors.h"

namespace zarn::app {
namespace {

int CountPixels(double extent, double size) {
  const double count = std::floor(extent / size + 0.5);
  if (count > std::numeric_limits<int>::max()) {
    throw UsageError(
        "the output would have more than 2147483647 columns or rows; use a larger --tr");
  }
  return std::max(1, static_cast<int>(count));
}

}  // namespace

void RequireNumbers(const std::string& option, const std::vector<double>& values) {
  for (const double value : values) {
    if (!std::isfinite(value)) throw UsageError(option + ": all values must be finite numbers");
  }
}

OGRSpatialReference ParseCrs(const std::string& text) {
  OGRSpatialReference crs;
  CPLPushErrorHandler(CPLQuietErrorHandler);
  const bool known = crs.SetFromUserInput(text.c_str()) == OGRERR_NONE;
  CPLPopErrorHandler();
  if (!known) {
    throw UsageError("--t-srs: '" + text +
                     "' is not a coordinate system that GDAL knows; for example EPSG:32633");
  }
  return crs;
}

OutputGrid Adjusted(OutputGrid grid, const std::vector<double>& extent,
                    const std::vector<double>& resolution) {
  auto& [left, pixelWidth, skewX, top, skewY, pixelHeight] = grid.transform;
  if (extent.empty() && resolution.empty()) return grid;
  double right = left + pixelWidth * grid.width;
  double bottom = top + pixelHeight * grid.height;
  if (!extent.empty()) {
    left = extent[0];
    bottom = extent[1];
    right = extent[2];
    top = extent[3];
    if (!(left < right && bottom < top)) {
      throw UsageError("--te: write it as XMIN YMIN XMAX YMAX, with XMIN < XMAX and YMIN < YMAX");
    }
  }
  const bool hasSize = !resolution.empty();
  const double width = hasSize ? resolution[0] : pixelWidth;
  const double height = hasSize ? resolution[1] : -pixelHeight;
  if (!(width > 0 && height > 0)) throw UsageError("--tr: both values must be greater than 0");
  grid.width = CountPixels(right - left, width);
  grid.height = CountPixels(top - bottom, height);
  // Without a size of its own the pixel takes the one that fills the extent exactly.
  pixelWidth = hasSize ? width : (right - left) / grid.width;
  pixelHeight = hasSize ? -height : (bottom - top) / grid.height;
  return grid;
}

}  // namespace zarn::app
