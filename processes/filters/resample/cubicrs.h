// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/resample/transformingrs.h"

namespace zarn::processes::filters {

/// Interpolates by cubic convolution (Catmull-Rom) of the sixteen pixels around a position.
class CubicRSBase : public TransformingRS {
 public:
  using TransformingRS::TransformingRS;

  utils::ResampleMethod GetResampleMethod() const override { return utils::ResampleMethod::kCubic; }
};

class CPUCubicRS : public CubicRSBase {
 public:
  using CubicRSBase::CubicRSBase;

  /// `blockX` and `blockY` are not used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
