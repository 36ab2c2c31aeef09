// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/imagefilter.h"
#include "apps/zarn/maskfile.h"
#include "apps/zarn/updatedraster.h"
#include "apps/zarn/windows.h"
#include "host/nspio/counter.h"
#include "processes/filters/factories/cutlineblendingfactory.h"

namespace zarn::app {

/// A source that is pasted into a mosaic, and how.
struct Pasting {
  const RasterSource& source;
  GridPlace place;  ///< of the source's first pixel in the mosaic
  /// The cutline, its feather and the tile polygon, in the mosaic's raster coordinates.
  const processes::filters::CutlineBlendingFactory& shape;
  Window area;                       ///< the pixels of the mosaic to work on, within the source
  std::vector<double> sourceNoData;  ///< one per channel, or none
  std::vector<double> mosaicNoData;  ///< likewise
  MaskFile* mask = nullptr;          ///< of the source: names pixels that take no part
  bool stopOnNoData = false;
  long sourceId = 0;  ///< what the map gets, which can hold it
};

/// Pastes window by window, reading, blending and writing at the same time.
///
/// Source pixels that are no-data, NaN, transparent (alpha 0) or masked take no part; mosaic pixels
/// of these kinds get the whole source pixel wherever the cutline or its feather admits one. Alpha
/// bands are blended like the others, and opaque where the source has none; the mask of the mosaic
/// is set where something was pasted. `map` may be null. With `checkFirst` the whole source is
/// looked at before anything is written, if it may have to stop.
///
/// Throws `RunError`, also when `stopOnNoData` ends the work. The mosaic is then to be abandoned.
void Paste(const Pasting& pasting, const WorkOptions& work, bool checkFirst, UpdatedRaster& mosaic,
           UpdatedRaster* map, nspio::Counter& progress);

}  // namespace zarn::app
