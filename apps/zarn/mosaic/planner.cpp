// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/planner.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <filesystem>
#include <set>
#include <system_error>

#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/estimate/hotspotestimate.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/gridoptions.h"
#include "apps/zarn/mosaic/cutlineset.h"
#include "apps/zarn/mosaic/cutlinewriter.h"
#include "apps/zarn/mosaic/mosaicfile.h"
#include "apps/zarn/mosaic/mosaicreport.h"
#include "apps/zarn/mosaic/seampolygons.h"
#include "apps/zarn/mosaic/seams.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/outputformat.h"
#include "apps/zarn/progress.h"
#include "apps/zarn/sourcelocator.h"
#include "apps/zarn/windowgeometry.h"
#include "host/sys/openmp.h"
#include "processes/filters/factories/cutlineblendingfactory.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

// Kinds of land cover that a hot spot is told apart from.
constexpr std::size_t kClasses = 20;

// How far from its cutline a scene may fill gaps, in cells of the survey.
constexpr std::int64_t kGapReach = 16;

BalanceKind KindOf(const std::string& name) {
  if (name == "gain-offset") return BalanceKind::kGainOffset;
  return name == "dodging" ? BalanceKind::kDodging : BalanceKind::kNone;
}

Window Clipped(const Window& window, const OutputGrid& grid) {
  const std::int64_t x = std::clamp<std::int64_t>(window.x, 0, grid.width);
  const std::int64_t y = std::clamp<std::int64_t>(window.y, 0, grid.height);
  return {x, y, std::clamp<std::int64_t>(window.x + window.width, x, grid.width) - x,
          std::clamp<std::int64_t>(window.y + window.height, y, grid.height) - y};
}

/// A scene while the grid is not settled yet.
struct Candidate {
  ScenePlan plan;
  OutputGrid grid;               ///< that covers it, in the mosaic's coordinate system
  std::optional<Ground> ground;  ///< where its own grid lies in that system
};

bool IsNorthUp(const OutputGrid& grid) {
  return grid.transform[2] == 0 && grid.transform[4] == 0 && grid.transform[1] > 0 &&
         grid.transform[5] < 0;
}

// Its own grid where that lies in the mosaic's system, along its axes.
std::optional<OutputGrid> OwnGrid(const RasterSource& source, const OGRSpatialReference& crs) {
  OutputGrid grid;
  GDALDataset& dataset = source.Dataset();
  if (dataset.GetGeoTransform(grid.transform.data()) != CE_None) return std::nullopt;
  const OGRSpatialReference* const own = dataset.GetSpatialRef();
  const bool same = own == nullptr ? crs.IsEmpty() : !crs.IsEmpty() && SameSystem(*own, crs);
  if (!same || !IsNorthUp(grid)) return std::nullopt;
  grid.width = source.Width();
  grid.height = source.Height();
  grid.crs = crs;
  return grid;
}

[[noreturn]] void RefuseInput(const std::string& target, const std::string& input) {
  throw UsageError("the output " + target + " is the input " + input + "; name another output");
}

[[noreturn]] void RefuseFolder(const std::string& target, const fs::path& folder) {
  throw RunError("cannot write " + target + ": there is no folder " + folder.string() +
                 "; create it first");
}

class Planner {
 public:
  Planner(const MosaicOptions& options, nspio::Counter& progress)
      : options_(options), progress_(progress) {}

