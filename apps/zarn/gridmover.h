// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <vector>

#include "apps/zarn/blockreader.h"
#include "apps/zarn/dataset.h"
#include "apps/zarn/pixelmover.h"
#include "apps/zarn/windowbuffers.h"
#include "apps/zarn/windows.h"

namespace zarn::app {

/// Pixels of a source that are ready to be moved: those of the window that was read.
struct MovablePixels {
  Plane& samples;
  const std::uint8_t* mask;  ///< null: all are valid
};

/// Works on what was read, if anything is to be done before it is moved.
using Preparation = std::function<MovablePixels(WindowBuffers& read)>;

/// What was read, as it is; it must have no halo.
MovablePixels AsRead(WindowBuffers& read);

/// Fills windows of an output grid with the pixels of a source. For each window only those pixels
/// of the source are read that it draws on; where these are more than allowed, in parts.
class GridMover {
 public:
  /// One window on its way.
  struct Slot {
    std::unique_ptr<PixelMover> mover;
    WindowBuffers source;
    WindowBuffers result;  ///< `output`, and as asked for `alphas` and `fileMask` (0 or 255)
    Plane covered;         ///< 1 or 0 for each pixel
    bool drawsOnSource = false;
    bool filled = false;  ///< already while it was read, in parts
  };

  struct Request {
    std::vector<double> fill;  ///< what uncovered pixels become, one value per channel; empty: 0
    bool movesAlphas = false;
    bool writesMask = false;
    std::int64_t mostSourcePixels = 0;
    Preparation prepare = AsRead;
  };

  GridMover(const RasterSource& source, BlockReader& reader, Request request);

  /// Reads what a window of the output draws on. One thread may read while another one fills.
  void Read(const Window& window, Slot& slot);
  /// Fills the window that was read.
  void Fill(Slot& slot) const;

 private:
  void Shape(const Window& window, Slot& slot) const;
  bool Fits(const Window& source) const;
  void ReadSource(Slot& slot, const Window& part);
  void FillInParts(Slot& slot, const Window& part);
  void FillPart(Slot& slot, const Window& part) const;
  gobs::Raster Block(const Window& window, const std::vector<int>& bands, Plane& plane,
                     const Window& planes) const;

  const RasterSource& source_;
  BlockReader& reader_;
  Request request_;
};

}  // namespace zarn::app
