// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "host/gobs/raster.h"
#include "processes/filters/cutline/polygonparam.h"
#include "processes/filters/filtersexport.h"
#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {

class PolygonRowIndex;

/// Pastes a block of a source image (the input) into the same block of the mosaic (the output, read
/// and written in place) along a polygon, the cutline.
///
/// Each pixel has a weight w: its distance to the cutline in units of the blend width, negative
/// outside. Pixels with w >= 1 are copied, those with w <= -1 stay, and between them
/// `source * a + mosaic * (1 - a)` with a = (w + 1) / 2 is computed in double and converted, for
/// integers by truncation towards zero. Without a blend width w is 1 inside and -1 outside. A
/// second polygon, the tile, limits the area with a hard edge. Without any polygon all pixels are
/// copied.
///
/// | | |
/// |---|---|
/// | sample types | integers up to 32 bits, float, double, complex of short and of float |
/// | blocks | equal in size, channels, type, margins and origin, and without margins |
/// | source pixel excluded | input no-data in all channels, or mask byte 0: the mosaic's stays |
/// | mosaic pixel without data | output no-data in all channels: the band copies the source |
/// | complex | both parts are blended; a no-data value is the real part, the imaginary one is 0 |
/// | parallel | from 129 rows on |
///
/// Messages: "Raster dimensions don't match."; "Unknown raster block data type for color
/// balancing", also for the source map; "Invalid source map size", also for a channel that the map
/// does not have; "Cutline operation aborted."; inconsistent and overlapping blocks as everywhere.
/// The output may be the input.
///
/// Copies share the polygons, which live as long as any of them.
class ZARN_FILTERS_EXPORT CutlineBlendingBase : public IFilter {
 public:
  CutlineBlendingBase(const CutlineBlendingBase& other);
  CutlineBlendingBase& operator=(const CutlineBlendingBase& other);
  ~CutlineBlendingBase() override;

  /// Replaces the tile polygon, whose vertices are copied; an empty one means that there is none.
  void SetTileShape(const PolygonParam& tile);
  /// Added to the origin of each block, to place it in the coordinates of the polygons.
  void SetOffset(std::uint32_t x, std::uint32_t y);
  /// Records which pixels come, for at least one half, from this source: `value`, converted to the
  /// map's type as C++ converts integers, is stored in the sample `channel * p + channel - 1` of
  /// `map`, p being the index of the pixel in the block. So the map counts as having `channel`
  /// samples per pixel, the last of which is written. Nothing is recorded where `channel` or
  /// `value` is below 1. The map is borrowed, and as wide and high as the blocks; null for none.
  void SetSourceMap(gobs::Raster* map, int channel, long value);
  /// Whether an excluded source pixel with w > 0 ends the call with `NoDataErrorMessage()`. Rows
  /// that are done then keep their new values.
  void SetStopOnNodata(bool stop);

  /// The rows, in the coordinates of the polygons, outside of which nothing changes; both belong
  /// to the range.
  void GetStartEndY(int& start, int& end) const;
  static std::string NoDataErrorMessage();

 protected:
  /// Copies the cutline's vertices; an empty cutline means that there is none.
  CutlineBlendingBase(const PolygonParam& cutline, unsigned int blend);

  /// The definition of w for the pixel centre (x, y).
  double BlendWeight(double x, double y) const;

  std::shared_ptr<const PolygonRowIndex> cutline;  ///< null without one
  std::shared_ptr<const PolygonRowIndex> tile;     ///< null without one
  std::uint32_t offsetX = 0;
  std::uint32_t offsetY = 0;
  gobs::Raster* sourceMap = nullptr;
  std::int32_t sourceMapChannel = 0;
  long sourceMapValue = 0;
  bool stopOnNoData = false;
};

}  // namespace zarn::processes::filters
