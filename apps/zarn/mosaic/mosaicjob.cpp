// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/mosaicjob.h"

#include <cpl_conv.h>
#include <cpl_error.h>
#include <cpl_minixml.h>
#include <gdal_utils.h>

#include <algorithm>
#include <charconv>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <memory>
#include <system_error>
#include <vector>

#include "apps/zarn/carryover.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/stagedjson.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/mosaic/mosaicfile.h"
#include "apps/zarn/mosaic/mosaicreport.h"
#include "apps/zarn/mosaic/tilerunner.h"
#include "apps/zarn/progress.h"
#include "apps/zarn/stagingfolder.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

// Metadata item of a tile that says which plan it was made for.
constexpr const char* kPlanItem = "ZARN_PLAN";

void SetUp(const WorkOptions& work) {
  if (work.quiet) SilenceWarnings();
  SetGdalThreads(work.threads);
}

RasterSource LeadingScene(const MosaicPlan& plan) { return RasterSource(plan.Leading().File()); }

/// Where the tiles of a plan are.
class TileFolder {
 public:
  TileFolder(const std::string& plan, std::string fingerprint)
      : folder_(fs::absolute(plan) += ".tiles"), fingerprint_(std::move(fingerprint)) {}

  void Create() const {
    std::error_code error;
    fs::create_directories(folder_, error);
    if (error) throw RunError("cannot create " + folder_.string() + ": " + error.message());
  }

  /// Throws `UsageError` when a file of a scene lies where the tiles go.
  void RequireApart(const MosaicPlan& plan) const {
    for (const ScenePlan& scene : plan.scenes) {
      for (const FileState& file : scene.files) RequireApart(file.name);
    }
  }

  std::string Image(std::size_t tile) const { return Name(tile, ".tif"); }
  std::string Map(std::size_t tile) const { return Name(tile, ".map.tif"); }
  const std::string& Fingerprint() const { return fingerprint_; }

  /// Whether a tile of this very plan is there, whole, with its map if it has to have one.
  bool Has(std::size_t tile, bool withMap) const {
    return IsWhole(Image(tile)) && (!withMap || IsWhole(Map(tile)));
  }

 private:
  // Of a file that was cut off the last row cannot be read.
  bool IsWhole(const std::string& file) const {
    std::error_code error;
    if (!fs::exists(file, error)) return false;
    const CPLErrorHandlerPusher quiet(CPLQuietErrorHandler);
    const DatasetPtr dataset(GDALDataset::Open(file.c_str(), GDAL_OF_RASTER | GDAL_OF_READONLY));
    if (!dataset) return false;
    const char* const made = dataset->GetMetadataItem(kPlanItem);
    if (made == nullptr || fingerprint_ != made) return false;
    const int width = dataset->GetRasterXSize();
    std::vector<double> row(static_cast<std::size_t>(width));
    for (int band = 1; band <= dataset->GetRasterCount(); ++band) {
      if (dataset->GetRasterBand(band)->RasterIO(GF_Read, 0, dataset->GetRasterYSize() - 1, width,
                                                 1, row.data(), width, 1, GDT_Float64, 0, 0,
                                                 nullptr) != CE_None) {
        return false;
      }
    }
    return true;
  }

  void RequireApart(const std::string& file) const {
    std::error_code error;
    if (!fs::equivalent(fs::path(file).parent_path(), folder_, error)) return;
    throw UsageError(
        file + " lies in " + folder_.string() +
        ", the folder for the plan's tiles; move it elsewhere and make the plan again");
  }

  std::string Name(std::size_t tile, const char* extension) const {
    constexpr std::size_t kDigits = 6;
    std::string number = std::to_string(tile + 1);
    if (number.size() < kDigits) number.insert(0, kDigits - number.size(), '0');
    return (folder_ / ("tile_" + number + extension)).string();
  }

  fs::path folder_;
  std::string fingerprint_;
};

