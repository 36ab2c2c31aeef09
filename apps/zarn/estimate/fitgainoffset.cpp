// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/fitgainoffset.h"

#include <CLI/CLI.hpp>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/comparisonoptions.h"
#include "apps/zarn/estimate/gainoffsetnetwork.h"
#include "apps/zarn/estimate/sceneset.h"
#include "apps/zarn/estimate/stagedjson.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/interruption.h"
#include "apps/zarn/progress.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

struct FitGainOffsetOptions {
  std::string reference;
  std::vector<std::string> inputs;
  std::string output;
  std::string folder;
  std::string srcNoData;
  GainLimits limits;
  int cell = 0;
  bool overwrite = false;
  bool quiet = false;
};

// The files to write, one for each input.
std::vector<std::string> Targets(const FitGainOffsetOptions& options) {
  if (options.output.empty() == options.folder.empty()) {
    throw UsageError("fit-gain-offset: give either -o FILE or --out-dir DIR");
  }
  if (!options.output.empty() && options.inputs.size() > 1) {
    throw UsageError("fit-gain-offset: -o is for one IN; give --out-dir DIR for " +
                     std::to_string(options.inputs.size()));
  }
  if (!options.output.empty()) return {options.output};
  std::vector<std::string> targets;
  std::set<std::string> names;
  for (const std::string& input : options.inputs) {
    const std::string name = fs::path(input).stem().string() + ".gain-offset.json";
    if (!names.insert(name).second) {
      throw UsageError("fit-gain-offset: two of IN would write " + name +
                       "; give them names of their own");
    }
    targets.push_back((fs::path(options.folder) / name).string());
  }
  return targets;
}

using Corrections = std::vector<std::vector<GainOffset>>;

// Differences between the other scenes and one of them, over all that it has in common with them.
struct Differences {
  std::vector<double> before;
  std::vector<double> after;
};

Differences DifferencesTo(std::size_t scene, std::size_t channel, const SceneSet& scenes,
                          const std::vector<SceneOverlap>& overlaps,
                          const Corrections& corrections) {
  Differences result;
  for (const SceneOverlap& overlap : overlaps) {
    if (overlap.first != scene && overlap.second != scene) continue;
    const GainOffset& first = corrections[overlap.first][channel];
    const GainOffset& second = corrections[overlap.second][channel];
    const double sign = overlap.second == scene ? 1 : -1;
    for (const CellPair& cell : scenes.Common(overlap.first, overlap.second)) {
      const double a = cell.first[channel];
      const double b = cell.second[channel];
      result.before.push_back(sign * (a - b));
      result.after.push_back(sign * (first(a) - second(b)));
    }
  }
  return result;
}

void PrintTable(const SceneSet& scenes, const std::vector<SceneOverlap>& overlaps,
                const Corrections& corrections) {
  for (std::size_t scene = 1; scene < scenes.Size(); ++scene) {
    for (std::size_t c = 0; c < scenes.Channels(); ++c) {
      const Differences differences = DifferencesTo(scene, c, scenes, overlaps, corrections);
      if (c == 0) {
        std::printf("%s: %zu common cells of %.0f x %.0f pixels\n",
                    scenes.Sources()[scene].Name().c_str(), differences.before.size(),
                    scenes.CellSide(), scenes.CellSide());
        std::printf("  band      gain     offset   mean difference     ->      spread     ->\n");
      }
      const GainOffset& correction = corrections[scene][c];
      std::printf("  %4zu  %8.4f  %9.3f   %15.3f %9.3f  %9.3f %9.3f\n", c + 1, correction.gain,
                  correction.offset, Mean(differences.before), Mean(differences.after),
                  RobustDeviation(differences.before), RobustDeviation(differences.after));
    }
  }
}

nlohmann::ordered_json ToJson(const std::vector<GainOffset>& corrections) {
  nlohmann::ordered_json channels = nlohmann::ordered_json::array();
  for (const GainOffset& c : corrections) {
    channels.push_back({{"gain", c.gain}, {"offset", c.offset}});
  }
  return {{"channels", channels}};
}

void FitGainOffset(const FitGainOffsetOptions& options) {
  if (options.quiet) SilenceWarnings();
  SetGdalThreads(0);
  const std::vector<std::string> targets = Targets(options);
  SceneSet scenes(options.reference, options.inputs, options.srcNoData);
  std::vector<std::unique_ptr<StagedJson>> files;
  for (const std::string& target : targets) {
    RefuseAsOutput(target, scenes.Sources());
    files.push_back(std::make_unique<StagedJson>(target, options.overwrite));
  }

  {
    TerminalProgress progress(options.quiet);
    scenes.Measure(options.cell, progress);
  }
  const std::vector<SceneOverlap> overlaps = FindOverlaps(scenes);
  RequireTied(scenes, overlaps, "leave them out");
  const Corrections corrections =
      SolveGainOffsets(scenes.Size(), overlaps, scenes.Channels(), options.limits);

  for (std::size_t i = 0; i < files.size(); ++i) files[i]->Write(ToJson(corrections[i + 1]));
  {
    const HoldInterruptions untilAllAreInPlace;
    for (const auto& file : files) file->Publish();
    files.clear();
  }
  if (!options.quiet) PrintTable(scenes, overlaps, corrections);
}

}  // namespace

void AddFitGainOffsetCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "fit-gain-offset",
      "Estimates the gains and offsets that bring overlapping rasters onto a reference");
  const auto options = std::make_shared<FitGainOffsetOptions>();
  command.add_option("REF", options->reference, "Raster that stays as it is")
      ->type_name("")
      ->required();
  command.add_option("IN", options->inputs, "Rasters to bring onto it, directly or step by step")
      ->type_name("")
      ->required();
  command.add_option("-o", options->output, "File to write for a single IN")->type_name("FILE");
  command
      .add_option("--out-dir", options->folder,
                  "Existing folder to write <name of IN>.gain-offset.json to")
      ->type_name("DIR");
  AddGainLimitOptions(command, options->limits);
  AddComparisonOptions(command, options->cell, options->srcNoData);
  command.add_flag("--overwrite", options->overwrite, "Replace files that exist");
  command.add_flag("-q,--quiet", options->quiet, "No table, no progress and no warnings");
  command.callback([options] { FitGainOffset(*options); });
  command.footer(
      "Means and contrasts of the cells that two rasters have in common are made to agree, by "
      "robust statistics:\ncells that fit the others badly (clouds, changes) lose their influence "
      "(Tukey's biweight, scaled by the\nmedian absolute deviation). Several IN are solved in one "
      "system, so that they also agree with each other.\nWhere two rasters are hardly correlated "
      "their contrasts say little, and the damping holds the gain near 1.\n\n"
      "Example:\n  zarn fit-gain-offset reference.tif scene.tif -o scene.json\n"
      "  zarn gain-offset --params scene.json scene.tif balanced.tif");
}

}  // namespace zarn::app
