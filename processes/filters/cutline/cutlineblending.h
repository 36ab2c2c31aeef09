// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "processes/filters/cutline/cutlineblendingbase.h"

namespace zarn::processes::filters {

class CPUCutlineBlending : public CutlineBlendingBase {
 public:
  CPUCutlineBlending(const PolygonParam& cutlineParam, unsigned int blend)
      : CutlineBlendingBase(cutlineParam, blend) {}

  using CutlineBlendingBase::BlendWeight;

  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
