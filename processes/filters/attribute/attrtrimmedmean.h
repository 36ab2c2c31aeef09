// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "processes/filters/attribute/iattributefilter.h"
#include "processes/filters/framework/structuringkernel.h"

namespace zarn::processes::filters {

/// The mean of the pool without its lowest and its highest quarter (rounded down to whole samples):
/// summed in double in ascending order, truncated towards zero for integers. NaN sorts last and -0
/// before +0. Refuses samples of an unknown type with "Unknown raster block data type for trimmed
/// mean filter." and labels with "Unknown attribute raster data type for trimmed median filter.".
class AttrTrimmedMeanBase : public IAttributeFilter {
 public:
  /// Throws `std::length_error` for a size above `kMaxKernelSize`.
  AttrTrimmedMeanBase(int size, KernelShape shape);

 protected:
  int kernelSize;
  std::vector<int> kernelOffsets;  ///< pairs (dx, dy), as `SetupKernelSE` lists them
};

class CPUAttrTrimmedMean : public AttrTrimmedMeanBase {
 public:
  using AttrTrimmedMeanBase::AttrTrimmedMeanBase;

  FilterResult ProcessBlocks(const gobs::Raster& in, const gobs::Raster& attr, gobs::Raster& out,
                             int attrScale, const unsigned char* inputMask,
                             const unsigned char* outputMask) override;
};

}  // namespace zarn::processes::filters
