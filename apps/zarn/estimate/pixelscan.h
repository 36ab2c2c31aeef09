// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>

#include "apps/zarn/dataset.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/windows.h"
#include "host/nspio/counter.h"

namespace zarn::app {

/// Neighbouring pixels of one row of an image.
struct PixelRun {
  std::int64_t x;
  std::int64_t y;
  std::size_t count;
  const double* samples;      ///< the channels, pixel-interleaved
  const std::uint8_t* valid;  ///< 0: the file declares the pixel invalid
};

/// Reads `area` of an image in bounded memory and hands over all its pixels, run by run, on the
/// calling thread, while the next part is being read. What is visited may reach a little beyond
/// `area`. Invalid are pixels that are no-data in all channels, NaN or infinite in one of them,
/// transparent (alpha 0) or masked. Throws `RunError`.
void ScanPixels(const RasterSource& source, const NoDataValues& noData, const Window& area,
                nspio::Counter& progress, const std::function<void(const PixelRun&)>& visit);

}  // namespace zarn::app
