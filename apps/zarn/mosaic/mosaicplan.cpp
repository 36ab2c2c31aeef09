// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/mosaicplan.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <system_error>
#include <utility>

#include "apps/zarn/errors.h"
#include "apps/zarn/windowgeometry.h"
#include "apps/zarn/wkt.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

using Json = nlohmann::ordered_json;

constexpr const char* kKind = "zarn mosaic plan";
constexpr int kVersion = 1;

// JSON has no name for values that are not finite.
Json ToJson(double value) {
  if (std::isnan(value)) return "nan";
  if (std::isinf(value)) return value > 0 ? "inf" : "-inf";
  return value;
}

double NumberOf(const Json& value) {
  return value.is_string() ? std::strtod(value.get<std::string>().c_str(), nullptr)
                           : value.get<double>();
}

Json ToJson(const std::vector<double>& values) {
  Json list = Json::array();
  for (const double value : values) list.push_back(ToJson(value));
  return list;
}

std::vector<double> NumbersOf(const Json& list) {
  std::vector<double> values;
  for (const Json& value : list) values.push_back(NumberOf(value));
  return values;
}

Json ToJson(const Window& window) { return {window.x, window.y, window.width, window.height}; }

Window WindowOf(const Json& list) {
  return {list.at(0).get<std::int64_t>(), list.at(1).get<std::int64_t>(),
          list.at(2).get<std::int64_t>(), list.at(3).get<std::int64_t>()};
}

Json ToJson(const OutputGrid& grid) {
  return {{"width", grid.width},
          {"height", grid.height},
          {"transform", grid.transform},
          {"crs", WktOf(grid.crs)}};
}

OutputGrid GridOf(const Json& json) {
  OutputGrid grid;
  grid.width = json.at("width").get<int>();
  grid.height = json.at("height").get<int>();
  grid.transform = json.at("transform").get<std::array<double, 6>>();
  const auto crs = json.at("crs").get<std::string>();
  if (!crs.empty()) grid.crs.importFromWkt(crs.c_str());
  grid.crs.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
  return grid;
}

Json ToJson(const DodgingGrid& grid) {
  return {{"columns", grid.columns}, {"rows", grid.rows},       {"channels", grid.channels},
          {"originX", grid.originX}, {"originY", grid.originY}, {"stepX", grid.stepX},
          {"stepY", grid.stepY},     {"values", grid.values}};
}

DodgingGrid SurfaceOf(const Json& json) {
  DodgingGrid grid;
  grid.columns = json.at("columns").get<unsigned>();
  grid.rows = json.at("rows").get<unsigned>();
  grid.channels = json.at("channels").get<unsigned>();
  grid.originX = json.at("originX").get<double>();
  grid.originY = json.at("originY").get<double>();
  grid.stepX = json.at("stepX").get<double>();
  grid.stepY = json.at("stepY").get<double>();
  grid.values = json.at("values").get<std::vector<float>>();
  return grid;
}

Json ToJson(const ScenePlan& scene) {
  Json files = Json::array();
  for (const FileState& file : scene.files) {
    files.push_back({{"name", file.name}, {"bytes", file.bytes}, {"modified", file.modified}});
  }
  Json json = {{"label", scene.label},
               {"files", files},
               {"noData", ToJson(scene.noData)},
               {"covers", ToJson(scene.covers)},
               {"reach", ToJson(scene.reach)}};
  if (scene.place) json["place"] = {scene.place->column, scene.place->row};
  if (!scene.hotSpot.empty()) json["hotSpot"] = scene.hotSpot;
  if (!scene.gains.empty()) {
    json["gains"] = scene.gains;
    json["offsets"] = scene.offsets;
  }
  if (scene.dodging) {
    json["dodging"] = {{"pivots", scene.dodging->pivots},
                       {"gains", ToJson(scene.dodging->gains)},
                       {"offsets", ToJson(scene.dodging->offsets)}};
  }
  if (!scene.cutline.Empty()) {
    json["cutline"] = {{"starts", scene.cutline.starts}, {"vertices", scene.cutline.vertices}};
  }
  return json;
}

