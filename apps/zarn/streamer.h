// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>

#include "apps/zarn/blockreader.h"
#include "apps/zarn/blockwriter.h"
#include "apps/zarn/windows.h"
#include "host/gobs/raster.h"
#include "host/nspio/counter.h"

namespace zarn::app {

/// Windows that are in memory at a time: one being read, one filtered and one written.
inline constexpr std::size_t kStreamSlots = 3;

/// The shape of a block that holds `window`, at its place in the image, with a margin of `halo`.
gobs::RasterInfo DescribeBlock(const Window& window, std::size_t channels,
                               gobs::NativeDataTypeCode type, std::int64_t halo);

/// One window as a filter sees it.
struct WindowBlocks {
  const gobs::Raster& input;               ///< with the margins that were planned for
  gobs::Raster& output;                    ///< holds what pixels become that are left alone
  const std::uint8_t* valid = nullptr;     ///< null, or covers the input with its margins
  const gobs::Raster* labels = nullptr;    ///< null, or one label per pixel of the input
  const std::uint8_t* writable = nullptr;  ///< null, or covers the output; 0: not to be written
};

/// Filters one window.
using BlockFunction = std::function<void(const WindowBlocks& blocks)>;

/// Filters one window that was read, from its samples into its output.
void FilterWindow(const RasterSource& source, const BlockFunction& filter, WindowBuffers& buffers);

/// Takes all windows of `plan` through reader, `filter` and writer, which overlap. `filter` runs on
/// the calling thread. The first exception of any of them is rethrown.
void StreamWindows(const RasterSource& source, const WindowPlan& plan, BlockReader& reader,
                   const BlockFunction& filter, BlockWriter& writer, nspio::Counter& progress);

/// Sizes GDAL's block cache for the reading pattern of `plan`: a row of the file's blocks that lies
/// across two windows has to stay until the lower one is read.
void FitBlockCache(const RasterSource& source, const WindowPlan& plan, std::int64_t halo);

}  // namespace zarn::app
