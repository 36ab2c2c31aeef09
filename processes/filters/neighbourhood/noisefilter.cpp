// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/noisefilter.h"

#include <cstddef>
#include <type_traits>

#include "processes/filters/framework/blockchecks.h"
#include "processes/filters/framework/channelconverters.h"
#include "processes/filters/framework/sampletypes.h"
#include "processes/filters/neighbourhood/noiserows.h"
#include "processes/filters/neighbourhood/windowbands.h"
#if ZARN_SIMD
#include "processes/filters/neighbourhood/noisefilter_simd.h"
#endif

namespace zarn::processes::filters {
namespace {

constexpr const char* kUnknownType = "Unknown raster block data type for noise filter.";

template <typename T>
void FilterBlock(const NoiseJob<T>& job) {
#if ZARN_SIMD
  ForEachWindowBand(job.output.Height(), NoiseScratchBytes(job),
                    [&](std::ptrdiff_t begin, std::ptrdiff_t end, std::byte* scratch) {
                      NoiseRowsSimd(job, begin, end, scratch);
                    });
#else
  ForEachWindowBand(
      job.output.Height(), 0,
      [&](std::ptrdiff_t begin, std::ptrdiff_t end, std::byte*) { NoiseRows(job, begin, end); });
#endif
}

}  // namespace

FilterResult CPUNoiseFilter::Process(const gobs::Raster& input, gobs::Raster& output,
                                     std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                     const std::uint8_t* inputMask) {
  const gobs::NativeDataTypeCode code = gobs::GetDataTypeCode(input);
  RequireTypeLimits(code, input.Channels());
  return VisitSampleType(code, kUnknownType, [&]<typename T>(std::type_identity<T>) {
    if (auto refusal = blockchecks::CheckSameSize(input, output)) return *refusal;
    if (auto refusal = blockchecks::CheckMargins(input, HalfWindow(kernelSize))) return *refusal;
    if (auto refusal = blockchecks::CheckBlocks(input, output, inputNoData, outputNoData,
                                                blockchecks::Aliasing::kForbidden)) {
      return *refusal;
    }
    FilterBlock(
        NoiseJob<T>{{input, output, inputNoData, outputNoData, noDataValue, inputMask, kernelSize},
                    TruncateToSample<T>(noDataValue)});
    return FilterResult::Success();
  });
}

}  // namespace zarn::processes::filters
