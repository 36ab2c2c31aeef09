// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <vector>

#include "apps/zarn/windows.h"
#include "host/gobs/raster.h"

namespace zarn::app {

/// Where pixels come from that are brought onto another grid, and how. One object serves one window
/// at a time.
class PixelMover {
 public:
  PixelMover() = default;
  PixelMover(const PixelMover&) = delete;
  PixelMover& operator=(const PixelMover&) = delete;
  virtual ~PixelMover() = default;

  /// Turns to a window of the output, whose parts are then asked for.
  virtual void Enter(const Window& window) = 0;
  /// The pixels of the source that the part draws on, within the source; of no size if none.
  virtual Window SourceOf(const Window& part) const = 0;
  /// Fills a part of the output. `source` holds what `SourceOf` said, at its place in the whole
  /// image, with one mask byte per pixel or null; `output` lies at the place of the part. Uncovered
  /// pixels become `fill` (one value per channel), or stay as they are without it; `covered` gets 1
  /// or 0 for each pixel.
  virtual void Move(const gobs::Raster& source, const std::uint8_t* mask,
                    const std::vector<double>& fill, gobs::Raster& output,
                    std::uint8_t* covered) = 0;
};

}  // namespace zarn::app