template <typename Work>
double Seconds(const Work& work) {
  const auto start = std::chrono::steady_clock::now();
  work();
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

OutputGrid PartOf(const OutputGrid& grid, const Window& window) {
  OutputGrid part = grid;
  part.width = static_cast<int>(window.width);
  part.height = static_cast<int>(window.height);
  const auto x = static_cast<double>(window.x);
  const auto y = static_cast<double>(window.y);
  part.transform[0] += x * grid.transform[1] + y * grid.transform[2];
  part.transform[3] += x * grid.transform[4] + y * grid.transform[5];
  return part;
}

// A VRT holds no pixels; only tiles that stay can be joined by one.
void RefuseVrt(const OutputOptions& output) {
  if (!IsVrt(output)) return;
  throw UsageError("a VRT joins tiles that are files: use zarn mosaic plan, run and finish");
}

void RequireTiles(const TileFolder& folder, std::size_t count, bool withMap,
                  const std::string& plan) {
  std::vector<std::size_t> missing;
  for (std::size_t i = 0; i < count; ++i) {
    if (!folder.Has(i, withMap)) missing.push_back(i + 1);
  }
  if (missing.empty()) return;
  throw RunError(std::to_string(missing.size()) + " of " + std::to_string(count) +
                 " tiles are missing, broken or of another plan, the first one being number " +
                 std::to_string(missing.front()) + "; make them with zarn mosaic run " + plan);
}

void TakeWhole(CPLXMLNode& source) {
  CPLFree(source.pszValue);
  source.pszValue = CPLStrdup("SimpleSource");
  for (const char* const condition : {"UseMaskBand", "NODATA"}) {
    CPLXMLNode* const node = CPLGetXMLNode(&source, condition);
    if (node == nullptr) continue;
    CPLRemoveXMLChild(&source, node);
    CPLDestroyXMLNode(node);
  }
}

// The text of a VRT whose sources give all of their pixels. Tiles share none, so nothing shows
// through where one has no data: what it holds there is what the mosaic holds.
std::string WithWholeSources(const char* vrt) {
  const std::unique_ptr<CPLXMLNode, decltype(&CPLDestroyXMLNode)> root(CPLParseXMLString(vrt),
                                                                       CPLDestroyXMLNode);
  if (!root) return {};
  std::vector<CPLXMLNode*> open{root.get()};
  while (!open.empty()) {
    CPLXMLNode* const node = open.back();
    open.pop_back();
    if (node->eType == CXT_Element && EQUAL(node->pszValue, "ComplexSource")) TakeWhole(*node);
    if (node->psNext != nullptr) open.push_back(node->psNext);
    if (node->psChild != nullptr) open.push_back(node->psChild);
  }
  const std::unique_ptr<char, decltype(&VSIFree)> text(CPLSerializeXMLTree(root.get()), VSIFree);
  return text ? text.get() : "";
}

// Writes the text of a VRT that refers to its tiles from where it is going to lie, after `describe`
// has seen to what the tiles' own description does not say of the whole.
template <typename Describe>
void WriteVrt(const std::string& target, bool overwrite, const std::vector<std::string>& tiles,
              const Describe& describe) {
  StagingFolder staging(target, overwrite);
  std::vector<const char*> names;
  names.reserve(tiles.size());
  for (const std::string& tile : tiles) names.push_back(tile.c_str());
  CPLErrorReset();
  int failed = FALSE;
  const fs::path place = fs::absolute(target);
  const DatasetPtr vrt(GDALDataset::FromHandle(GDALBuildVRT(
      place.c_str(), static_cast<int>(names.size()), nullptr, names.data(), nullptr, &failed)));
  if (!vrt || failed != FALSE) {
    throw RunError("cannot join the tiles as " + target + ": " + LastGdalMessage());
  }
  describe(*vrt);
  char** const xml = vrt->GetMetadata("xml:VRT");
  const std::string text = xml != nullptr ? WithWholeSources(xml[0]) : "";
  std::ofstream file(staging.StagedFile(), std::ios::binary);
  file << text;
  file.close();
  if (!file || text.empty()) FailWriting(target, "");
  // The data set must not write itself at the end.
  vrt->SetDescription("");
  staging.Publish();
}

void JoinAsVrt(const MosaicPlan& plan, const TileFolder& folder, std::size_t count,
               bool overwrite) {
  std::vector<std::string> images;
  std::vector<std::string> maps;
  for (std::size_t i = 0; i < count; ++i) {
    images.push_back(folder.Image(i));
    maps.push_back(folder.Map(i));
  }
  if (!plan.sourceMap.empty()) {
    WriteVrt(plan.sourceMap, overwrite, maps, [&](GDALDataset& map) { NameScenes(plan, map); });
  }
  const RasterSource like = LeadingScene(plan);
  WriteVrt(plan.output.target, overwrite, images,
           [&](GDALDataset& image) { Describe(like, plan.noData, image, &plan.grid); });
}

}  // namespace

void MakeMosaic(const MosaicOptions& options) {
  SetUp(options.work);
  RefuseVrt(options.output);
  std::optional<MosaicReport> report;
  if (!options.report.empty()) report.emplace(options);
  TerminalProgress progress(options.work.quiet);
  ProgressSpan planningSpan(progress, 0, 0.2);
  Planning planning = MakePlan(options, planningSpan);
  const MosaicPlan& plan = planning.plan;
  if (report) report->Begin(plan);
  const RasterSource like = LeadingScene(plan);
  MosaicFile file(plan, like, plan.grid, plan.output, plan.sourceMap);
  const double end = report ? 0.97 : 1;
  const double pasted = file.CopiesAtTheEnd() ? 0.7 : end - 0.01;
  ProgressSpan running(progress, 0.2, pasted);
  const auto take = [&](const TilePlan& part, TileBuffers& tile) {
    if (report) report->Take(part, tile);
    file.Write(tile, 0, 0);
  };
  const auto run = [&] { RunTiles(plan, like, plan.Tiles(), options.work, take, running); };
  planning.seconds.emplace_back("tiles", Seconds(run));
  ProgressSpan publishing(progress, pasted, end);
  planning.seconds.emplace_back("publishing", Seconds([&] { file.Publish(publishing); }));
  if (!report) return;
  report->Publish(planning);
  progress.Update(1);
}

