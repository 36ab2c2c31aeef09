// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/mosaic.h"

#include <CLI/CLI.hpp>
#include <cmath>
#include <memory>
#include <string>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/imagefilter.h"
#include "apps/zarn/mosaic/configfile.h"
#include "apps/zarn/mosaic/mosaicjob.h"
#include "apps/zarn/mosaic/planner.h"
#include "apps/zarn/nodata.h"

namespace zarn::app {
namespace {

/// The options of `mosaic` and `mosaic plan` as they are parsed.
struct ParsedOptions {
  MosaicOptions mosaic;
  std::vector<std::string> files;  ///< the scenes, then the output
  std::string config;
  std::string plan;
};

CLI::Validator FiniteNumber(const std::string& option) {
  return CLI::Validator(
      [option](const std::string& text) {
        const double value = ParseNumber(option, text);
        return value >= 0 && std::isfinite(value)
                   ? std::string()
                   : "'" + text + "' is not a finite number of at least 0";
      },
      "");
}

/// Declares options on a command.
class Declarer {
 public:
  explicit Declarer(CLI::App& command) : command_(command) {}

  template <typename Value>
  CLI::Option* Add(const char* name, Value& value, const char* type, const char* description) {
    return command_.add_option(name, value, description)->type_name(type);
  }

  void AddChoice(const char* name, std::string& value, const std::vector<std::string>& choices,
                 const char* description) {
    Add(name, value, "", description)
        ->check(CLI::IsMember(choices).description(""))
        ->type_name("NAME")
        ->capture_default_str();
  }

