// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/imagefilter.h"
#include "apps/zarn/mosaic/mosaicplan.h"
#include "apps/zarn/mosaic/tilecomposer.h"
#include "host/nspio/counter.h"

namespace zarn::app {

/// Takes a tile that is done; its contents may be changed.
using TileSink = std::function<void(const TilePlan& tile, TileBuffers& buffers)>;

/// Makes tiles of a mosaic one after the other: while one scene is read, the one before is pasted
/// and the tile before is written. Scenes are open only as long as tiles need them, provided that
/// tiles come row by row. With one thread nothing overlaps. Throws `RunError`.
///
/// `like` is the leading scene; `progress` counts scenes in tiles.
void RunTiles(const MosaicPlan& plan, const RasterSource& like, const std::vector<TilePlan>& tiles,
              const WorkOptions& work, const TileSink& sink, nspio::Counter& progress);

/// How many pixels of that many bytes may be read at a time for one window in work.
std::int64_t MostSourcePixels(std::size_t pixelBytes, const WorkOptions& work);

}  // namespace zarn::app
