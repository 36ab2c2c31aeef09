// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "processes/filters/attribute/iattributefilter.h"
#include "processes/filters/framework/structuringkernel.h"

namespace zarn::processes::filters {

/// The mean of the pool: summed in double in the order of the kernel's cells, truncated towards
/// zero for integers. Refuses samples of an unknown type with "Unknown raster block data type for
/// average filter." and labels with "Unknown attribute raster data type for average filter.".
class AttrAverageFilterBase : public IAttributeFilter {
 public:
  /// Throws `std::length_error` for a size above `kMaxKernelSize`.
  AttrAverageFilterBase(int size, KernelShape shape);

 protected:
  int kernelSize;
  std::vector<int> kernelOffsets;  ///< pairs (dx, dy), as `SetupKernelSE` lists them
};

class CPUAttrAverageFilter : public AttrAverageFilterBase {
 public:
  using AttrAverageFilterBase::AttrAverageFilterBase;

  FilterResult ProcessBlocks(const gobs::Raster& in, const gobs::Raster& attr, gobs::Raster& out,
                             int attrScale, const unsigned char* inputMask,
                             const unsigned char* outputMask) override;
};

}  // namespace zarn::processes::filters
