// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "apps/zarn/blockreader.h"
#include "apps/zarn/dataset.h"
#include "apps/zarn/gridmover.h"
#include "apps/zarn/imagefilter.h"
#include "apps/zarn/mosaic/mosaicplan.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/outputgrid.h"
#include "apps/zarn/positionfield.h"
#include "host/mosaic/surfacecache.h"
#include "host/utils/resample.h"

namespace zarn::app {

/// How the pixels of scenes are brought onto a grid.
struct FeedRequest {
  OutputGrid grid;
  std::string resampling;
  double threshold = 0;
  SceneFilter filter;
  std::int64_t mostSourcePixels = 0;  ///< in memory at a time
  /// Whether the grid is the mosaic's, on which a scene may have its place.
  bool isMosaic = true;
};

/// An open scene: gives its pixels on a grid, window by window, filtered, freed of its hot spot,
/// resampled (or copied, where its pixels are those of the grid) and balanced, in this order.
///
/// Pixels that are no-data, NaN, transparent or masked are not covered and enter nothing. Each step
/// gives samples of the scene's own type. The hot spot belongs to the scene's own geometry and goes
/// before the pixels are moved; the other corrections are made on the grid, for the pixels that are
/// needed there.
class SceneFeed {
 public:
  /// Throws `RunError` when the scene cannot be read.
  SceneFeed(const ScenePlan& scene, const FeedRequest& request);

  const RasterSource& Source() const { return source_; }

  /// Reads what a window of the grid draws on; one thread may read while another one fills.
  void Read(const Window& window, GridMover::Slot& slot);
  /// Fills `slot.result.output` and `slot.covered`; pixels that are not covered are 0.
  void Fill(GridMover::Slot& slot) const;

 private:
  MovablePixels Prepare(WindowBuffers& read) const;
  void MakeMover(const ScenePlan& scene, const FeedRequest& request);
  void MakeCorrections(const ScenePlan& scene);
  void Correct(const WindowFilter& filter, const Window& window, Plane& samples,
               const std::uint8_t* mask) const;

  RasterSource source_;
  NoDataValues noData_;
  WindowFilter filter_;   ///< empty: none
  WindowFilter hotSpot_;  ///< likewise
  WindowFilter balance_;
  SurfaceCache surfaces_;
  std::unique_ptr<SurfaceCache::Source> gains_;
  std::unique_ptr<SurfaceCache::Source> offsets_;
  std::function<std::unique_ptr<PixelMover>()> makeMover_;
  BlockReader reader_;
  GridMover mover_;
};

}  // namespace zarn::app
