// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <utility>
#include <vector>

#include "processes/filters/colorbalance/icolorbalance.h"

namespace zarn::processes::filters {

/// Gain and offset per channel: `sample * gain + offset` in double, brought back into the sample
/// type. Blocks of more than 4000 pixels are shared out to threads. Blocks of an unknown type end
/// in the `ParameterException` of `DataTypeAdapter`.
class GainOffsetCBBase : public IColorBalance {
 public:
  GainOffsetCBBase(std::vector<double> channelGains, std::vector<double> channelOffsets)
      : gains(std::move(channelGains)), offsets(std::move(channelOffsets)) {}

  ColorBalanceKind Kind() const override { return ColorBalanceKind::kGainOffset; }

 protected:
  std::vector<double> gains;
  std::vector<double> offsets;
};

class CPUGainOffsetCB : public GainOffsetCBBase {
 public:
  using GainOffsetCBBase::GainOffsetCBBase;

  /// `blockX` and `blockY` are not used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
