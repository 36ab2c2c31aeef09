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
#include "apps/zarn/nodata.h"
#include "apps/zarn/positionfield.h"
#include "apps/zarn/regrid.h"
#include "apps/zarn/sourcelocator.h"
#include "host/utils/resample.h"

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

/// The stored positions of a part of a window, counted from a window of the source.
class StoredPositions : public utils::IBufPosTfm {
 public:
  StoredPositions(const double* x, const double* y, std::int64_t pitch, const Window& source)
      : x_(x),
        y_(y),
        pitch_(pitch),
        left_(static_cast<double>(source.x)),
        top_(static_cast<double>(source.y)) {}

  void Transform(int column, int row, int count, double* x, double* y) override {
    const std::int64_t first = row * pitch_ + column;
    for (std::int64_t i = 0; i < count; ++i) {
      x[i] = x_[first + i] - left_;
      y[i] = y_[first + i] - top_;
    }
  }
  bool IsConcurrent() const override { return true; }

 private:
  const double* x_;
  const double* y_;
  std::int64_t pitch_;
  double left_;
  double top_;
};

utils::ResampleBuffer BufferOf(const gobs::Raster& block, const std::uint8_t* mask) {
  return {gobs::GetDataTypeCode(block),
          static_cast<int>(block.Width()),
          static_cast<int>(block.Height()),
          static_cast<int>(block.Channels()),
          const_cast<unsigned char*>(static_cast<const unsigned char*>(block.Data())),
          const_cast<unsigned char*>(mask),
          false};
}

/// Interpolates at the positions of a field.
class Interpolation : public PixelMover {
 public:
  Interpolation(std::shared_ptr<PositionField> field, const RasterSource& source,
                ResampleMethod method)
      : field_(std::move(field)),
        width_(source.Width()),
        height_(source.Height()),
        method_(method) {}

  void Enter(const Window& window) override {
    window_ = window;
    field_->Fill(window, x_, y_);
  }

  Window SourceOf(const Window& part) const override {
    // Cubic convolution draws on two pixels to either side of a position.
    constexpr double kReach = 2.0;
    double left = width_;
    double right = 0;
    double top = height_;
    double bottom = 0;
    for (std::int64_t row = part.y; row < part.y + part.height; ++row) {
      const std::size_t first = Index(part.x, row);
      for (std::size_t i = first; i < first + static_cast<std::size_t>(part.width); ++i) {
        const bool inside = x_[i] >= 0 && x_[i] < width_ && y_[i] >= 0 && y_[i] < height_;
        left = inside ? std::min(left, x_[i]) : left;
        right = inside ? std::max(right, x_[i]) : right;
        top = inside ? std::min(top, y_[i]) : top;
        bottom = inside ? std::max(bottom, y_[i]) : bottom;
      }
    }
    if (left > right) return {};
    const auto x = static_cast<std::int64_t>(std::max(left - kReach, 0.0));
    const auto y = static_cast<std::int64_t>(std::max(top - kReach, 0.0));
    return {x, y, static_cast<std::int64_t>(std::min(right + kReach + 1, width_)) - x,
            static_cast<std::int64_t>(std::min(bottom + kReach + 1, height_)) - y};
  }

  void Move(const gobs::Raster& source, const std::uint8_t* mask, const std::vector<double>& fill,
            gobs::Raster& output, std::uint8_t* covered) override {
    const std::size_t first = Index(output.OriginX(), output.OriginY());
    StoredPositions positions(x_.data() + first, y_.data() + first, window_.width,
                              {source.OriginX(), source.OriginY(), 0, 0});
    utils::ResampleBuffer destination = BufferOf(output, covered);
    utils::Resample(BufferOf(source, mask), destination, &positions,
                    {.method = method_, .hasNoData = !fill.empty(), .noDataPixel = fill});
  }

 private:
  std::size_t Index(std::int64_t column, std::int64_t row) const {
    return static_cast<std::size_t>((row - window_.y) * window_.width + column - window_.x);
  }

  std::shared_ptr<PositionField> field_;
  double width_;
  double height_;
  ResampleMethod method_;
  Window window_;
  std::vector<double> x_;
  std::vector<double> y_;
};

void RequireNumbers(const std::string& option, const std::vector<double>& values) {
  for (const double value : values) {
    if (!std::isfinite(value)) throw UsageError(option + ": all values must be finite numbers");
  }
}

int CountPixels(double extent, double size) {
  const double count = std::floor(extent / size + 0.5);
  if (count > std::numeric_limits<int>::max()) {
    throw UsageError(
        "the output would have more than 2147483647 columns or rows; use a larger --tr");
  }
  return std::max(1, static_cast<int>(count));
}

// The suggested grid with the extent and the pixel size that were asked for.
OutputGrid Adjusted(OutputGrid grid, const ResampleOptions& options) {
  auto& [left, pixelWidth, skewX, top, skewY, pixelHeight] = grid.transform;
  if (options.extent.empty() && options.resolution.empty()) return grid;
  double right = left + pixelWidth * grid.width;
  double bottom = top + pixelHeight * grid.height;
  if (!options.extent.empty()) {
    left = options.extent[0];
    bottom = options.extent[1];
    right = options.extent[2];
    top = options.extent[3];
    if (!(left < right && bottom < top)) {
      throw UsageError("--te: write it as XMIN YMIN XMAX YMAX, with XMIN < XMAX and YMIN < YMAX");
    }
  }
  const bool hasSize = !options.resolution.empty();
  const double width = hasSize ? options.resolution[0] : pixelWidth;
  const double height = hasSize ? options.resolution[1] : -pixelHeight;
  if (!(width > 0 && height > 0)) throw UsageError("--tr: both values must be greater than 0");
  grid.width = CountPixels(right - left, width);
  grid.height = CountPixels(top - bottom, height);
  // Without a size of its own the pixel takes the one that fills the extent exactly.
  pixelWidth = hasSize ? width : (right - left) / grid.width;
  pixelHeight = hasSize ? -height : (bottom - top) / grid.height;
  return grid;
}

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

ResampleMethod MethodOf(const std::string& name) {
  if (name == "bilinear") return ResampleMethod::kBilinear;
  return name == "cubic" ? ResampleMethod::kCubic : ResampleMethod::kNearest;
}

Regridding Fit(const ResampleOptions& options, const RasterSource& source) {
  const ResampleMethod method = MethodOf(options.method);
  if (method != ResampleMethod::kNearest) source.RefusePalette();
  OutputGrid grid;
  if (!options.like.empty()) grid = GridOf(options.like);
  if (!options.crs.empty()) grid.crs = ParseCrs(options.crs);
  const auto locator = std::make_shared<SourceLocator>(
      source, grid.crs.IsEmpty() ? nullptr : &grid.crs, options.rpcDem);
  if (options.like.empty()) grid = Adjusted(locator->SuggestGrid(), options);
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
