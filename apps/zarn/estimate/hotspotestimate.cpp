// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/hotspotestimate.h"

#include <algorithm>
#include <utility>

#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/cellsamples.h"
#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/estimate/pixelscan.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/progress.h"

namespace zarn::app {
namespace {

// Below this the terms of the fit could be bent to any image.
constexpr std::size_t kLeastCells = 30;

// Keeps the cells that both have, and the reference's medians in them.
LandModel MatchReference(const std::vector<CellSummary>& reference,
                         std::vector<CellSummary>& cells) {
  std::vector<std::vector<double>> medians(cells.empty() ? 0 : cells.front().medians.size());
  std::vector<CellSummary> common;
  auto other = reference.begin();
  for (CellSummary& cell : cells) {
    while (other != reference.end() && other->cell < cell.cell) ++other;
    if (other == reference.end()) break;
    if (other->cell != cell.cell) continue;
    for (std::size_t c = 0; c < medians.size(); ++c) medians[c].push_back(other->medians[c]);
    common.push_back(std::move(cell));
  }
  cells = std::move(common);
  return LandModel::FromReference(std::move(medians));
}

void RequireEnough(const std::vector<CellSummary>& cells, const RasterSource& source) {
  if (cells.size() >= kLeastCells) return;
  throw RunError(source.Name() + " has only " + std::to_string(cells.size()) +
                 " cells with enough valid pixels; a fit needs " + std::to_string(kLeastCells));
}

}  // namespace

HotSpotEstimate EstimateHotSpot(const std::vector<RasterSource>& sources,
                                const std::string& srcNoData, std::size_t classes,
                                nspio::Counter& progress) {
  const RasterSource& source = sources.front();
  const std::vector<Ground> grounds = ComparableGrounds(sources);
  const std::size_t channels = source.Channels().size();
  const WindowSize size{source.Width(), source.Height()};
  PositionMoments positions(source.Width(), source.Height());
  std::vector<std::vector<CellSummary>> summaries;
  for (std::size_t i = 0; i < sources.size(); ++i) {
    const auto share = [&](std::size_t done) {
      return static_cast<double>(done) / static_cast<double>(sources.size());
    };
    ProgressSpan span(progress, share(i), share(i + 1));
    CellSamples samples(grounds.front(), size, grounds[i], channels);
    const Window area =
        grounds[i].PixelsIn(Intersection(grounds.front().Bounds(), grounds[i].Bounds()));
    if (area.width <= 0 || area.height <= 0) {
      throw RunError(sources[i].Name() + " does not overlap " + source.Name());
    }
    ScanPixels(sources[i], ResolveNoData(sources[i], srcNoData, ""), area, span,
               [&](const PixelRun& run) {
                 samples.Add(run);
                 if (i == 0) positions.Add(run);
               });
    summaries.push_back(samples.Summaries());
  }

  std::vector<CellSummary>& cells = summaries.front();
  RequireEnough(cells, source);
  const std::size_t kinds = std::clamp<std::size_t>(cells.size() / 30, 1, classes);
  const LandModel land = sources.size() > 1 ? MatchReference(summaries.back(), cells)
                                            : LandModel::FromClasses(cells, kinds);
  RequireEnough(cells, sources.back());
  std::vector<QuadraticFit> fits;
  for (std::size_t c = 0; c < channels; ++c) {
    fits.push_back(FitQuadratic(cells, land, c, source.Width(), source.Height()));
    positions.CentreOn(fits.back().coefficients);
  }
  return {cells.size(), std::move(fits)};
}

}  // namespace zarn::app
