// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>

#include "apps/zarn/blockwriter.h"
#include "apps/zarn/dataset.h"
#include "apps/zarn/mosaic/mosaicplan.h"
#include "apps/zarn/mosaic/tilecomposer.h"
#include "apps/zarn/stagedoutput.h"
#include "host/nspio/counter.h"

namespace zarn::app {

/// A raster on a grid without pixels of its own: what code wants that looks at a grid through a
/// raster.
RasterSource GridRaster(const std::string& name, const OutputGrid& grid, const SampleType& type);

/// Notes in a map of scenes which of them its numbers stand for.
void NameScenes(const MosaicPlan& plan, GDALDataset& map);

/// The files that a mosaic, or a tile of one, is written to: the image and the map of scenes. They
/// appear, whole, with `Publish`.
class MosaicFile {
 public:
  /// `like` is the leading scene of the plan. `grid` may be a part of the plan's, `map` empty.
  /// Throws as `StagedOutput` does.
  MosaicFile(const MosaicPlan& plan, const RasterSource& like, const OutputGrid& grid,
             const OutputOptions& image, const std::string& map);

  /// Writes a tile that lies at `window.x - left`, `window.y - top` of the file. Tiles of a file
  /// with blocks across tiles come row by row.
  void Write(TileBuffers& tile, std::int64_t left, std::int64_t top);
  /// Gives the files a metadata item; to be done before the first tile.
  void Annotate(const std::string& key, const std::string& value);
  /// Whether `Publish` still has a large part of the writing to do.
  bool CopiesAtTheEnd() const { return image_.CopiesAtTheEnd(); }
  void Publish(nspio::Counter& progress);

 private:
  void WriteMap(const TileBuffers& tile);

  StagedOutput image_;
  BlockWriter writer_;
  std::optional<StagedOutput> map_;
};

/// Reads a tile that was written as a file of its own.
void ReadTile(const RasterSource& image, GDALDataset* map, const Window& window, TileBuffers& tile);

}  // namespace zarn::app
