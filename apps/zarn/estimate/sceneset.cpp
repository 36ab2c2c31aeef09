// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/sceneset.h"

#include <utility>

#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/pixelscan.h"
#include "apps/zarn/progress.h"

namespace zarn::app {

std::vector<RasterSource> SceneSet::OpenAll(const std::string& reference,
                                            const std::vector<std::string>& others) {
  std::vector<RasterSource> sources;
  sources.emplace_back(reference);
  for (const std::string& other : others) sources.emplace_back(other);
  return sources;
}

SceneSet::SceneSet(const std::string& reference, const std::vector<std::string>& others,
                   const std::string& srcNoData)
    : SceneSet(OpenAll(reference, others), srcNoData) {}

SceneSet::SceneSet(std::vector<RasterSource> sources, const std::string& srcNoData)
    : sources_(std::move(sources)) {
  for (const RasterSource& source : sources_) {
    source.RefusePalette();
    noData_.push_back(ResolveNoData(source, srcNoData, ""));
  }
  grounds_ = ComparableGrounds(sources_);
}

void SceneSet::Measure(int side, nspio::Counter& progress) {
  const OverlapLattice chosen = ChooseLattice(grounds_, Channels(), side);
  side_ = chosen.side;
  for (std::size_t i = 0; i < Size(); ++i) {
    cells_.emplace_back(chosen.lattice, grounds_[i], chosen.parts[i], Channels());
    if (chosen.parts[i].Empty()) continue;
    const auto share = [&](std::size_t done) {
      return static_cast<double>(done) / static_cast<double>(Size());
    };
    ProgressSpan span(progress, share(i), share(i + 1));
    ScanPixels(sources_[i], noData_[i], grounds_[i].PixelsIn(chosen.parts[i]), span,
               [&](const PixelRun& run) { cells_[i].Add(run); });
    cells_[i].Finish();
  }
}

std::vector<SceneOverlap> FindOverlaps(const SceneSet& scenes) {
  std::vector<SceneOverlap> overlaps;
  for (std::size_t first = 0; first < scenes.Size(); ++first) {
    for (std::size_t second = first + 1; second < scenes.Size(); ++second) {
      const std::vector<CellPair> cells = scenes.Common(first, second);
      if (cells.size() < kLeastCommonCells) continue;
      overlaps.push_back({first, second, RobustMoments(cells, scenes.Channels())});
    }
  }
  return overlaps;
}

void RequireTied(const SceneSet& scenes, const std::vector<SceneOverlap>& overlaps,
                 const std::string& remedy) {
  const std::vector<bool> tied = TiedScenes(scenes.Size(), overlaps);
  std::string loose;
  for (std::size_t i = 0; i < tied.size(); ++i) {
    if (!tied[i]) loose += (loose.empty() ? "" : ", ") + scenes.Sources()[i].Name();
  }
  if (loose.empty()) return;
  throw RunError("no valid overlap ties these to " + scenes.Sources().front().Name() +
                 ", neither directly nor through the others: " + loose + "; " + remedy);
}

}  // namespace zarn::app