  Planning Make() {
    const sys::OMPThreadCount threads(sys::OMPThreadsFor(options_.work.threads));
    CheckOptions();
    OpenScenes();
    LayGrid();
    PlaceScenes();
    RequireNeighbours();
    if (!options_.writeCutlines.empty() && plan_.scenes.size() < 2) {
      throw UsageError("--write-cutlines: a single scene has no seams");
    }
    Order();
    if (!options_.cutlines.empty()) {
      AssignCutlines(options_.cutlines, options_.cutlineId, *mosaic_, !options_.extent.empty(),
                     plan_.scenes);
    }
    RefuseOutputs();
    Step("hot spots", 0, 0.4, [&](nspio::Counter& span) { RemoveHotSpots(span); });
    if (NeedsSurvey()) {
      Step("survey", 0.4, 0.7, [&](nspio::Counter& span) { TakeSurveys(span); });
      Step("balancing", 0.7, 0.8, [&](nspio::Counter&) { BalanceScenes(); });
      Step("seams", 0.8, 1, [&](nspio::Counter& span) { PlaceSeams(span); });
    }
    SettleReach();
    return std::move(planning_);
  }

 private:
  template <typename Work>
  void Step(const std::string& name, double begin, double end, const Work& work) {
    const auto start = std::chrono::steady_clock::now();
    ProgressSpan span(progress_, begin, end);
    work(span);
    const std::chrono::duration<double> taken = std::chrono::steady_clock::now() - start;
    planning_.seconds.emplace_back(name, taken.count());
  }

  bool FindsSeams() const { return options_.cutlines.empty() && options_.seams == "path"; }
  bool NeedsSurvey() const {
    return options_.balance != "none" || !options_.report.empty() ||
           (FindsSeams() && plan_.scenes.size() > 1);
  }

  void CheckOptions() const;
  void OpenScenes();
  void Add(const std::string& name, const RasterSource& source);
  std::string LabelFor(const std::string& name);
  void LayGrid();
  void PlaceScenes();
  void RequireNeighbours() const;
  void Order();
  void SortByResolution(std::vector<ScenePlan>& scenes) const;
  std::vector<std::string> Inputs() const;
  void RefuseOutputs() const;
  void RemoveHotSpots(nspio::Counter& progress);
  void TakeSurveys(nspio::Counter& progress);
  void BalanceScenes();
  void PlaceSeams(nspio::Counter& progress);
  void SettleReach();

  const MosaicOptions& options_;
  nspio::Counter& progress_;
  Planning planning_;
  MosaicPlan& plan_ = planning_.plan;
  std::optional<RasterSource> first_;
  std::optional<RasterSource> mosaic_;
  std::vector<Candidate> candidates_;
  std::set<std::string> labels_;
};

void Planner::CheckOptions() const {
  RequireNumbers("--te", options_.extent);
  RequireNumbers("--tr", options_.resolution);
  if (options_.stopOnNoData && options_.cutlines.empty()) {
    throw UsageError(
        "--stop-on-nodata needs --cutlines: seams that are placed here reach beyond the data");
  }
  if (!options_.cutlineId.empty() && options_.cutlines.empty()) {
    throw UsageError("--cutline-id needs --cutlines");
  }
  if (!options_.writeCutlines.empty() && !FindsSeams()) {
    throw UsageError(
        "--write-cutlines: there are no seams to write with --cutlines or --seams none");
  }
  if (options_.feather > 0 && options_.cutlines.empty() && !FindsSeams()) {
    throw UsageError("--feather: with --seams none there are no cutlines to be softened");
  }
  if (options_.filterSize != MosaicOptions().filterSize && options_.filter == "none") {
    throw UsageError("--filter-size needs --filter");
  }
  if (!options_.reference.empty() && options_.balance == "none" && !options_.hotSpot) {
    throw UsageError("--reference needs --balance or --hotspot, which bring scenes onto it");
  }
}

std::string Planner::LabelFor(const std::string& name) {
  const std::string stem = fs::path(name).stem().string();
  std::string label = stem;
  for (int i = 2; !labels_.insert(label).second; ++i) label = stem + "_" + std::to_string(i);
  return label;
}