void WritePlan(const MosaicOptions& options, const std::string& file) {
  SetUp(options.work);
  StagedJson staged(file, options.output.overwrite);
  TerminalProgress progress(options.work.quiet);
  Planning planning = MakePlan(options, progress);
  // The parts of the job may be run from anywhere.
  std::string& target = planning.plan.output.target;
  target = fs::absolute(target).string();
  std::string& map = planning.plan.sourceMap;
  if (!map.empty()) map = fs::absolute(map).string();
  staged.Write(ToJson(planning.plan));
  staged.Publish();
  progress.Update(1);
}

TileRange ParseTiles(const std::string& text) {
  TileRange range;
  if (text.empty()) return range;
  const char* const end = text.data() + text.size();
  const auto [dash, error] = std::from_chars(text.data(), end, range.first);
  bool good = error == std::errc() && range.first > 0;
  range.last = range.first;
  if (good && dash != end) {
    good = *dash == '-';
    range.last = 0;
    if (good && dash + 1 != end) {
      const auto [rest, lastError] = std::from_chars(dash + 1, end, range.last);
      good = lastError == std::errc() && rest == end && range.last >= range.first;
    }
  }
  if (good) return range;
  throw UsageError("--tiles: '" + text + "' is not of the form A-B, counted from 1");
}

void RunPlan(const std::string& file, const TileRange& range, const WorkOptions& work) {
  SetUp(work);
  const MosaicPlan plan = ReadPlan(file);
  std::vector<TilePlan> tiles = plan.Tiles();
  const std::size_t last = range.last == 0 ? tiles.size() : range.last;
  if (last > tiles.size() || range.first > last) {
    throw UsageError("--tiles: " + file + " has " + std::to_string(tiles.size()) + " tiles");
  }
  RequireUnchanged(plan);
  const TileFolder folder(file, Fingerprint(plan));
  folder.RequireApart(plan);
  folder.Create();
  std::vector<TilePlan> missing;
  std::vector<std::size_t> numbers;
  for (std::size_t i = range.first - 1; i < last; ++i) {
    if (folder.Has(i, !plan.sourceMap.empty())) continue;
    missing.push_back(std::move(tiles[i]));
    numbers.push_back(i);
  }
  TerminalProgress progress(work.quiet);
  if (missing.empty()) {
    progress.Update(1);
    return;
  }
  const RasterSource like = LeadingScene(plan);
  std::size_t next = 0;
  RunTiles(
      plan, like, missing, work,
      [&](const TilePlan& tile, TileBuffers& buffers) {
        const std::size_t number = numbers[next++];
        const OutputOptions output{.target = folder.Image(number),
                                   .format = "GTiff",
                                   .creation = {},
                                   .overwrite = true,
                                   .apartFromInputs = true};
        MosaicFile result(plan, like, PartOf(plan.grid, tile.window), output,
                          plan.sourceMap.empty() ? "" : folder.Map(number));
        result.Annotate(kPlanItem, folder.Fingerprint());
        result.Write(buffers, tile.window.x, tile.window.y);
        SilentProgress silent;
        result.Publish(silent);
      },
      progress);
}

void FinishPlan(const std::string& file, const FinishOptions& options, const WorkOptions& work) {
  SetUp(work);
  MosaicPlan plan = ReadPlan(file);
  if (!options.format.empty()) plan.output.format = options.format;
  if (!options.creation.empty()) plan.output.creation = options.creation;
  plan.output.overwrite |= options.overwrite;
  const TileFolder folder(file, Fingerprint(plan));
  const std::vector<TilePlan> tiles = plan.Tiles();
  RequireTiles(folder, tiles.size(), !plan.sourceMap.empty(), file);
  RequireUnchanged(plan);
  if (IsVrt(plan.output)) {
    JoinAsVrt(plan, folder, tiles.size(), plan.output.overwrite);
    return;
  }
  const RasterSource like = LeadingScene(plan);
  MosaicFile result(plan, like, plan.grid, plan.output, plan.sourceMap);
  TerminalProgress progress(work.quiet);
  ProgressSpan joining(progress, 0, result.CopiesAtTheEnd() ? 0.5 : 0.99);
  TileBuffers buffers;
  for (std::size_t i = 0; i < tiles.size(); ++i) {
    const RasterSource image(folder.Image(i));
    const DatasetPtr map = plan.sourceMap.empty() ? nullptr : OpenRaster(folder.Map(i));
    ReadTile(image, map.get(), tiles[i].window, buffers);
    result.Write(buffers, 0, 0);
    joining.Update(static_cast<double>(i + 1) / static_cast<double>(tiles.size()));
  }
  ProgressSpan publishing(progress, result.CopiesAtTheEnd() ? 0.5 : 0.99, 1);
  result.Publish(publishing);
}

}  // namespace zarn::app