ScenePlan SceneOf(const Json& json) {
  ScenePlan scene;
  scene.label = json.at("label").get<std::string>();
  for (const Json& file : json.at("files")) {
    scene.files.push_back({file.at("name").get<std::string>(),
                           file.at("bytes").get<std::uint64_t>(),
                           file.at("modified").get<std::int64_t>()});
  }
  scene.files.at(0);
  scene.noData = NumbersOf(json.at("noData"));
  scene.covers = WindowOf(json.at("covers"));
  scene.reach = WindowOf(json.at("reach"));
  if (json.contains("place")) {
    const Json& place = json.at("place");
    scene.place = {place.at(0).get<std::int64_t>(), place.at(1).get<std::int64_t>()};
  }
  if (json.contains("hotSpot")) {
    scene.hotSpot = json.at("hotSpot").get<std::vector<std::vector<double>>>();
  }
  if (json.contains("gains")) {
    scene.gains = json.at("gains").get<std::vector<double>>();
    scene.offsets = json.at("offsets").get<std::vector<double>>();
  }
  if (json.contains("dodging")) {
    const Json& dodging = json.at("dodging");
    scene.dodging = {dodging.at("pivots").get<std::vector<double>>(),
                     SurfaceOf(dodging.at("gains")), SurfaceOf(dodging.at("offsets"))};
  }
  if (json.contains("cutline")) {
    const Json& cutline = json.at("cutline");
    scene.cutline.starts = cutline.at("starts").get<std::vector<std::int32_t>>();
    scene.cutline.vertices = cutline.at("vertices").get<std::vector<double>>();
  }
  return scene;
}

void Require(bool sound, const std::string& what) {
  if (!sound) throw UsageError(what);
}

// What would read beyond an array, or not at all, if somebody had edited the plan.
void RequireSound(const MosaicPlan& plan) {
  Require(!plan.scenes.empty(), "it has no scenes");
  Require(plan.leading < plan.scenes.size(), "leading is no scene");
  Require(plan.grid.width > 0 && plan.grid.height > 0, "its grid has no pixels");
  Require(plan.tileSide >= 16 && plan.tileSide % 16 == 0, "tileSide is not a multiple of 16");
  Require(
      plan.resampling == "nearest" || plan.resampling == "bilinear" || plan.resampling == "cubic",
      "resampling '" + plan.resampling + "' is unknown");
  Require(plan.filter.name.empty() || plan.filter.name == "average" || plan.filter.name == "median",
          "filter '" + plan.filter.name + "' is unknown");
  Require(plan.filter.size >= 1 && plan.filter.size <= 7, "the filter's size is not from 1 to 7");
  for (const ScenePlan& scene : plan.scenes) {
    const Polygon& cutline = scene.cutline;
    const std::size_t vertices = cutline.vertices.size() / 2;
    bool sound = cutline.vertices.size() % 2 == 0 && cutline.Empty() == cutline.starts.empty();
    std::int64_t before = -1;
    for (const std::int32_t start : cutline.starts) {
      sound &= start > before && static_cast<std::size_t>(start) < vertices;
      before = start;
    }
    Require(sound && (cutline.Empty() || cutline.starts.front() == 0),
            "the cutline of " + scene.label + " is broken");
    Require(scene.gains.size() == scene.offsets.size(),
            "gains and offsets of " + scene.label + " differ in number");
  }
}

MosaicPlan PlanOf(const Json& json) {
  if (json.at("kind").get<std::string>() != kKind || json.at("version").get<int>() != kVersion) {
    throw UsageError("it is of another kind or version");
  }
  MosaicPlan plan;
  plan.grid = GridOf(json.at("grid"));
  const Json& output = json.at("output");
  plan.output.target = output.at("file").get<std::string>();
  plan.output.format = output.at("format").get<std::string>();
  plan.output.creation = output.at("creation").get<std::vector<std::string>>();
  plan.output.overwrite = output.at("overwrite").get<bool>();
  plan.sourceMap = output.at("sourceMap").get<std::string>();
  plan.noData = NumbersOf(json.at("noData"));
  plan.resampling = json.at("resampling").get<std::string>();
  plan.threshold = json.at("threshold").get<double>();
  plan.filter.name = json.at("filter").at("name").get<std::string>();
  plan.filter.size = json.at("filter").at("size").get<int>();
  plan.feather = json.at("feather").get<std::uint32_t>();
  plan.fillsGaps = json.at("fillsGaps").get<bool>();
  plan.stopsOnNoData = json.at("stopsOnNoData").get<bool>();
  plan.tileSide = json.at("tileSide").get<std::int64_t>();
  for (const Json& scene : json.at("scenes")) plan.scenes.push_back(SceneOf(scene));
  plan.leading = json.at("leading").get<std::size_t>();
  RequireSound(plan);
  return plan;
}

}  // namespace

FileState FileState::Of(const std::string& name) {
  FileState state{.name = name};
  std::error_code error;
  const std::uintmax_t bytes = fs::file_size(name, error);
  if (error) return state;
  state.bytes = bytes;
  const auto modified = fs::last_write_time(name, error).time_since_epoch();
  if (!error) {
    state.modified = std::chrono::duration_cast<std::chrono::nanoseconds>(modified).count();
  }
  return state;
}

std::vector<TilePlan> MosaicPlan::Tiles() const {
  std::vector<TilePlan> tiles;
  for (std::int64_t y = 0; y < grid.height; y += tileSide) {
    for (std::int64_t x = 0; x < grid.width; x += tileSide) {
      TilePlan tile{{x, y, std::min(tileSide, grid.width - x), std::min(tileSide, grid.height - y)},
                    {}};
      for (std::size_t i = 0; i < scenes.size(); ++i) {
        if (Meet(tile.window, scenes[i].reach)) tile.scenes.push_back(i);
      }
      tiles.push_back(std::move(tile));
    }
  }
  return tiles;
}

