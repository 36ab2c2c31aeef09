// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/pixelmover.h"
#include "processes/filters/framework/ifilter.h"

namespace zarn::app {

/// Copies whole pixels: pixel (x, y) of the output is pixel (x + columns, y + rows) of the source.
/// The blocks lie at their places in the image, so the filter itself finds out what they share.
class WholePixels : public PixelMover {
 public:
  WholePixels(const RasterSource& source, int columns, int rows);

  void Enter(const Window&) override {}
  Window SourceOf(const Window& part) const override;
  void Move(const gobs::Raster& source, const std::uint8_t* mask, const std::vector<double>& fill,
            gobs::Raster& output, std::uint8_t* covered) override;

 private:
  Window image_;
  std::int64_t columns_;
  std::int64_t rows_;
  std::unique_ptr<processes::filters::IFilter> filter_;
};

}  // namespace zarn::app
