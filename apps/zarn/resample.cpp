// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/resample.h"

#include <cpl_error.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/gridoptions.h"
#include "apps/zarn/interpolation.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/positionfield.h"
#include "apps/zarn/regrid.h"
#include "apps/zarn/sourcelocator.h"

namespace zarn::app {
namespace {

using utils::ResampleMethod;

struct ResampleOptions {
  ImageFilterOptions image;
  std::string method = "nearest";
  std::string crs;
  std::vector<double> extent;      ///< left, lower, right, upper
  std::vector<double> resolution;  ///< width and height of a pixel
  std::string like;
  std::string rpcDem;
  double threshold = 0.125;
};

OutputGrid GridOf(const std::string& name) {
  const DatasetPtr dataset = OpenRaster(name);
  OutputGrid grid;
  grid.width = dataset->GetRasterXSize();
  grid.height = dataset->GetRasterYSize();
  if (dataset->GetGeoTransform(grid.transform.data()) != CE_None) {
    throw UsageError("--like: " + name + " has no geotransform, so it has no grid to follow");
  }
  if (dataset->GetSpatialRef() != nullptr) grid.crs = *dataset->GetSpatialRef();
  return grid;
}

Regridding Fit(const ResampleOptions& options, const RasterSource& source) {
  const ResampleMethod method = MethodOf(options.method);
  if (method != ResampleMethod::kNearest) source.RefusePalette();
  OutputGrid grid;
  if (!options.like.empty()) grid = GridOf(options.like);
  if (!options.crs.empty()) grid.crs = ParseCrs(options.crs);
  const auto locator = std::make_shared<SourceLocator>(
      source, grid.crs.IsEmpty() ? nullptr : &grid.crs, options.rpcDem);
  if (options.like.empty())
    grid = Adjusted(locator->SuggestGrid(), options.extent, options.resolution);
  // A grid to follow that names no coordinate system is taken to be in that of the source.
  grid.crs = locator->Crs();
  locator->SetGrid(grid);
  const auto field = std::make_shared<PositionField>(
      [locator](std::vector<double>& x, std::vector<double>& y) { locator->Locate(x, y); },
      options.threshold);
  return {grid, [=, &source] { return std::make_unique<Interpolation>(field, source, method); },
          2 * sizeof(double)};
}

void RunResample(const ResampleOptions& options) {
  RequireNumbers("--te", options.extent);
  RequireNumbers("--tr", options.resolution);
  RunRegridding(options.image, [&](const RasterSource& source) { return Fit(options, source); });
}

}  // namespace

void AddResampleCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "resample", "Bring an image onto another grid or into another coordinate system");
  const auto options = std::make_shared<ResampleOptions>();
  command
      .add_option("-r,--resampling", options->method, "nearest, bilinear or cubic (Catmull-Rom)")
      ->type_name("METHOD")
      ->check(CLI::IsMember({"nearest", "bilinear", "cubic"}).description(""))
      ->capture_default_str();
  CLI::Option* const crs =
      command
          .add_option("--t-srs", options->crs,
                      "Coordinate system of OUT, for example EPSG:32633; by default that of IN")
          ->type_name("CRS");
  CLI::Option* const extent =
      command.add_option("--te", options->extent, "Extent of OUT in its coordinate system")
          ->type_name("XMIN YMIN XMAX YMAX")
          ->expected(4);
  CLI::Option* const resolution =
      command.add_option("--tr", options->resolution, "Size of the pixels of OUT")
          ->type_name("WIDTH HEIGHT")
          ->expected(2);
  command
      .add_option("--like", options->like,
                  "Raster whose grid OUT takes: coordinate system, extent and size of the pixels")
      ->type_name("FILE")
      ->excludes(crs)
      ->excludes(extent)
      ->excludes(resolution);
  command
      .add_option("--rpc-dem", options->rpcDem, "Raster of heights for an IN that has an RPC model")
      ->type_name("FILE");
  command
      .add_option("--error-threshold", options->threshold,
                  "Error that positions may have, in pixels of IN; 0 computes each exactly")
      ->type_name("PIXELS")
      ->check(CLI::Validator(
          [](const std::string& text) {
            const double pixels = ParseNumber("--error-threshold", text);
            const bool inRange = pixels >= 0 && std::isfinite(pixels);
            return inRange ? std::string() : "'" + text + "' is not a finite number of at least 0";
          },
          ""))
      ->capture_default_str();
  AddImageFilterOptions(
      command, options->image,
      {.maskHelp = "Raster of the size of IN; pixels where it is 0 take no part"});
  command.callback([options] { RunResample(*options); });
  command.footer(
      "IN may have a geotransform, control points, geolocation arrays or an RPC model. Pixels that "
      "are no-data, NaN, transparent (alpha 0) or masked take no part; what less than half of its "
      "weight covers becomes the no-data value of OUT, or transparent, or is marked in a mask band "
      "where there is neither. Images with a palette take nearest only.\n\n"
      "The kernels are as wide as pixels of IN, also where OUT is coarser: for OUT to show means "
      "instead of single pixels, average IN first (zarn average).\n\n"
      "Example:\n  zarn resample -r cubic --t-srs EPSG:32633 scene.tif utm.tif");
}

}  // namespace zarn::app
