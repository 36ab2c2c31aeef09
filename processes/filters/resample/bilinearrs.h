// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/resample/transformingrs.h"

namespace zarn::processes::filters {

/// Interpolates linearly between the four pixels around a position.
class BilinearRSBase : public TransformingRS {
 public:
  using TransformingRS::TransformingRS;

  utils::ResampleMethod GetResampleMethod() const override {
    return utils::ResampleMethod::kBilinear;
  }
};

class CPUBilinearRS : public BilinearRSBase {
 public:
  using BilinearRSBase::BilinearRSBase;

  /// `blockX` and `blockY` are not used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
