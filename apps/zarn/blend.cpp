// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/blend.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <system_error>
#include <utility>

#include "apps/zarn/cutlinefile.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/interruption.h"
#include "apps/zarn/pasting.h"
#include "apps/zarn/progress.h"
#include "apps/zarn/sourcemaptype.h"
#include "apps/zarn/updatedraster.h"
#include "apps/zarn/windowgeometry.h"
#include "processes/filters/factories/cutlineblendingfactory.h"

namespace zarn::app {
namespace {

namespace fs = std::filesystem;
using processes::filters::CutlineBlendingFactory;

struct BlendOptions {
  WorkOptions work;
  std::string source;
  std::string mosaic;
  CutlineRequest cutline;
  CutlineRequest tile;
  std::uint32_t feather = 0;
  std::string srcNoData;
  std::string dstNoData;
  std::string mask;
  std::string sourceMap;
  std::int64_t sourceId = 0;
  bool stopOnNoData = false;
  bool inPlace = false;
};

std::string SizeText(const RasterSource& raster) {
  return std::to_string(raster.Width()) + " x " + std::to_string(raster.Height());
}

void RequireSameBands(const RasterSource& source, const RasterSource& mosaic) {
  RequireComparable(mosaic, source);
  const std::size_t alphas = mosaic.Alphas().size();
  if (source.Alphas().empty() || alphas == 0 || source.Alphas().size() == alphas) return;
  throw RunError(source.Name() + " has " + std::to_string(source.Alphas().size()) +
                 " alpha bands, but " + mosaic.Name() + " has " + std::to_string(alphas) +
                 "; choose the same ones with gdal_translate -b");
}

// The pixels that a polygon may have to do with.
Window ReachOf(const RasterPolygon& polygon, const CutlineRequest& request, std::uint32_t feather,
               const RasterSource& mosaic) {
  const Window window = polygon.PixelsWithin({mosaic.Width(), mosaic.Height()}, feather);
  if (IsEmpty(window)) {
    throw RunError(request.file + " misses " + mosaic.Name() +
                   ": no polygon comes near any of its " + SizeText(mosaic) +
                   " pixels; compare their extents with ogrinfo -so and gdalinfo");
  }
  return window;
}

/// What is known of a run before anything is changed.
struct BlendPlan {
  GridPlace place;
  CutlineBlendingFactory shape;
  Window area;
  std::vector<double> mosaicNoData;
};

BlendPlan PlanBlend(const BlendOptions& options, const RasterSource& source) {
  const RasterSource mosaic(options.mosaic);
  mosaic.RefusePalette();
  RequireSameBands(source, mosaic);
  const GridPlace place = PlaceOnGrid(mosaic, source);
  const Window covered =
      Intersection(Window{0, 0, mosaic.Width(), mosaic.Height()},
                   Window{place.column, place.row, source.Width(), source.Height()});
  if (IsEmpty(covered)) {
    throw RunError(source.Name() + " misses " + mosaic.Name() +
                   ": they have no pixel in common; compare their extents with gdalinfo");
  }
  RasterPolygon cutline = LoadCutline(options.cutline, mosaic);
  Window area = ReachOf(cutline, options.cutline, options.feather, mosaic);
  std::optional<RasterPolygon> tile;
  if (!options.tile.file.empty()) {
    tile.emplace(LoadCutline(options.tile, mosaic));
    area = Intersection(area, ReachOf(*tile, options.tile, 0, mosaic));
  }
  area = Intersection(area, covered);
  if (IsEmpty(area)) {
    throw RunError("nothing to paste: " + options.cutline.file +
                   (tile ? " and " + options.tile.file : "") + " miss" + (tile ? "" : "es") +
                   " the pixels that " + source.Name() + " has in common with " + mosaic.Name());
  }
  BlendPlan plan{.place = place,
                 .shape = CutlineBlendingFactory(cutline.Release(), options.feather),
                 .area = area,
                 .mosaicNoData = NoDataOf(mosaic, "--dst-nodata", options.dstNoData)};
  if (tile) plan.shape.SetTilePolygon(tile->Release());
  RequireSampleType(
      source,
      OnWindows(std::unique_ptr<processes::filters::IFilter>(plan.shape.GetCPUFilter()), {}));
  return plan;
}

std::unique_ptr<UpdatedRaster> OpenMap(const BlendOptions& options, const RasterSource& mosaic) {
  const std::string& name = options.sourceMap;
  if (name.empty()) return nullptr;
  std::error_code error;
  if (fs::equivalent(name, options.mosaic, error)) {
    throw UsageError("the source map " + name + " is the mosaic; name another file");
  }
  if (!fs::exists(fs::symlink_status(name, error))) {
    return std::make_unique<UpdatedRaster>(name, mosaic, SourceMapType(options.sourceId));
  }
  auto map = std::make_unique<UpdatedRaster>(name, options.inPlace);
  const RasterSource& raster = map->Source();
  if (raster.Dataset().GetRasterCount() != 1) {
    throw RunError("the source map " + name + " has " +
                   std::to_string(raster.Dataset().GetRasterCount()) +
                   " bands; give one of a single band");
  }
  const GridPlace place = PlaceOnGrid(mosaic, raster);
  if (place.column != 0 || place.row != 0 || SizeText(raster) != SizeText(mosaic)) {
    throw RunError("the source map " + name + " does not lie on the grid of " + mosaic.Name() +
                   "; name a new file, which is made on it");
  }
  if (!CanHold(raster.Type().code, static_cast<double>(options.sourceId))) {
    throw RunError("the source map " + name + " is " + raster.Type().Name() + " and cannot hold " +
                   std::to_string(options.sourceId) + "; make it wider with gdal_translate -ot");
  }
  return map;
}

void RunBlend(const BlendOptions& options) {
  if (options.work.quiet) SilenceWarnings();
  SetGdalThreads(options.work.threads);
  ParseWindow(options.work.window);
  const RasterSource source(options.source);
  source.RefusePalette();
  std::optional<MaskFile> mask;
  if (!options.mask.empty()) mask.emplace(options.mask, source);
  const BlendPlan plan = PlanBlend(options, source);

  UpdatedRaster mosaic(options.mosaic, options.inPlace);
  const std::unique_ptr<UpdatedRaster> map = OpenMap(options, mosaic.Source());
  const Pasting pasting{.source = source,
                        .place = plan.place,
                        .shape = plan.shape,
                        .area = plan.area,
                        .sourceNoData = NoDataOf(source, "--src-nodata", options.srcNoData),
                        .mosaicNoData = plan.mosaicNoData,
                        .mask = mask ? &*mask : nullptr,
                        .stopOnNoData = options.stopOnNoData,
                        .sourceId = static_cast<long>(options.sourceId)};
  TerminalProgress progress(options.work.quiet);
  ProgressSpan span(progress, 0, 0.99);
  Paste(pasting, options.work, options.inPlace, mosaic, map.get(), span);
  mosaic.Close();
  if (map) map->Close();
  {
    const HoldInterruptions untilBothAreInPlace;
    if (map) map->Publish();
    mosaic.Publish();
  }
  progress.Update(1);
}

}  // namespace

void AddBlendCommand(CLI::App& app) {
  CLI::App& command =
      *app.add_subcommand("blend", "Paste an image into a mosaic along a feathered cutline");
  const auto options = std::make_shared<BlendOptions>();
  const auto text = [&](const char* name, std::string& value, const char* type,
                        const char* description) {
    return command.add_option(name, value, description)->type_name(type);
  };
  text("SOURCE", options->source, "", "Raster to paste, on the pixel grid of MOSAIC")->required();
  text("MOSAIC", options->mosaic, "", "Raster to paste it into, which is changed")->required();
  text("--cutline", options->cutline.file, "FILE",
       "Polygons within which SOURCE is pasted: anything that OGR reads")
      ->required();
  text("--layer", options->cutline.layer, "NAME", "Layer of the cutline, if there are several");
  text("--where", options->cutline.where, "SQL",
       "Condition that features of the cutline must meet");
  text("--tile", options->tile.file, "FILE",
       "Polygons that limit the pasted area further, without feather");
  command
      .add_option("--feather", options->feather,
                  "Width of the transition on either side of the cutline")
      ->type_name("PIXELS")
      ->check(WholeNumber(0, 1 << 20))
      ->capture_default_str();
  text("--src-nodata", options->srcNoData, "V[,V...]",
       "No-data value of SOURCE, one for all bands or one for each, or 'none'; by default the "
       "file's own");
  text("--dst-nodata", options->dstNoData, "V[,V...]", "The same for MOSAIC");
  text("--mask", options->mask, "FILE",
       "Raster of the size of SOURCE; pixels where it is 0 take no part");
  CLI::Option* const map =
      text("--source-map", options->sourceMap, "FILE",
           "Raster on the grid of MOSAIC that records where its pixels come from; made if there is "
           "none, else updated");
  CLI::Option* const id = command
                              .add_option("--source-id", options->sourceId,
                                          "What the source map gets where at least half of a pixel "
                                          "comes from SOURCE, from 1 on")
                              ->type_name("N")
                              ->check(WholeNumber(1, 4294967295));
  map->needs(id);
  id->needs(map);
  command.add_flag("--stop-on-nodata", options->stopOnNoData,
                   "Fail, and leave MOSAIC as it is, if SOURCE is without data anywhere inside of "
                   "the cutline");
  command.add_flag("--in-place", options->inPlace,
                   "Change the files themselves instead of copies that replace them when they are "
                   "whole: faster, but an interrupted run leaves them half done");
  AddWorkOptions(command, options->work, "MOSAIC");
  command.callback([options] { RunBlend(*options); });
  command.footer(
      "Inside of the cutline pixels are copied, outside they stay. Up to PIXELS away from it on "
      "either side both are mixed, by halves on the cutline itself. Pixels of SOURCE that are "
      "no-data, NaN, transparent (alpha 0) or masked take no part; pixels of MOSAIC that are so "
      "are filled whole. Features of the cutline are taken together and brought into the "
      "coordinate system of MOSAIC. Only the rows and columns are read and written that the "
      "cutline and SOURCE have in common.\n\n"
      "Example:\n  zarn blend --cutline seam.gpkg --feather 20 scene.tif mosaic.tif");
}

}  // namespace zarn::app