// All is looked at that can be told from the files' headers.
void Planner::OpenScenes() {
  const OGRSpatialReference asked =
      options_.crs.empty() ? OGRSpatialReference() : ParseCrs(options_.crs);
  if (!options_.crs.empty()) plan_.grid.crs = asked;
  for (const std::string& name : options_.scenes) {
    RasterSource source(name);
    source.RefusePalette();
    if (!first_) {
      RequireSampleType(
          source, OnWindows(std::unique_ptr<processes::filters::IFilter>(
                                processes::filters::CutlineBlendingFactory({}, 0).GetCPUFilter()),
                            {}));
      if (options_.crs.empty()) plan_.grid.crs = SourceLocator(source, nullptr, "").Crs();
    } else {
      RequireSameSamples(*first_, source);
    }
    Add(name, source);
    if (!first_) first_.emplace(std::move(source));
  }
  plan_.noData = NoDataOf(*first_, "--dst-nodata", options_.dstNoData);
  for (const Candidate& candidate : candidates_) {
    if (!plan_.noData.empty() || !options_.dstNoData.empty()) break;
    plan_.noData = candidate.plan.noData;
  }
}

void Planner::Add(const std::string& name, const RasterSource& source) {
  Candidate candidate;
  candidate.plan.files = FilesOf(source);
  candidate.plan.label = LabelFor(name);
  candidate.plan.noData = NoDataOf(source, "--src-nodata", options_.srcNoData);
  const std::optional<OutputGrid> own = OwnGrid(source, plan_.grid.crs);
  if (own) {
    candidate.grid = *own;
    candidate.ground.emplace(source);
  } else {
    const OGRSpatialReference& crs = plan_.grid.crs;
    candidate.grid = SourceLocator(source, crs.IsEmpty() ? nullptr : &crs, "").SuggestGrid();
  }
  candidates_.push_back(std::move(candidate));
}

// The first scene's grid, so that its pixels can be copied, as far as the scenes reach.
void Planner::LayGrid() {
  OutputGrid& grid = plan_.grid;
  const OutputGrid& first = candidates_.front().grid;
  const std::array<double, 6>& t = first.transform;
  double left = 0;
  double top = 0;
  double right = 0;
  double bottom = 0;
  for (const Candidate& candidate : candidates_) {
    const OutputGrid& own = candidate.grid;
    left = std::min(left, (own.transform[0] - t[0]) / t[1]);
    top = std::min(top, (own.transform[3] - t[3]) / t[5]);
    right = std::max(right, (own.transform[0] + own.width * own.transform[1] - t[0]) / t[1]);
    bottom = std::max(bottom, (own.transform[3] + own.height * own.transform[5] - t[3]) / t[5]);
  }
  // Rounding must not add a row of nothing.
  constexpr double kSlack = 0.01;
  left = std::floor(left + kSlack);
  top = std::floor(top + kSlack);
  const double width = std::ceil(right - kSlack) - left;
  const double height = std::ceil(bottom - kSlack) - top;
  constexpr double kMost = 2147483647;
  if (!(width <= kMost && height <= kMost)) {
    throw RunError(
        "the mosaic would have more than 2147483647 columns or rows; give a smaller "
        "extent with --te or a larger --tr");
  }
  const OGRSpatialReference crs = grid.crs;
  grid = first;
  grid.crs = crs;
  grid.transform[0] += left * t[1];
  grid.transform[3] += top * t[5];
  grid.width = static_cast<int>(width);
  grid.height = static_cast<int>(height);
  grid = Adjusted(grid, options_.extent, options_.resolution);
}

