// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <utility>
#include <vector>

#include "host/mosaic/mosdodgingcoeffs.h"
#include "host/mosaic/mosdodgingsurface.h"
#include "processes/filters/colorbalance/icolorbalance.h"

namespace zarn::processes::filters {

namespace details {

/// Dodges one block of one sample type.
class IDodgingProc {
 public:
  IDodgingProc() = default;
  IDodgingProc(const IDodgingProc&) = delete;
  IDodgingProc& operator=(const IDodgingProc&) = delete;
  virtual ~IDodgingProc() = default;

  virtual FilterResult Process(const gobs::Raster& input, gobs::Raster& output,
                               const std::vector<MOSDodgingCoeffs>& coeffs, MOSDodgingType type,
                               MOSDodgingSurfaceFactoryRef* gainSurface,
                               MOSDodgingSurfaceFactoryRef* offsetSurface,
                               const std::uint8_t* inputMask,
                               const std::vector<double>& inputNoData,
                               const std::vector<double>& outputNoData) = 0;
};

}  // namespace details

/// Evens out brightness by coefficients per channel and by two surfaces of the host, a gain and an
/// offset, sampled at every balanced pixel's position in the whole image and only there. The models
/// are those of `MOSDodgingType`.
///
/// The position is the block's own (originX, originY), not that of the call. The surfaces are
/// pinned for the length of a call, also when the host throws. All ten sample types; others end in
/// the dispatcher's `Exception`. Always shared out to threads.
class DodgingCBBase : public IColorBalance {
 public:
  /// The surface factories are borrowed; null where there is no surface.
  DodgingCBBase(std::vector<MOSDodgingCoeffs> channelCoeffs, MOSDodgingType model,
                MOSDodgingSurfaceFactoryRef* gain, MOSDodgingSurfaceFactoryRef* offset)
      : coeffs(std::move(channelCoeffs)), type(model), gainSurface(gain), offsetSurface(offset) {}

  ColorBalanceKind Kind() const override { return ColorBalanceKind::kDodging; }

 protected:
  std::vector<MOSDodgingCoeffs> coeffs;
  MOSDodgingType type;
  MOSDodgingSurfaceFactoryRef* gainSurface;
  MOSDodgingSurfaceFactoryRef* offsetSurface;
};

class CPUDodgingCB : public DodgingCBBase {
 public:
  using DodgingCBBase::DodgingCBBase;

  /// `blockX` and `blockY` are not used. A surface of fewer channels than the block counts as too
  /// few parameters.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
