// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/surfacefile.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/gdalruntime.h"
#include "host/mosaic/griddodgingsurface.h"

namespace zarn::app {
namespace {

/// A point in pixels of the image; the first pixel's centre is 0, 0.
struct PixelPoint {
  double column;
  double row;
};

PixelPoint NodeInImage(const Ground& surface, const Ground& image, double column, double row) {
  const double x = surface.X(column + 0.5, row + 0.5);
  const double y = surface.Y(column + 0.5, row + 0.5);
  return {image.Column(x, y) - 0.5, image.Row(x, y) - 0.5};
}

// The nodes of the file, without their values.
DodgingGrid PlaceNodes(const RasterSource& file, const RasterSource& image) {
  const Ground surfaceGround(file);
  const Ground imageGround(image);
  const PixelPoint first = NodeInImage(surfaceGround, imageGround, 0, 0);
  const PixelPoint right = NodeInImage(surfaceGround, imageGround, 1, 0);
  const PixelPoint below = NodeInImage(surfaceGround, imageGround, 0, 1);
  DodgingGrid grid{.columns = static_cast<unsigned>(file.Width()),
                   .rows = static_cast<unsigned>(file.Height()),
                   .channels = static_cast<unsigned>(image.Channels().size()),
                   .originX = first.column,
                   .originY = first.row,
                   .stepX = right.column - first.column,
                   .stepY = below.row - first.row,
                   .values = {}};
  // Over the whole grid a node may stray by a tenth of a pixel from where parallel axes put it.
  const double stray = std::max(std::abs(right.row - first.row) * file.Width(),
                                std::abs(below.column - first.column) * file.Height());
  if (!(stray < 0.1)) {
    throw RunError("the surface " + file.Name() + " is turned against " + image.Name() +
                   "; bring it onto the axes of the image with gdalwarp");
  }
  return grid;
}

}  // namespace

std::unique_ptr<MOSDodgingSurface> ReadDodgingSurface(const std::string& name,
                                                      const RasterSource& image) {
  const RasterSource file(name);
  RequireSameSystem(image, file);
  const std::size_t channels = image.Channels().size();
  const std::size_t bands = file.Channels().size();
  if (bands != 1 && bands < channels) {
    throw RunError("the surface " + name + " has " + std::to_string(bands) + " bands, but " +
                   image.Name() + " has " + std::to_string(channels) +
                   "; give one for all or one for each");
  }
  DodgingGrid grid = PlaceNodes(file, image);
  grid.values.resize(std::size_t{grid.columns} * grid.rows * channels);
  const auto space = static_cast<GSpacing>(channels * sizeof(float));
  for (std::size_t c = 0; c < channels; ++c) {
    const int band = file.Channels()[bands == 1 ? 0 : c];
    const CPLErr state = file.Dataset().GetRasterBand(band)->RasterIO(
        GF_Read, 0, 0, file.Width(), file.Height(), grid.values.data() + c, file.Width(),
        file.Height(), GDT_Float32, space, space * file.Width(), nullptr);
    if (state != CE_None) throw RunError("cannot read " + name + ": " + LastGdalMessage(name));
  }
  const bool complete = std::all_of(grid.values.begin(), grid.values.end(),
                                    [](float value) { return std::isfinite(value); });
  if (!complete) throw RunError("the surface " + name + " has nodes that are not finite numbers");
  return std::make_unique<GridDodgingSurface>(std::move(grid));
}

}  // namespace zarn::app
