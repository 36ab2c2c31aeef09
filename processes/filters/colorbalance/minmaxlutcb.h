// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <utility>
#include <vector>

#include "processes/filters/colorbalance/lutcb.h"

namespace zarn::processes::filters {

/// A table of 256 bytes per channel over a range of samples: the range [min, max] is spread over
/// the table's positions, and the entry found is mapped back into the range. Samples outside of the
/// range become its nearer end, which may be the output no-data value; all others keep off it.
///
/// Between two positions the lower entry holds: there is no interpolation. NaN stays NaN.
class MinMaxLUTCBBase : public LUTCBBase {
 public:
  MinMaxLUTCBBase(std::vector<LookUpTable> tables, std::vector<double> channelMins,
                  std::vector<double> channelMaxs)
      : LUTCBBase(std::move(tables)), mins(std::move(channelMins)), maxs(std::move(channelMaxs)) {}

  ColorBalanceKind Kind() const override { return ColorBalanceKind::kMinMaxLUT; }

 protected:
  std::vector<double> mins;
  std::vector<double> maxs;
};

class CPUMinMaxLUTCB : public MinMaxLUTCBBase {
 public:
  using MinMaxLUTCBBase::MinMaxLUTCBBase;

  /// `blockX` and `blockY` are not used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
