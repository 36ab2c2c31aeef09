// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/sceneset.h"

#include "apps/zarn/estimate/pixelscan.h"
#include "apps/zarn/progress.h"

namespace zarn::app {

SceneSet::SceneSet(const std::string& reference, const std::vector<std::string>& others,
                   const std::string& srcNoData) {
  sources_.emplace_back(reference);
  for (const std::string& other : others) sources_.emplace_back(other);
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

}  // namespace zarn::app
