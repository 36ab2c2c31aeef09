// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/estimate/cellmeans.h"
#include "apps/zarn/estimate/gainoffsetnetwork.h"
#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/nodata.h"
#include "host/nspio/counter.h"

namespace zarn::app {

/// Fewer common cells of two scenes say nothing about how they differ.
inline constexpr std::size_t kLeastCommonCells = 20;

/// Scenes that are to be brought onto the first one, the reference, and their means on common
/// cells.
class SceneSet {
 public:
  /// Throws `RunError` for scenes that cannot be compared.
  SceneSet(const std::string& reference, const std::vector<std::string>& others,
           const std::string& srcNoData);
  /// The same for rasters that are open, the reference first.
  SceneSet(std::vector<RasterSource> sources, const std::string& srcNoData);

  std::size_t Size() const { return sources_.size(); }
  const std::vector<RasterSource>& Sources() const { return sources_; }
  const std::vector<Ground>& Grounds() const { return grounds_; }
  std::size_t Channels() const { return sources_.front().Channels().size(); }

  /// Reads the scenes where they overlap; for `side` see `ChooseLattice`.
  void Measure(int side, nspio::Counter& progress);
  double CellSide() const { return side_; }
  const CellMeans& Cells(std::size_t scene) const { return cells_[scene]; }
  std::vector<CellPair> Common(std::size_t first, std::size_t second) const {
    return CommonCells(cells_[first], cells_[second]);
  }

 private:
  static std::vector<RasterSource> OpenAll(const std::string& reference,
                                           const std::vector<std::string>& others);

  std::vector<RasterSource> sources_;
  std::vector<NoDataValues> noData_;
  std::vector<Ground> grounds_;
  std::vector<CellMeans> cells_;
  double side_ = 0;
};

/// What any two of the scenes that were measured have in common, where that is enough.
std::vector<SceneOverlap> FindOverlaps(const SceneSet& scenes);

/// Throws `RunError` when overlaps do not tie all scenes to the reference; `remedy` says what to
/// do.
void RequireTied(const SceneSet& scenes, const std::vector<SceneOverlap>& overlaps,
                 const std::string& remedy);

}  // namespace zarn::app
