// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/resample/transformingrs.h"

namespace zarn::processes::filters {

/// Takes the pixel that a position lies in.
class NearestRSBase : public TransformingRS {
 public:
  using TransformingRS::TransformingRS;

  utils::ResampleMethod GetResampleMethod() const override {
    return utils::ResampleMethod::kNearest;
  }
};

class CPUNearestRS : public NearestRSBase {
 public:
  using NearestRSBase::NearestRSBase;

  /// `blockX` and `blockY` are not used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