void Planner::PlaceScenes() {
  mosaic_.emplace(GridRaster(options_.output.target, plan_.grid, first_->Type()));
  const Ground ground(*mosaic_);
  for (Candidate& candidate : candidates_) {
    ScenePlan& scene = candidate.plan;
    if (candidate.ground) scene.place = FindOnGrid(ground, *candidate.ground);
    const OutputGrid& own = candidate.grid;
    const std::array<double, 6>& t = own.transform;
    const double left = ground.Column(t[0], t[3]);
    const double top = ground.Row(t[0], t[3]);
    const double x = t[0] + own.width * t[1];
    const double y = t[3] + own.height * t[5];
    if (scene.place) {
      scene.covers = {scene.place->column, scene.place->row, own.width, own.height};
    } else {
      // A bound that is suggested may be a little too narrow.
      constexpr double kMargin = 2;
      const auto low = [](double value) {
        return static_cast<std::int64_t>(std::floor(std::clamp(value - kMargin, -1e9, 3e9)));
      };
      const auto high = [](double value) {
        return static_cast<std::int64_t>(std::ceil(std::clamp(value + kMargin, -1e9, 3e9)));
      };
      scene.covers = {low(left), low(top), high(ground.Column(x, y)) - low(left),
                      high(ground.Row(x, y)) - low(top)};
    }
    scene.covers = Clipped(scene.covers, plan_.grid);
    if (IsEmpty(scene.covers)) {
      Warn(scene.File() + " lies outside of the mosaic's extent and is left out");
    } else {
      plan_.scenes.push_back(scene);
    }
  }
  if (plan_.scenes.empty()) {
    throw RunError("no scene lies within --te; compare it with the scenes' extents (gdalinfo)");
  }
  plan_.output = options_.output;
  plan_.sourceMap = options_.sourceMap;
  plan_.resampling = options_.resampling;
  plan_.threshold = options_.threshold;
  if (options_.filter != "none") plan_.filter = {options_.filter, options_.filterSize};
  plan_.feather = options_.feather;
  plan_.fillsGaps = options_.fillGaps || FindsSeams();
  plan_.stopsOnNoData = options_.stopOnNoData;
  plan_.tileSide = options_.tileSide;
}

// A scene far off is mostly one that lies in a wrong place, and would make the mosaic huge.
void Planner::RequireNeighbours() const {
  if (!options_.extent.empty()) return;
  const std::vector<ScenePlan>& scenes = plan_.scenes;
  std::vector<bool> tied(scenes.size(), false);
  std::vector<std::size_t> open{0};
  tied[0] = true;
  while (!open.empty()) {
    // Scenes that only touch are neighbours too.
    Window around = scenes[open.back()].covers;
    open.pop_back();
    around = {around.x - 1, around.y - 1, around.width + 2, around.height + 2};
    for (std::size_t i = 0; i < scenes.size(); ++i) {
      if (tied[i] || !Meet(around, scenes[i].covers)) continue;
      tied[i] = true;
      open.push_back(i);
    }
  }
  for (std::size_t i = 0; i < scenes.size(); ++i) {
    if (tied[i]) continue;
    throw RunError(scenes[i].File() + " does not overlap " + scenes.front().File() +
                   ", neither directly nor through the other scenes; leave it out, or give --te if "
                   "the gap between them is meant");
  }
}

void Planner::Order() {
  const std::string leading = plan_.scenes.front().label;
  if (options_.order == "reverse") std::reverse(plan_.scenes.begin(), plan_.scenes.end());
  if (options_.order == "resolution") SortByResolution(plan_.scenes);
  plan_.leading = static_cast<std::size_t>(
      std::find_if(plan_.scenes.begin(), plan_.scenes.end(),
                   [&](const ScenePlan& scene) { return scene.label == leading; }) -
      plan_.scenes.begin());
}

void Planner::SortByResolution(std::vector<ScenePlan>& scenes) const {
  // The finest last, on top.
  const auto area = [&](const ScenePlan& scene) {
    for (const Candidate& candidate : candidates_) {
      if (candidate.plan.File() != scene.File()) continue;
      const std::array<double, 6>& t = candidate.grid.transform;
      return std::abs(t[1] * t[5]);
    }
    return 0.0;
  };
  std::stable_sort(scenes.begin(), scenes.end(), [&](const ScenePlan& a, const ScenePlan& b) {
    return area(a) > area(b) * (1 + 1e-6);
  });
}

