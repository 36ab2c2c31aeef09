// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/survey.h"

#include <cpl_conv.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cstring>
#include <exception>
#include <mutex>
#include <thread>
#include <utility>

#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/mosaic/scenefeed.h"
#include "apps/zarn/mosaic/tilerunner.h"
#include "apps/zarn/streamer.h"
#include "host/sys/openmp.h"

namespace zarn::app {
namespace {

constexpr std::int64_t kMostCells = std::int64_t{1} << 22;
// Pixels of a scene to read at a time at most; more would only cost memory.
constexpr std::int64_t kPiece = std::int64_t{1} << 21;
// Error of a position that does not matter here, in pixels of a scene.
constexpr double kThreshold = 0.5;

std::int64_t DivideUp(std::int64_t a, std::int64_t b) { return (a + b - 1) / b; }

// Where the lattice lies along the rows of a scene, those between its own need neither be copied
// nor looked at, nor decoded if each is on its own. The blocks stay in GDAL's cache meanwhile.
std::int64_t PixelsAtATime(const ScenePlan& scene, const Survey& survey, const WorkOptions& work) {
  const RasterSource source(scene.File());
  const std::int64_t blockRow = std::int64_t{source.Width()} * source.BlockHeight() *
                                source.Dataset().GetRasterCount() *
                                static_cast<std::int64_t>(source.Type().Bytes());
  if (scene.place && blockRow * sys::OMPThreadsFor(work.threads) < GDALGetCacheMax64() / 2) {
    return scene.covers.width + std::int64_t{2} * survey.step;
  }
  return std::min(kPiece, MostSourcePixels(survey.channels * survey.type.Bytes(), work));
}

SurveyedScene SurveyScene(const ScenePlan& scene, const Survey& survey, const WorkOptions& work) {
  FeedRequest request;
  request.grid = survey.lattice;
  request.resampling = "nearest";
  request.threshold = kThreshold;
  request.mostSourcePixels = PixelsAtATime(scene, survey, work);
  request.isMosaic = false;
  SceneFeed feed(scene, request);
  SurveyedScene result{scene.File(), CellsOf(survey, scene.covers), {}, {}};
  GridMover::Slot slot;
  feed.Read(result.area, slot);
  feed.Fill(slot);
  const Plane& output = slot.result.output;
  result.samples.assign(output.Data(), output.Data() + output.Size());
  result.valid.resize(slot.covered.Size());
  std::memcpy(result.valid.data(), slot.covered.Data(), slot.covered.Size());
  return result;
}

}  // namespace

RasterSource Survey::Raster(std::size_t scene) const {
  const SurveyedScene& surveyed = scenes[scene];
  const auto width = static_cast<int>(surveyed.area.width);
  const auto height = static_cast<int>(surveyed.area.height);
  const auto bands = static_cast<int>(channels);
  CPLStringList options;
  if (type.IsSignedByte()) options.SetNameValue("PIXELTYPE", "SIGNEDBYTE");
  DatasetPtr dataset(GetGDALDriverManager()->GetDriverByName("MEM")->Create(
      "", width, height, bands, type.gdal, options.List()));
  const auto require = [&](bool done) {
    if (!done) throw RunError("cannot hold " + surveyed.name + ": " + LastGdalMessage());
  };
  require(dataset != nullptr);
  std::array<double, 6> transform = lattice.transform;
  const auto x = static_cast<double>(surveyed.area.x);
  const auto y = static_cast<double>(surveyed.area.y);
  transform[0] += x * transform[1] + y * transform[2];
  transform[3] += x * transform[4] + y * transform[5];
  dataset->SetGeoTransform(transform.data());
  if (!lattice.crs.IsEmpty()) dataset->SetSpatialRef(&lattice.crs);
  const auto sample = static_cast<GSpacing>(type.Bytes());
  require(dataset->RasterIO(GF_Write, 0, 0, width, height,
                            const_cast<std::byte*>(surveyed.samples.data()), width, height,
                            type.gdal, bands, nullptr, sample * bands, sample * bands * width,
                            sample, nullptr) == CE_None);
  require(dataset->CreateMaskBand(GMF_PER_DATASET) == CE_None);
  require(dataset->GetRasterBand(1)->GetMaskBand()->RasterIO(
              GF_Write, 0, 0, width, height, const_cast<std::uint8_t*>(surveyed.valid.data()),
              width, height, GDT_Byte, 0, 0, nullptr) == CE_None);
  return RasterSource(surveyed.name, std::move(dataset));
}

Survey LaySurvey(const OutputGrid& grid, const RasterSource& like) {
  Survey survey;
  survey.type = like.Type();
  survey.channels = like.Channels().size();
  while (DivideUp(grid.width, survey.step) * DivideUp(grid.height, survey.step) > kMostCells) {
    survey.step *= 2;
  }
  survey.lattice = grid;
  survey.lattice.width = static_cast<int>(DivideUp(grid.width, survey.step));
  survey.lattice.height = static_cast<int>(DivideUp(grid.height, survey.step));
  for (const std::size_t i : {1, 2, 4, 5}) survey.lattice.transform[i] *= survey.step;
  return survey;
}

Window CellsOf(const Survey& survey, const Window& pixels) {
  const std::int64_t x = pixels.x / survey.step;
  const std::int64_t y = pixels.y / survey.step;
  return {x, y, DivideUp(pixels.x + pixels.width, survey.step) - x,
          DivideUp(pixels.y + pixels.height, survey.step) - y};
}

void TakeSurvey(const std::vector<ScenePlan>& scenes, const WorkOptions& work, Survey& survey,
                nspio::Counter& progress) {
  const std::size_t before = survey.scenes.size();
  survey.scenes.resize(before + scenes.size());
  std::atomic<std::size_t> next{0};
  std::size_t done = 0;
  std::exception_ptr failure;
  std::mutex mutex;
  const int threads = sys::OMPThreadsFor(work.threads);
  // Scenes side by side need fewer threads to decode each; a handle for every block costs too.
  const auto readers = std::min(static_cast<std::size_t>(threads), scenes.size());
  const std::string decoders = std::to_string(DivideUp(threads, static_cast<int>(readers)));
  const auto takeTurns = [&] {
    const CPLConfigOptionSetter decode("GDAL_NUM_THREADS", decoders.c_str(), false);
    for (std::size_t i = next++; i < scenes.size(); i = next++) {
      try {
        survey.scenes[before + i] = SurveyScene(scenes[i], survey, work);
        const std::lock_guard lock(mutex);
        if (failure) return;
        progress.Update(static_cast<double>(++done) / static_cast<double>(scenes.size()));
      } catch (...) {
        const std::lock_guard lock(mutex);
        if (!failure) failure = std::current_exception();
        return;
      }
    }
  };
  {
    std::vector<std::jthread> helpers;
    for (std::size_t i = 1; i < readers; ++i) helpers.emplace_back(takeTurns);
    takeTurns();
  }
  if (failure) std::rethrow_exception(failure);
}

}  // namespace zarn::app
