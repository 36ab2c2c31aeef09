// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/gridmover.h"
#include "apps/zarn/mosaic/mosaicplan.h"
#include "apps/zarn/windowbuffers.h"
#include "processes/filters/cutline/cutlineblendingbase.h"

namespace zarn::app {

/// A tile of the mosaic while it is made.
struct TileBuffers {
  WindowBuffers image;  ///< `output`, and `alphas` and `fileMask` where the mosaic has them
  Plane map;            ///< number of the scene that each pixel comes from, counted from 1; 0: none
  Plane spare;          ///< pixels that lie outside of their scene's cutline, for the gaps
  Plane spareMap;       ///< where they come from
};

/// Pastes scenes into tiles, in order, each along its cutline with a feather.
///
/// Where a tile has no data yet a scene is pasted whole, as far as its cutline and feather admit
/// it; where it has some the two are mixed within the feather. So no pixel without data ever takes
/// part, whatever its value.
class TileComposer {
 public:
  TileComposer(const MosaicPlan& plan, const RasterSource& like, bool writesMask);

  void Begin(const Window& window, TileBuffers& tile);
  /// `pixels` are those of some rows of the tile, in its full width. Throws `RunError` when the
  /// scene has no data somewhere within its cutline and this is not allowed.
  void Paste(std::size_t scene, GridMover::Slot& pixels, TileBuffers& tile);
  /// Fills gaps, gives pixels without data their value and keeps those with data off it.
  void Finish(TileBuffers& tile) const;

 private:
  using Overlay = processes::filters::CutlineBlendingBase;

  Overlay& OverlayOf(std::size_t scene);
  void Select(bool withData, const GridMover::Slot& pixels, TileBuffers& tile);
  bool SelectionLooksEmpty(const TileBuffers& tile, const Window& window) const;
  void Apply(Overlay& overlay, std::size_t scene, GridMover::Slot& pixels, TileBuffers& tile,
             const Plane& mask, const std::vector<double>& mosaicNoData) const;
  void RequireData(std::size_t scene, const GridMover::Slot& pixels);
  void KeepSpare(std::size_t scene, const GridMover::Slot& pixels, TileBuffers& tile) const;
  void FillGaps(TileBuffers& tile) const;
  void SettleNoData(TileBuffers& tile) const;
  void MarkCoverage(TileBuffers& tile) const;

  const MosaicPlan& plan_;
  SampleType type_;
  std::size_t channels_;
  std::size_t alphas_;
  bool writesMask_;
  SampleType mapType_;
  std::map<std::size_t, std::unique_ptr<Overlay>> overlays_;
  Plane selected_;  ///< covered pixels to mix, or those to fill
  Plane inside_;
};

}  // namespace zarn::app
