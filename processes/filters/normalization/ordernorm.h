// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/normalization/inormalization.h"

namespace zarn::processes::filters {

/// Order normalisation: a pipeline can configure and run it as any other kind, and the pixels stay
/// as they are. Nothing is read or written: a caller that wants the input in the output copies it.
class OrderNormBase : public INormalization {
 public:
  explicit OrderNormBase(unsigned char order) : order_(order) {}

  NormalizationKind Kind() const override { return NormalizationKind::kOrder; }

 protected:
  unsigned char order_;
};

class CPUOrderNorm : public OrderNormBase {
 public:
  using OrderNormBase::OrderNormBase;

  /// Success for any block; no argument is looked at.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
