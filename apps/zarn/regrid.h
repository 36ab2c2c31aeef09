// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <optional>

#include "apps/zarn/dataset.h"
#include "apps/zarn/imagefilter.h"
#include "apps/zarn/outputgrid.h"
#include "apps/zarn/pixelmover.h"

namespace zarn::app {

/// How a command brings an image onto another grid.
struct Regridding {
  std::optional<OutputGrid> grid;  ///< none: that of the source
  /// Makes a mover; one is needed for each window in work.
  std::function<std::unique_ptr<PixelMover>()> makeMover;
  std::size_t bytesPerPixel = 0;  ///< what a mover keeps for each pixel of a window
};

/// Opens the input and brings it onto the grid that `fit` decides on. For each window of the output
/// only those pixels of the input are read that it draws on. Throws `UsageError` and `RunError`.
void RunRegridding(const ImageFilterOptions& options,
                   const std::function<Regridding(const RasterSource&)>& fit);

}  // namespace zarn::app
