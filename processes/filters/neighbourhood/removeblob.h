// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {

/// Turns data into background where the kernel's square does not fit into the data: what is left
/// is the morphological opening, the union of all squares of data.
///
/// | | |
/// |---|---|
/// | sample types, window, input margins | as of the average filter |
/// | output size | that of the input; every pixel is written |
/// | data | pixels of the block that are not masked, not no-data and not background; with an output
///   no-data value also no-data pixels. Margins are never data, so the result depends on the block:
///   a pixel's is that of the whole image if the block reaches 2 * (kernelSize / 2) pixels further
///   |
/// | masked, no-data and background pixels | copied |
/// | any other pixel | copied, or `noDataValue` in all channels |
/// | parallel | always, over rows, with dynamic adjustment of the thread count switched on |
/// | failures | "Unknown raster block data type."; sizes; margins; inconsistent blocks. Blocks of
/// an
///   unknown type end in the `ParameterException` of `DataTypeAdapter` |
class RemoveBlobBase : public IFilter {
 public:
  RemoveBlobBase(int size, double background) : kernelSize(size), noDataValue(background) {}

 protected:
  int kernelSize;
  double noDataValue;
};

class CPURemoveBlob : public RemoveBlobBase {
 public:
  using RemoveBlobBase::RemoveBlobBase;

  /// `blockX` and `blockY` are not used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
