// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/estimate/cellmeans.h"
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

  std::size_t Size() const { return sources_.size(); }
  const std::vector<RasterSource>& Sources() const { return sources_; }
  const std::vector<Ground>& Grounds() const { return grounds_; }
  std::size_t Channels() const { return sources_.front().Channels().size(); }

  /// Reads the scenes where they overlap; for `side` see `ChooseLattice`.
  void Measure(int side, nspio::Counter& progress);
  double CellSide() const { return side_; }
  std::vector<CellPair> Common(std::size_t first, std::size_t second) const {
    return CommonCells(cells_[first], cells_[second]);
  }

 private:
  std::vector<RasterSource> sources_;
  std::vector<NoDataValues> noData_;
  std::vector<Ground> grounds_;
  std::vector<CellMeans> cells_;
  double side_ = 0;
};

}  // namespace zarn::app
