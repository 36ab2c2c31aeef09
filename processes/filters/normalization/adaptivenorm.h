// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/normalization/inormalization.h"

namespace zarn::processes::filters {

/// Adaptive normalisation: a pipeline can configure and run it as any other kind, and the pixels
/// stay as they are. Nothing is read or written: a caller that wants the input in the output copies
/// it.
class AdaptiveNormBase : public INormalization {
 public:
  explicit AdaptiveNormBase(double value) : parameter(value) {}

  NormalizationKind Kind() const override { return NormalizationKind::kAdaptive; }

 protected:
  double parameter;
};

class CPUAdaptiveNorm : public AdaptiveNormBase {
 public:
  using AdaptiveNormBase::AdaptiveNormBase;

  /// Success for any block; no argument is looked at.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