Json ToJson(const MosaicPlan& plan) {
  Json scenes = Json::array();
  for (const ScenePlan& scene : plan.scenes) scenes.push_back(ToJson(scene));
  Json tiles = Json::array();
  for (const TilePlan& tile : plan.Tiles()) {
    tiles.push_back({{"window", ToJson(tile.window)}, {"scenes", tile.scenes}});
  }
  return {{"kind", kKind},
          {"version", kVersion},
          {"output",
           {{"file", plan.output.target},
            {"format", plan.output.format},
            {"creation", plan.output.creation},
            {"overwrite", plan.output.overwrite},
            {"sourceMap", plan.sourceMap}}},
          {"grid", ToJson(plan.grid)},
          {"noData", ToJson(plan.noData)},
          {"resampling", plan.resampling},
          {"threshold", plan.threshold},
          {"filter", {{"name", plan.filter.name}, {"size", plan.filter.size}}},
          {"feather", plan.feather},
          {"fillsGaps", plan.fillsGaps},
          {"stopsOnNoData", plan.stopsOnNoData},
          {"tileSide", plan.tileSide},
          {"leading", plan.leading},
          {"scenes", scenes},
          {"tiles", tiles}};
}

MosaicPlan ReadPlan(const std::string& name) {
  std::ifstream file(name, std::ios::binary);
  if (!file) throw UsageError("cannot read the plan " + name + "; make one with zarn mosaic plan");
  std::string reason;
  try {
    return PlanOf(Json::parse(file));
  } catch (const Json::exception& error) {
    reason = error.what();
  } catch (const UsageError& error) {
    reason = error.what();
  } catch (const std::out_of_range&) {
    reason = "a scene has no file";
  }
  throw UsageError(name + " is no plan of this program: " + reason +
                   "; make it with zarn mosaic plan");
}

std::string Fingerprint(const MosaicPlan& plan) {
  // FNV-1a. What only says where the result goes makes no other plan of it.
  Json json = ToJson(plan);
  json.erase("output");
  std::uint64_t hash = 0xcbf29ce484222325;
  for (const char c : json.dump()) {
    hash = (hash ^ static_cast<unsigned char>(c)) * 0x100000001b3;
  }
  constexpr int kDigits = 16;
  std::string text(kDigits, '0');
  for (int i = kDigits - 1; i >= 0; --i, hash >>= 4) {
    text[static_cast<std::size_t>(i)] = "0123456789abcdef"[hash & 15];
  }
  return text;
}

std::string AbsoluteFile(const std::string& name) {
  std::error_code error;
  for (const std::string archive : {"/vsizip/", "/vsitar/", "/vsigzip/"}) {
    if (!name.starts_with(archive)) continue;
    const std::string inside = name.substr(archive.size());
    // Nested ones and names in braces stay as they are.
    const bool isRelative = !inside.empty() && inside[0] != '/' && inside[0] != '{';
    return isRelative ? archive + fs::absolute(inside, error).string() : name;
  }
  return fs::exists(name, error) ? fs::absolute(name, error).string() : name;
}

std::vector<FileState> FilesOf(const RasterSource& source) {
  const std::string name = AbsoluteFile(source.Name());
  std::vector<FileState> files{FileState::Of(name)};
  const CPLStringList parts(source.Dataset().GetFileList());
  for (int i = 0; i < parts.size(); ++i) {
    const std::string part = AbsoluteFile(parts[i]);
    if (part != name) files.push_back(FileState::Of(part));
  }
  return files;
}

bool IsVrt(const OutputOptions& output) {
  return output.format.empty() ? fs::path(output.target).extension() == ".vrt"
                               : EQUAL(output.format.c_str(), "VRT");
}

void RequireUnchanged(const MosaicPlan& plan) {
  const auto refuse = [](const std::string& file, const char* change) {
    throw RunError(file + change +
                   " since the plan was made; make the plan again with zarn mosaic plan");
  };
  for (const ScenePlan& scene : plan.scenes) {
    for (const FileState& file : scene.files) {
      const FileState now = FileState::Of(file.name);
      if (now == file) continue;
      refuse(file.name, now.bytes == 0 && now.modified == 0 ? " is gone" : " has changed");
    }
    // A mask that has appeared beside it changes a scene, too.
    for (const FileState& file : FilesOf(RasterSource(scene.File()))) {
      const bool known =
          std::find(scene.files.begin(), scene.files.end(), file) != scene.files.end();
      if (!known) refuse(file.name, " has appeared");
    }
  }
}

}  // namespace zarn::app
