// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/attribute/attraveragefilter.h"

#include <cstddef>

#include "host/gobs/saturatecast.h"
#include "processes/filters/attribute/filteralgo.h"
#include "processes/filters/attribute/poolblock.h"

namespace zarn::processes::filters {
namespace {

struct Mean {
  static constexpr FILTERALGO kAlgo = FILTERALGO::kAverage;
  static constexpr const char* kUnknownType = "Unknown raster block data type for average filter.";
  static constexpr const char* kUnknownAttributeType =
      "Unknown attribute raster data type for average filter.";

  template <typename T>
  static T Of(const T* samples, std::size_t count) {
    double sum = 0.0;
    for (std::size_t i = 0; i < count; ++i) sum += static_cast<double>(samples[i]);
    return gobs::SaturateCast<T>(sum / static_cast<double>(count));
  }
};

}  // namespace

AttrAverageFilterBase::AttrAverageFilterBase(int size, KernelShape shape) : kernelSize(size) {
  SetupKernelSE(static_cast<float>(size), kernelOffsets, shape);
}

FilterResult CPUAttrAverageFilter::ProcessBlocks(const gobs::Raster& in, const gobs::Raster& attr,
                                                 gobs::Raster& out, int attrScale,
                                                 const unsigned char* inputMask,
                                                 const unsigned char* outputMask) {
  return PoolBlock<Mean>({*this, kernelOffsets, in, attr, out, attrScale, inputMask, outputMask});
}

}  // namespace zarn::processes::filters
