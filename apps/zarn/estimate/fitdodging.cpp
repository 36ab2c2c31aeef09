// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/fitdodging.h"

#include <cpl_error.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/comparisonoptions.h"
#include "apps/zarn/estimate/dodgingfit.h"
#include "apps/zarn/estimate/robust.h"
#include "apps/zarn/estimate/sceneset.h"
#include "apps/zarn/estimate/stagedjson.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/interruption.h"
#include "apps/zarn/progress.h"
#include "apps/zarn/stagedoutput.h"
#include "apps/zarn/stagingfolder.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

struct FitDodgingOptions {
  std::string reference;
  std::string input;
  std::string output;
  std::string srcNoData;
  GainLimits limits;
  int grid = 8;
  int cell = 0;
  bool overwrite = false;
  bool quiet = false;
};

// The surfaces lie beside the parameter file: scene.json, scene.gain.tif, scene.offset.tif.
std::string SurfaceName(const std::string& output, const char* kind) {
  return fs::path(output).replace_extension(std::string(".") + kind + ".tif").string();
}

// The centres of the file's pixels are the grid's nodes, in the map coordinates of `image`, or in
// its pixels where it has none.
void WriteSurface(const StagingFolder& file, const RasterSource& image, const Ground& ground,
                  DodgingGrid& grid) {
  const std::string name = file.Target().string();
  const auto columns = static_cast<int>(grid.columns);
  const auto rows = static_cast<int>(grid.rows);
  const auto channels = static_cast<int>(grid.channels);
  CPLErrorReset();
  DatasetPtr dataset(GetGDALDriverManager()->GetDriverByName("GTiff")->Create(
      file.StagedFile().c_str(), columns, rows, channels, GDT_Float32, nullptr));
  if (!dataset) FailWriting(name, LastGdalMessage(file.StagedFile().string()));
  const double left = grid.originX + 0.5 - 0.5 * grid.stepX;
  const double top = grid.originY + 0.5 - 0.5 * grid.stepY;
  const double x = ground.X(left, top);
  const double y = ground.Y(left, top);
  std::array<double, 6> transform{
      x, ground.X(left + grid.stepX, top) - x, ground.X(left, top + grid.stepY) - x,
      y, ground.Y(left + grid.stepX, top) - y, ground.Y(left, top + grid.stepY) - y};
  CPLErr state = dataset->SetGeoTransform(transform.data());
  if (const OGRSpatialReference* const system = image.Dataset().GetSpatialRef()) {
    state = std::max(state, dataset->SetSpatialRef(system));
  }
  constexpr GSpacing kSample = sizeof(float);
  state =
      std::max(state, dataset->RasterIO(GF_Write, 0, 0, columns, rows, grid.values.data(), columns,
                                        rows, GDT_Float32, channels, nullptr, kSample * channels,
                                        kSample * channels * columns, kSample, nullptr));
  if (state != CE_None) FailWriting(name, LastGdalMessage(file.StagedFile().string()));
  const GdalFailureWatch watch;
  dataset->FlushCache(true);
  dataset.reset();
  if (!watch.First().empty()) FailWriting(name, watch.First());
}

nlohmann::ordered_json ToJson(const DodgingFit& fit, const std::string& output) {
  nlohmann::ordered_json channels = nlohmann::ordered_json::array();
  for (const double pivot : fit.pivots) {
    channels.push_back({{"d0", pivot}, {"d1", 0}, {"d2", 1}, {"d3", 0}, {"d4", 1}, {"d5", 0}});
  }
  return {{"type", 2},
          {"gainSurface", fs::path(SurfaceName(output, "gain")).filename().string()},
          {"offsetSurface", fs::path(SurfaceName(output, "offset")).filename().string()},
          {"channels", channels}};
}

