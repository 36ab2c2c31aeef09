// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/pixelmover.h"
#include "apps/zarn/positionfield.h"
#include "host/utils/resample.h"

namespace zarn::app {

/// The method that "nearest", "bilinear" or "cubic" names.
utils::ResampleMethod MethodOf(const std::string& name);

/// Interpolates at the positions of a field. Movers of one field serve one thread at a time in
/// `Enter`.
class Interpolation : public PixelMover {
 public:
  Interpolation(std::shared_ptr<PositionField> field, const RasterSource& source,
                utils::ResampleMethod method);

  void Enter(const Window& window) override;
  Window SourceOf(const Window& part) const override;
  void Move(const gobs::Raster& source, const std::uint8_t* mask, const std::vector<double>& fill,
            gobs::Raster& output, std::uint8_t* covered) override;

 private:
  std::size_t Index(std::int64_t column, std::int64_t row) const {
    return static_cast<std::size_t>((row - window_.y) * window_.width + column - window_.x);
  }

  std::shared_ptr<PositionField> field_;
  double width_;
  double height_;
  utils::ResampleMethod method_;
  Window window_;
  std::vector<double> x_;
  std::vector<double> y_;
};

}  // namespace zarn::app