// All that is read, as it was named.
std::vector<std::string> Planner::Inputs() const {
  std::vector<std::string> inputs{options_.reference, options_.cutlines, options_.config};
  for (const ScenePlan& scene : plan_.scenes) {
    for (const FileState& file : scene.files) inputs.push_back(file.name);
  }
  std::erase(inputs, "");
  return inputs;
}

// Before anything long begins.
void Planner::RefuseOutputs() const {
  std::vector<std::string> targets{options_.output.target, options_.sourceMap,
                                   options_.writeCutlines, options_.plan};
  if (!options_.report.empty()) targets.push_back(ReportFile(options_.report).string());
  std::erase(targets, "");
  std::set<fs::path> places;
  const std::vector<std::string> inputs = Inputs();
  for (const std::string& target : targets) {
    std::error_code error;
    const fs::path place = fs::weakly_canonical(fs::absolute(target, error), error);
    if (!places.insert(place).second) {
      throw UsageError("two outputs have the name " + target + "; give each one of its own");
    }
    for (const std::string& input : inputs) {
      if (!fs::equivalent(input, target, error)) continue;
      RefuseInput(target, input);
    }
    if (!options_.output.overwrite && fs::exists(fs::symlink_status(target, error))) {
      throw RunError(target + " exists; name another output or add --overwrite");
    }
    const bool inReport =
        !options_.report.empty() && target == ReportFile(options_.report).string();
    if (!inReport && !fs::is_directory(place.parent_path(), error)) {
      RefuseFolder(target, place.parent_path());
    }
  }
  // A VRT joins tiles, and is written without a format of its own.
  if (IsVrt(options_.output)) return;
  OutputFormat(options_.output.format, options_.output.target, options_.output.creation)
      .RequireSamples(first_->Type());
}

void Planner::RemoveHotSpots(nspio::Counter& progress) {
  if (!options_.hotSpot) return;
  std::size_t done = 0;
  for (ScenePlan& scene : plan_.scenes) {
    std::vector<RasterSource> sources;
    sources.emplace_back(scene.File());
    if (!options_.reference.empty()) sources.emplace_back(options_.reference);
    const auto count = static_cast<double>(plan_.scenes.size());
    ProgressSpan span(progress, static_cast<double>(done) / count,
                      static_cast<double>(done + 1) / count);
    ++done;
    const HotSpotEstimate estimate = EstimateHotSpot(sources, options_.srcNoData, kClasses, span);
    for (const QuadraticFit& fit : estimate.fits) {
      scene.hotSpot.emplace_back(fit.coefficients.begin(), fit.coefficients.end());
    }
  }
}

void Planner::TakeSurveys(nspio::Counter& progress) {
  planning_.survey = LaySurvey(plan_.grid, *first_);
  TakeSurvey(plan_.scenes, options_.work, *planning_.survey, progress);
}

void Planner::BalanceScenes() {
  const BalanceKind kind = KindOf(options_.balance);
  if (kind == BalanceKind::kNone) return;
  Survey& survey = *planning_.survey;
  std::size_t anchor = 0;
  bool isScene = options_.reference.empty();
  const std::string reference = AbsoluteFile(options_.reference);
  const auto same = [](const std::string& a, const std::string& b) {
    std::error_code error;
    return a == b || fs::equivalent(a, b, error);
  };
  for (std::size_t i = 0; i < plan_.scenes.size(); ++i) {
    const std::string& file = plan_.scenes[i].File();
    // The first one listed, wherever it is pasted.
    const bool chosen = options_.reference.empty() ? file == AbsoluteFile(options_.scenes.front())
                                                   : same(file, reference);
    if (!chosen) continue;
    anchor = i;
    isScene = true;
  }
  if (isScene) {
    Balance(kind, survey, anchor, !options_.reference.empty(), plan_.scenes);
    return;
  }
  RasterSource source(options_.reference);
  source.RefusePalette();
  RequireSameSamples(*first_, source);
  ScenePlan scene;
  scene.files = {FileState::Of(reference)};
  scene.noData = NoDataOf(source, "--src-nodata", "");
  scene.covers = {0, 0, plan_.grid.width, plan_.grid.height};
  SilentProgress silent;
  TakeSurvey({scene}, options_.work, survey, silent);
  Balance(kind, survey, survey.scenes.size() - 1, true, plan_.scenes);
  survey.scenes.pop_back();
}