void PrintTable(const SceneSet& scenes, const std::vector<CellPair>& cells, const DodgingFit& fit) {
  const GridDodgingSurface gains(fit.gains);
  const GridDodgingSurface offsets(fit.offsets);
  const Ground& ground = scenes.Grounds().back();
  const std::size_t channels = fit.pivots.size();
  std::vector<std::vector<double>> before(channels);
  std::vector<std::vector<double>> after(channels);
  std::vector<float> gain(channels);
  std::vector<float> offset(channels);
  for (const CellPair& cell : cells) {
    const auto column = static_cast<unsigned>(std::max(0.0, ground.Column(cell.x, cell.y)));
    const auto row = static_cast<unsigned>(std::max(0.0, ground.Row(cell.x, cell.y)));
    gains.GetBilinearValue(column, row, gain.data());
    offsets.GetBilinearValue(column, row, offset.data());
    for (std::size_t c = 0; c < channels; ++c) {
      const double pivot = fit.pivots[c];
      const double corrected = (cell.second[c] - pivot) * static_cast<double>(gain[c]) + pivot +
                               static_cast<double>(offset[c]);
      before[c].push_back(cell.first[c] - cell.second[c]);
      after[c].push_back(cell.first[c] - corrected);
    }
  }
  std::printf("%s: %zu common cells of %.0f x %.0f pixels, %u x %u nodes\n",
              scenes.Sources().back().Name().c_str(), cells.size(), scenes.CellSide(),
              scenes.CellSide(), fit.gains.columns, fit.gains.rows);
  std::printf("  band   mean difference     ->      spread     ->\n");
  for (std::size_t c = 0; c < channels; ++c) {
    std::printf("  %4zu   %15.3f %9.3f  %9.3f %9.3f\n", c + 1, Mean(before[c]), Mean(after[c]),
                RobustDeviation(before[c]), RobustDeviation(after[c]));
  }
}

void RunFitDodging(const FitDodgingOptions& options) {
  if (options.quiet) SilenceWarnings();
  SetGdalThreads(0);
  SceneSet scenes(options.reference, {options.input}, options.srcNoData);
  const std::string gainName = SurfaceName(options.output, "gain");
  const std::string offsetName = SurfaceName(options.output, "offset");
  for (const std::string& name : {options.output, gainName, offsetName}) {
    RefuseAsOutput(name, scenes.Sources());
  }
  StagedJson file(options.output, options.overwrite);
  StagingFolder gainFile(gainName, options.overwrite);
  StagingFolder offsetFile(offsetName, options.overwrite);

  {
    TerminalProgress progress(options.quiet);
    scenes.Measure(options.cell, progress);
  }
  const RasterSource& image = scenes.Sources().back();
  const Ground& ground = scenes.Grounds().back();
  const std::vector<CellPair> cells = scenes.Common(0, 1);
  if (cells.size() < kLeastCommonCells) {
    throw RunError(image.Name() + " and " + scenes.Sources().front().Name() +
                   " have no valid overlap that would do for a fit");
  }
  DodgingFit fit = FitDodging(
      cells, ground, LayGrid({image.Width(), image.Height()}, scenes.Channels(), options.grid),
      options.limits);
  WriteSurface(gainFile, image, ground, fit.gains);
  WriteSurface(offsetFile, image, ground, fit.offsets);
  file.Write(ToJson(fit, options.output));
  {
    const HoldInterruptions untilAllAreInPlace;
    gainFile.Publish();
    offsetFile.Publish();
    file.Publish();
  }
  if (!options.quiet) PrintTable(scenes, cells, fit);
}

}  // namespace

void AddFitDodgingCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "fit-dodging", "Estimates gain and offset surfaces that bring a raster onto a reference");
  const auto options = std::make_shared<FitDodgingOptions>();
  command.add_option("REF", options->reference, "Raster that stays as it is")
      ->type_name("")
      ->required();
  command.add_option("IN", options->input, "Raster to bring onto it")->type_name("")->required();
  command
      .add_option("-o", options->output,
                  "Parameter file to write; the surfaces are written beside it, with .gain.tif "
                  "and .offset.tif in place of its extension")
      ->type_name("FILE")
      ->required();
  command.add_option("--grid", options->grid, "Nodes of the surfaces along the longer side of IN")
      ->check(CLI::Range(1, 32).description(""))
      ->type_name("N")
      ->capture_default_str();
  AddGainLimitOptions(command, options->limits);
  AddComparisonOptions(command, options->cell, options->srcNoData);
  command.add_flag("--overwrite", options->overwrite, "Replace files that exist");
  command.add_flag("-q,--quiet", options->quiet, "No table, no progress and no warnings");
  command.callback([options] { RunFitDodging(*options); });
  command.footer(
      "Around every node of a coarse grid the means of the cells that both rasters have are made "
      "to agree, and their\ncontrasts as far as the two are correlated, without outliers; between "
      "the nodes the surfaces are bilinear.\nThe finer the grid, the more of the differences "
      "between the two images themselves is taken for brightness.\n\n"
      "Example:\n  zarn fit-dodging reference.tif scene.tif -o scene.json\n"
      "  zarn dodge --params scene.json scene.tif even.tif");
}

}  // namespace zarn::app
