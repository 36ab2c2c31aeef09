// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <utility>
#include <vector>

#include "processes/filters/normalization/inormalization.h"

namespace zarn::processes::filters {

/// Subtracts a quadratic surface per channel, the shape of a bright spot. With x and y the column
/// and row in the whole image, divided by its extent, and p the channel's six coefficients, a
/// sample loses p0 x^2 + p1 x y + p2 y^2 + p3 x + p4 y + p5.
///
/// For everything else it behaves as the colour balancers do, and it fails with their messages.
/// Always shared out to threads. Blocks of an unknown type end in the `ParameterException` of
/// `DataTypeAdapter`.
class HotSpotNormBase : public INormalization {
 public:
  HotSpotNormBase(std::vector<std::vector<double>> channelCoefficients, unsigned int columns,
                  unsigned int rows)
      : coefficients(std::move(channelCoefficients)), columnDivisor(columns), rowDivisor(rows) {}

  NormalizationKind Kind() const override { return NormalizationKind::kHotSpot; }

 protected:
  std::vector<std::vector<double>> coefficients;
  unsigned int columnDivisor;
  unsigned int rowDivisor;
};

class CPUHotSpotNorm : public HotSpotNormBase {
 public:
  using HotSpotNormBase::HotSpotNormBase;

  /// The block's first pixel is at (blockX, blockY) of the whole image; positions wrap at 2^32.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
