// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/attribute/attrmedianfilter.h"

#include <algorithm>
#include <cstddef>

#include "processes/filters/attribute/filteralgo.h"
#include "processes/filters/attribute/poolblock.h"
#include "processes/filters/framework/messages.h"
#include "processes/filters/framework/orderedkeys.h"

namespace zarn::processes::filters {
namespace {

struct Median {
  static constexpr FILTERALGO kAlgo = FILTERALGO::kMedian;
  static constexpr const char* kUnknownType = messages::kUnknownMedianType;
  static constexpr const char* kUnknownAttributeType =
      "Unknown attribute raster data type for median filter.";

  template <typename T>
  static T Of(T* samples, std::size_t count) {
    T* const middle = samples + (count - 1) / 2;
    std::nth_element(samples, middle, samples + count, SortsBefore());
    return *middle;
  }
};

}  // namespace

AttrMedianFilterBase::AttrMedianFilterBase(int size, KernelShape shape) : kernelSize(size) {
  SetupKernelSE(static_cast<float>(size), kernelOffsets, shape);
}

FilterResult CPUAttrMedianFilter::ProcessBlocks(const gobs::Raster& in, const gobs::Raster& attr,
                                                gobs::Raster& out, int attrScale,
                                                const unsigned char* inputMask,
                                                const unsigned char* outputMask) {
  return PoolBlock<Median>({*this, kernelOffsets, in, attr, out, attrScale, inputMask, outputMask});
}

}  // namespace zarn::processes::filters
