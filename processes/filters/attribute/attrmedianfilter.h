// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "processes/filters/attribute/iattributefilter.h"
#include "processes/filters/framework/structuringkernel.h"

namespace zarn::processes::filters {

/// The median of the pool, unchanged: the lower one of two middle samples. NaN sorts last and -0
/// before +0. Refuses samples of an unknown type with "Unknown raster block data type for median
/// filter." and labels with "Unknown attribute raster data type for median filter.".
class AttrMedianFilterBase : public IAttributeFilter {
 public:
  /// Throws `std::length_error` for a size above `kMaxKernelSize`.
  AttrMedianFilterBase(int size, KernelShape shape);

 protected:
  int kernelSize;
  std::vector<int> kernelOffsets;  ///< pairs (dx, dy), as `SetupKernelSE` lists them
};

class CPUAttrMedianFilter : public AttrMedianFilterBase {
 public:
  using AttrMedianFilterBase::AttrMedianFilterBase;

  FilterResult ProcessBlocks(const gobs::Raster& in, const gobs::Raster& attr, gobs::Raster& out,
                             int attrScale, const unsigned char* inputMask,
                             const unsigned char* outputMask) override;
};

}  // namespace zarn::processes::filters
