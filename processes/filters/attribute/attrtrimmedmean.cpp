// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/attribute/attrtrimmedmean.h"

#include <algorithm>
#include <cstddef>

#include "host/gobs/saturatecast.h"
#include "processes/filters/attribute/filteralgo.h"
#include "processes/filters/attribute/poolblock.h"
#include "processes/filters/framework/orderedkeys.h"

namespace zarn::processes::filters {
namespace {

struct TrimmedMean {
  static constexpr FILTERALGO kAlgo = FILTERALGO::kTrimmedMean;
  static constexpr const char* kUnknownType =
      "Unknown raster block data type for trimmed mean filter.";
  static constexpr const char* kUnknownAttributeType =
      "Unknown attribute raster data type for trimmed median filter.";

  template <typename T>
  static T Of(T* samples, std::size_t count) {
    const std::size_t trimmed = count / 4;  // at either end
    std::sort(samples, samples + count, SortsBefore());
    double sum = 0.0;
    for (std::size_t i = trimmed; i < count - trimmed; ++i) sum += static_cast<double>(samples[i]);
    return gobs::SaturateCast<T>(sum / static_cast<double>(count - 2 * trimmed));
  }
};

}  // namespace

AttrTrimmedMeanBase::AttrTrimmedMeanBase(int size, KernelShape shape) : kernelSize(size) {
  SetupKernelSE(static_cast<float>(size), kernelOffsets, shape);
}

FilterResult CPUAttrTrimmedMean::ProcessBlocks(const gobs::Raster& in, const gobs::Raster& attr,
                                               gobs::Raster& out, int attrScale,
                                               const unsigned char* inputMask,
                                               const unsigned char* outputMask) {
  return PoolBlock<TrimmedMean>(
      {*this, kernelOffsets, in, attr, out, attrScale, inputMask, outputMask});
}

}  // namespace zarn::processes::filters
