// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>

#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {

/// Moving-window median that leaves background and no-data pixels out and alone.
///
/// | | |
/// |---|---|
/// | sample types, input margins, output size, masked, no-data and background pixels | as of the
///   average filter |
/// | window | square, side 2 * (kernelSize / 2) + 1, at most 7; sizes -1, 0 and 1 are the pixel
///   alone |
/// | any other pixel | per channel, the middle one of the neighbours that count, the lower one of
///   two; NaN sorts last, -0 before +0. It is a sample as it is: nothing keeps it off the output
///   no-data value |
/// | parallel | always, over rows, with dynamic adjustment of the thread count switched on |
/// | failures | "Unknown raster block data type for median filter."; sizes; margins; "Only filters
///   of 7x7 or smaller are supported."; inconsistent blocks |
class MedianFilterBase : public IFilter {
 public:
  MedianFilterBase(int size, std::optional<double> background)
      : kernelSize(size), noDataValue(background) {}

 protected:
  int kernelSize;
  std::optional<double> noDataValue;
};

class CPUMedianFilter : public MedianFilterBase {
 public:
  using MedianFilterBase::MedianFilterBase;

  /// `blockX` and `blockY` are not used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