void Planner::PlaceSeams(nspio::Counter& progress) {
  if (!FindsSeams() || plan_.scenes.size() < 2) return;
  const Survey& survey = *planning_.survey;
  std::vector<SceneView> views;
  for (std::size_t i = 0; i < plan_.scenes.size(); ++i) {
    views.push_back(ViewOf(survey, i, &plan_.scenes[i]));
  }
  const WindowSize lattice{survey.lattice.width, survey.lattice.height};
  planning_.labels = FindSeams(
      views, lattice, {.feather = static_cast<double>(plan_.feather) / survey.step}, progress);
  const std::vector<ScenePolygon> polygons =
      SeamPolygons(planning_.labels, lattice, plan_.scenes.size(), survey.step, 1);
  for (std::size_t i = 0; i < plan_.scenes.size(); ++i) {
    Polygon& cutline = plan_.scenes[i].cutline;
    for (const auto& ring : polygons[i].rings) {
      cutline.starts.push_back(static_cast<std::int32_t>(cutline.vertices.size() / 2));
      for (const auto& [x, y] : ring) cutline.vertices.insert(cutline.vertices.end(), {x, y});
    }
  }
  if (options_.writeCutlines.empty()) return;
  std::vector<std::string> names;
  for (const ScenePlan& scene : plan_.scenes) names.push_back(scene.label);
  WriteCutlines(options_.writeCutlines, options_.output.overwrite, plan_.grid, names, polygons);
}

void Planner::SettleReach() {
  // Seams are as exact as the lattice on which they were found, also when they are given back.
  const std::int64_t gap = plan_.fillsGaps ? kGapReach * LaySurvey(plan_.grid, *first_).step : 0;
  for (ScenePlan& scene : plan_.scenes) {
    if (scene.cutline.Empty()) {
      // A seam may have left nothing of a scene.
      const bool hidden = !planning_.labels.empty();
      scene.reach = hidden ? Window{} : scene.covers;
      continue;
    }
    double left = scene.cutline.vertices[0];
    double top = scene.cutline.vertices[1];
    double right = left;
    double bottom = top;
    for (std::size_t i = 0; i < scene.cutline.vertices.size(); i += 2) {
      left = std::min(left, scene.cutline.vertices[i]);
      right = std::max(right, scene.cutline.vertices[i]);
      top = std::min(top, scene.cutline.vertices[i + 1]);
      bottom = std::max(bottom, scene.cutline.vertices[i + 1]);
    }
    const auto held = [](double value) {
      return static_cast<std::int64_t>(std::clamp(value, -1e9, 3e9));
    };
    const std::int64_t margin = std::int64_t{plan_.feather} + 1 + gap;
    const Window around{held(std::floor(left)) - margin, held(std::floor(top)) - margin,
                        held(std::ceil(right)) - held(std::floor(left)) + 2 * margin,
                        held(std::ceil(bottom)) - held(std::floor(top)) + 2 * margin};
    // Where a scene must have data it is looked at even beyond its own.
    scene.reach =
        plan_.stopsOnNoData ? Clipped(around, plan_.grid) : Intersection(around, scene.covers);
    if (IsEmpty(scene.reach)) scene.reach = {};
  }
}

}  // namespace

Planning MakePlan(const MosaicOptions& options, nspio::Counter& progress) {
  return Planner(options, progress).Make();
}

}  // namespace zarn::app
