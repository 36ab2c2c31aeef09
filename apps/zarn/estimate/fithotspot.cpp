// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/fithotspot.h"

#include <CLI/CLI.hpp>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/estimate/hotspotestimate.h"
#include "apps/zarn/estimate/stagedjson.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/progress.h"

namespace zarn::app {
namespace {

struct FitHotSpotOptions {
  std::string input;
  std::string reference;
  std::string output;
  std::string srcNoData;
  std::size_t classes = 20;
  bool overwrite = false;
  bool quiet = false;
};

void PrintTable(const RasterSource& source, std::size_t cells,
                const std::vector<QuadraticFit>& fits) {
  std::printf("%s: %zu cells\n  band  residuals         ->   p0 .. p5\n", source.Name().c_str(),
              cells);
  for (std::size_t c = 0; c < fits.size(); ++c) {
    std::printf("  %4zu  %9.3f  %9.3f  ", c + 1, fits[c].before, fits[c].after);
    for (const double p : fits[c].coefficients) std::printf(" %.4g", p);
    std::printf("\n");
  }
}

nlohmann::ordered_json ToJson(const RasterSource& source, const std::vector<QuadraticFit>& fits) {
  nlohmann::ordered_json channels = nlohmann::ordered_json::array();
  for (const QuadraticFit& fit : fits) channels.push_back({{"coefficients", fit.coefficients}});
  return {
      {"columnDivisor", source.Width()}, {"rowDivisor", source.Height()}, {"channels", channels}};
}

void FitHotSpot(const FitHotSpotOptions& options) {
  if (options.quiet) SilenceWarnings();
  SetGdalThreads(0);
  std::vector<RasterSource> sources;
  sources.emplace_back(options.input);
  if (!options.reference.empty()) sources.emplace_back(options.reference);
  for (const RasterSource& each : sources) each.RefusePalette();
  RefuseAsOutput(options.output, sources);
  ComparableGrounds(sources);
  StagedJson file(options.output, options.overwrite);

  const RasterSource& source = sources.front();
  HotSpotEstimate estimate;
  {
    TerminalProgress progress(options.quiet);
    estimate = EstimateHotSpot(sources, options.srcNoData, options.classes, progress);
  }
  file.Write(ToJson(source, estimate.fits));
  file.Publish();
  if (!options.quiet) PrintTable(source, estimate.cells, estimate.fits);
}

}  // namespace

void AddFitHotSpotCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "fit-hotspot", "Estimates the quadratic brightness bulge that zarn hotspot subtracts");
  const auto options = std::make_shared<FitHotSpotOptions>();
  command.add_option("IN", options->input, "Raster with the bulge")->type_name("")->required();
  command.add_option("-o", options->output, "File to write")->type_name("FILE")->required();
  command
      .add_option("--reference", options->reference,
                  "Raster of the same ground without the bulge; its colours may differ by a gain "
                  "and an offset")
      ->type_name("FILE");
  command
      .add_option("--classes", options->classes,
                  "Without a reference, kinds of land cover to tell apart; 1 takes all land for "
                  "one")
      ->check(CLI::Range(1, 200).description(""))
      ->type_name("N")
      ->capture_default_str();
  command
      .add_option("--src-nodata", options->srcNoData,
                  "No-data value, one for all bands or one for each, or 'none'; by default the "
                  "file's own")
      ->type_name("V[,V...]");
  command.add_flag("--overwrite", options->overwrite, "Replace the file if it exists");
  command.add_flag("-q,--quiet", options->quiet, "No table, no progress and no warnings");
  command.callback([options] { FitHotSpot(*options); });
  command.footer(
      "A quadratic h(x, y) = p0 x^2 + p1 x y + p2 y^2 + p3 x + p4 y + p5 with x = column / width "
      "and y = row / height\nis fitted per band to the medians of cells, by least squares with "
      "Huber's weights. The image keeps its brightness:\np5 makes the mean of h over the valid "
      "pixels 0.\n\nA single image cannot tell a bulge from land that is brighter on one side. "
      "Cells are therefore compared within\nclasses of the same colour and roughness, which works "
      "as far as the bulge is alike in all bands; a reference\nsettles it. A bulge that is no "
      "quadratic is removed as far as one reaches.\n\n"
      "Example:\n  zarn fit-hotspot scene.tif -o hotspot.json\n"
      "  zarn hotspot --params hotspot.json scene.tif even.tif");
}

}  // namespace zarn::app
