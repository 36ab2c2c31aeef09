// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {

/// Turns isolated pixels and bright outliers into background.
///
/// | | |
/// |---|---|
/// | sample types, window, input margins, masked, no-data and background pixels | as of the average
///   filter |
/// | output size | that of the input |
/// | any other pixel | each channel by itself becomes `noDataValue` where fewer than two neighbours
///   count in the window or fewer than three in the 3x3 pixels around the centre (which itself
///   counts in both), or where its magnitude exceeds |mean + 1.5 standard deviations| of the
///   neighbours that count. Otherwise it stays: dark outliers do, on purpose |
/// | parallel | always, over rows, with dynamic adjustment of the thread count switched on |
/// | failures | "Unknown raster block data type for noise filter."; sizes; margins; inconsistent
///   blocks. Blocks of an unknown type end in the `ParameterException` of `DataTypeAdapter` |
///
/// The deviation is made of sums of samples and of their squares in double. Where these round,
/// which takes floating samples or integers of 32 bits, a perfectly flat area has a variance of
/// about zero, on either side of it: below, nothing there is noise; at zero, everything is whose
/// mean was rounded down. Such areas are better filtered as integers.
class NoiseFilterBase : public IFilter {
 public:
  NoiseFilterBase(int size, double background) : kernelSize(size), noDataValue(background) {}

 protected:
  int kernelSize;
  double noDataValue;
};

class CPUNoiseFilter : public NoiseFilterBase {
 public:
  using NoiseFilterBase::NoiseFilterBase;

  /// `blockX` and `blockY` are not used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
