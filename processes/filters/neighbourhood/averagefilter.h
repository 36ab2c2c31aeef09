// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>

#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {

/// Moving-window mean that leaves background and no-data pixels out and alone.
///
/// | | |
/// |---|---|
/// | sample types | integers up to 32 bits, float, double |
/// | window | square, side 2 * (kernelSize / 2) + 1; sizes -1, 0 and 1 are the pixel alone |
/// | input margins | at least kernelSize / 2 on every side; read as they are |
/// | output size | equal width; the input may be taller |
/// | masked pixel (mask byte 0) | never counted; its output stays unwritten |
/// | input no-data pixel | never counted; becomes the output no-data pixel, or stays unwritten |
/// | background pixel (all channels `noDataValue`, where there is one) | never counted; becomes
///   `noDataValue` |
/// | any other pixel | per channel, the mean of the neighbours that count, summed in double |
/// | parallel | always, over rows, with dynamic adjustment of the thread count switched on: a
///   loaded machine may then give fewer threads, without a change in the result |
/// | failures | "Unknown raster block data type for average filter."; sizes; margins; inconsistent
///   blocks. Blocks of an unknown type end in the `ParameterException` of `DataTypeAdapter` |
class AverageFilterBase : public IFilter {
 public:
  AverageFilterBase(int size, std::optional<double> background)
      : kernelSize(size), noDataValue(background) {}

 protected:
  int kernelSize;
  std::optional<double> noDataValue;
};

class CPUAverageFilter : public AverageFilterBase {
 public:
  using AverageFilterBase::AverageFilterBase;

  /// `blockX` and `blockY` are not used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
