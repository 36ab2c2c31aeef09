// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstdint>
#include <vector>

#include "processes/filters/colorbalance/icolorbalance.h"

namespace zarn::processes::filters {

/// A table of 256 entries for one channel.
using LookUpTable = std::array<unsigned char, 256>;

/// Copies of the tables that `luts` points to, 256 bytes each. Throws `ParameterException`
/// (parameter "luts") for a null pointer.
std::vector<LookUpTable> CopyTables(const std::vector<unsigned char*>& luts);

/// The two balancers with tables run blocks of up to this many pixels in the calling thread.
inline constexpr std::int64_t kLUTSerialUpTo = 2000;

/// A table of 256 bytes per channel, indexed by the sample held within 0 .. 255 (floating samples
/// are truncated; NaN takes entry 0). The entry is written as it is, so it may equal the output
/// no-data value. Signed bytes above 127 come out as negative samples.
class LUTCBBase : public IColorBalance {
 public:
  explicit LUTCBBase(std::vector<LookUpTable> tables);

  ColorBalanceKind Kind() const override { return ColorBalanceKind::kLUT; }

 protected:
  std::vector<LookUpTable> luts;
};

class CPULUTCB : public LUTCBBase {
 public:
  using LUTCBBase::LUTCBBase;

  /// `blockX` and `blockY` are not used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