 private:
  CLI::App& command_;
};

void AddPlacing(Declarer& declare, MosaicOptions& options) {
  declare.Add("--t-srs", options.crs, "CRS",
              "Coordinate system of OUT, for example EPSG:32633; by default that of the first "
              "scene");
  declare
      .Add("--te", options.extent, "XMIN YMIN XMAX YMAX",
           "Extent of OUT in its coordinate system; by default all that the scenes cover")
      ->expected(4)
      ->allow_extra_args(false);
  declare
      .Add("--tr", options.resolution, "WIDTH HEIGHT",
           "Size of the pixels of OUT; by default that of the first scene")
      ->expected(2)
      ->allow_extra_args(false);
  declare.AddChoice("-r,--resampling", options.resampling, {"nearest", "bilinear", "cubic"},
                    "nearest, bilinear or cubic; scenes whose pixels are those of OUT are copied");
  declare
      .Add("--error-threshold", options.threshold, "PIXELS",
           "Error that positions may have, in pixels of a scene; 0 computes each exactly")
      ->check(FiniteNumber("--error-threshold"))
      ->capture_default_str();
}

void AddSeams(Declarer& declare, CLI::App& command, MosaicOptions& options) {
  declare.Add("--cutlines", options.cutlines, "FILE",
              "Polygons, one or more for each scene, within which it shows: anything that OGR "
              "reads");
  declare.Add("--cutline-id", options.cutlineId, "FIELD",
              "Field of the cutlines that names the scene, by its file name with or without "
              "extension (scene)");
  declare.AddChoice("--seams", options.seams, {"path", "none"},
                    "Without --cutlines: path finds the least visible way through each overlap, "
                    "none pastes scenes whole");
  declare.Add("--write-cutlines", options.writeCutlines, "FILE",
              "GeoPackage for the seams that were found, to be edited and given as --cutlines");
  declare
      .Add("--feather", options.feather, "PIXELS",
           "Width of the transition on either side of a cutline")
      ->check(WholeNumber(0, 1 << 20))
      ->capture_default_str();
  declare.AddChoice("--order", options.order, {"listed", "reverse", "resolution"},
                    "Order of pasting, later scenes on top: listed, reverse, or resolution (the "
                    "finest last)");
  command.add_flag("--fill-gaps", options.fillGaps,
                   "Where a scene has no data within its cutline, take what its neighbours have "
                   "near theirs; always done along seams that were found here");
  command.add_flag("--stop-on-nodata", options.stopOnNoData,
                   "Fail if a scene is without data anywhere within its cutline");
}

void AddColours(Declarer& declare, CLI::App& command, MosaicOptions& options) {
  declare.AddChoice("--balance", options.balance, {"none", "gain-offset", "dodging"},
                    "Bring scenes onto each other: by a gain and an offset for each, or by smooth "
                    "surfaces");
  declare.Add("--reference", options.reference, "FILE",
              "Image whose colours the scenes are given, one of them or another; by default the "
              "first scene (for dodging the mean of all)");
  command.add_flag("--hotspot", options.hotSpot,
                   "Estimate the bright spot of each scene and remove it first");
  declare.AddChoice("--filter", options.filter, {"none", "average", "median"},
                    "Filter each scene before anything else");
  declare.Add("--filter-size", options.filterSize, "N", "Side of the filter's window, 3, 5 or 7")
      ->check(CLI::IsMember({"3", "5", "7"}).description(""))
      ->capture_default_str();
}

void AddOutput(Declarer& declare, CLI::App& command, MosaicOptions& options) {
  declare.Add("--source-map", options.sourceMap, "FILE",
              "Raster that tells which scene each pixel comes from, counted from 1 in the order of "
              "pasting");
  declare.Add("--src-nodata", options.srcNoData, "V[,V...]",
              "No-data value of the scenes, one for all bands or one for each, or 'none'; by "
              "default each file's own");
  declare.Add("--dst-nodata", options.dstNoData, "V[,V...]",
              "No-data value of OUT, or 'none'; by default that of the first scene that has one");
  declare.Add("--of", options.output.format, "FORMAT",
              "GDAL format of OUT; by default by its extension, else GTiff");
  declare
      .Add("--co", options.output.creation, "KEY=VALUE",
           "Creation option of the format, repeatable; GTiff is by default tiled and compressed "
           "(DEFLATE)")
      ->allow_extra_args(false);
  command.add_flag("--overwrite", options.output.overwrite, "Replace outputs that exist");
  declare
      .Add("--tile-size", options.tileSide, "N",
           "Side of the pieces in which the mosaic is made, a multiple of 16; it does not change a "
           "pixel")
      ->check(WholeNumber(16, 16384))
      ->capture_default_str();
}

void AddWork(Declarer& declare, CLI::App& command, WorkOptions& work) {
  declare.Add("--threads", work.threads, "N", "Threads; 0 means all, 1 also lets nothing overlap")
      ->check(WholeNumber(0, 4096))
      ->capture_default_str();
  declare.Add("--memory", work.memory, "MIB", "Memory for the windows of scenes in work")
      ->check(WholeNumber(1, std::int64_t{1} << 30))
      ->capture_default_str();
  command.add_flag("-q,--quiet", work.quiet, "No progress and no warnings");
}

std::shared_ptr<ParsedOptions> AddMosaicOptions(CLI::App& command) {
  auto parsed = std::make_shared<ParsedOptions>();
  Declarer declare(command);
  MosaicOptions& options = parsed->mosaic;
  declare.Add("SCENES", parsed->files, "",
              "Rasters to join, in the order of pasting, then OUT, the raster to write");
  AddPlacing(declare, options);
  AddSeams(declare, command, options);
  AddColours(declare, command, options);
  AddOutput(declare, command, options);
  declare.Add(
      "--config", parsed->config, "FILE",
      "JSON object with any of these options by their long names (\"scenes\" for SCENES and OUT); "
      "the command line counts more, and a single file on it is another OUT");
  AddWork(declare, command, options.work);
  return parsed;
}

// A single file on the command line is another output for the scenes of the configuration.
void Configure(ParsedOptions& parsed, CLI::App& command) {
  std::vector<std::string> output;
  if (parsed.files.size() == 1) {
    output.swap(parsed.files);
    command.get_option("SCENES")->clear();
  }
  ApplyConfig(parsed.config, command);
  if (output.empty()) return;
  if (!parsed.files.empty()) parsed.files.pop_back();
  parsed.files.push_back(output.front());
}

// What can be settled only once all options are known.
const MosaicOptions& Settle(ParsedOptions& parsed, CLI::App& command) {
  if (!parsed.config.empty()) Configure(parsed, command);
  if (parsed.files.size() < 2) {
    throw UsageError("give at least one scene and then the output (see zarn mosaic --help)");
  }
  MosaicOptions& options = parsed.mosaic;
  options.config = parsed.config;
  options.plan = parsed.plan;
  options.output.target = parsed.files.back();
  options.scenes.assign(parsed.files.begin(), parsed.files.end() - 1);
  if (options.tileSide % 16 != 0) throw UsageError("--tile-size: it must be a multiple of 16");
  return options;
}

void AddPlanCommand(CLI::App& mosaic) {
  CLI::App& command =
      *mosaic.add_subcommand("plan", "Decide on everything and write it down, to be run in parts");
  const auto parsed = AddMosaicOptions(command);
  command.add_option("-o", parsed->plan, "Plan to write")->type_name("PLAN")->required();
  command.callback([parsed, &command] { WritePlan(Settle(*parsed, command), parsed->plan); });
  command.footer(
      "The plan holds the grid, the tiles and the scenes of each, the corrections and the "
      "cutlines, and the size and time of every file, which must not change any more.\n\n"
      "Example:\n  zarn mosaic plan --feather 50 -o job.json scene*.tif mosaic.tif\n"
      "  zarn mosaic run job.json --tiles 1-100   # here\n"
      "  zarn mosaic run job.json --tiles 101-    # and there, at the same time\n"
      "  zarn mosaic finish job.json --of COG");
}

void AddRunCommand(CLI::App& mosaic) {
  struct Options {
    std::string plan;
    std::string tiles;
    WorkOptions work;
  };
  CLI::App& command = *mosaic.add_subcommand("run", "Make tiles of a plan");
  const auto options = std::make_shared<Options>();
  Declarer declare(command);
  declare.Add("PLAN", options->plan, "", "File that zarn mosaic plan has written")->required();
  declare.Add("--tiles", options->tiles, "A-B",
              "Tiles to make, counted from 1, both included; by default all");
  AddWork(declare, command, options->work);
  command.callback(
      [options] { RunPlan(options->plan, ParseTiles(options->tiles), options->work); });
  command.footer(
      "Tiles are written to a folder beside the plan. Those that are there are not made again, so "
      "a piece that was killed is simply run again, and any number of processes may work on a plan "
      "at the same time.\n\nExample:\n  zarn mosaic run job.json --tiles 1-100");
}

void AddFinishCommand(CLI::App& mosaic) {
  struct Options {
    std::string plan;
    FinishOptions finish;
    WorkOptions work;
  };
  CLI::App& command = *mosaic.add_subcommand("finish", "Join the tiles of a plan");
  const auto options = std::make_shared<Options>();
  Declarer declare(command);
  declare.Add("PLAN", options->plan, "", "File that zarn mosaic plan has written")->required();
  declare.Add("--of", options->finish.format, "FORMAT",
              "GDAL format of the mosaic instead of the plan's; VRT leaves the tiles where they "
              "are, COG has overviews");
  declare
      .Add("--co", options->finish.creation, "KEY=VALUE",
           "Creation option of the format instead of the plan's, repeatable")
      ->allow_extra_args(false);
  command.add_flag("--overwrite", options->finish.overwrite, "Replace outputs that exist");
  AddWork(declare, command, options->work);
  command.callback([options] { FinishPlan(options->plan, options->finish, options->work); });
  command.footer("Example:\n  zarn mosaic finish job.json --of COG");
}

}  // namespace

void AddMosaicCommand(CLI::App& app) {
  CLI::App& command =
      *app.add_subcommand("mosaic", "Join overlapping scenes into one seamless mosaic");
  const auto parsed = AddMosaicOptions(command);
  Declarer(command).Add(
      "--report", parsed->mosaic.report, "DIR",
      "Folder for a page (index.html) that shows the mosaic before and after its corrections, its "
      "sources and seams, and in numbers how well the scenes agree");
  AddPlanCommand(command);
  AddRunCommand(command);
  AddFinishCommand(command);
  command.parse_complete_callback([&command] {
    if (command.get_subcommands().empty()) return;
    for (const CLI::Option* const option : command.get_options()) {
      if (option->count() == 0) continue;
      throw UsageError(option->get_name() + " has to come after 'zarn mosaic " +
                       command.get_subcommands().front()->get_name() + "'");
    }
  });
  command.callback([parsed, &command] {
    if (command.get_subcommands().empty()) MakeMosaic(Settle(*parsed, command));
  });
  command.footer(
      "Scenes are read in windows (twice where colours or seams depend on all of them), freed of "
      "their hot spots, brought onto the grid of OUT, balanced and pasted along their cutlines. "
      "Pixels that are no-data, NaN, transparent (alpha 0) "
      "or masked take no part, and no pixel with data becomes no-data. Without --cutlines seams "
      "follow the least visible way through each overlap. The result depends neither on --threads "
      "nor on --memory, nor on how a plan is cut into pieces.\n\n"
      "Example:\n  zarn mosaic --balance gain-offset --feather 50 west.tif east.tif mosaic.tif");
}

}  // namespace zarn::app
