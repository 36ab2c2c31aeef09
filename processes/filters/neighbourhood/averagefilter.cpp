// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/averagefilter.h"

#include <cstddef>
#include <type_traits>
#include <vector>

#include "processes/filters/framework/blockchecks.h"
#include "processes/filters/framework/channelconverters.h"
#include "processes/filters/framework/sampletypes.h"
#include "processes/filters/neighbourhood/averagerows.h"
#include "processes/filters/neighbourhood/windowbands.h"
#if ZARN_SIMD
#include "processes/filters/neighbourhood/averagefilter_simd.h"
#endif

namespace zarn::processes::filters {
namespace {

constexpr const char* kUnknownType = "Unknown raster block data type for average filter.";

template <typename T>
void AverageBlock(const AverageJob<T>& job) {
#if ZARN_SIMD
  ForEachWindowBand(job.output.Height(), AverageScratchBytes(job),
                    [&](std::ptrdiff_t begin, std::ptrdiff_t end, std::byte* scratch) {
                      AverageRowsSimd(job, begin, end, scratch);
                    });
#else
  ForEachWindowBand(
      job.output.Height(), 0,
      [&](std::ptrdiff_t begin, std::ptrdiff_t end, std::byte*) { AverageRows(job, begin, end); });
#endif
}

}  // namespace

FilterResult CPUAverageFilter::Process(const gobs::Raster& input, gobs::Raster& output,
                                       std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                       const std::uint8_t* inputMask) {
  const gobs::NativeDataTypeCode code = gobs::GetDataTypeCode(input);
  const std::vector<ChannelBounds> bounds = TypeBounds(code, input.Channels());
  return VisitSampleType(code, kUnknownType, [&]<typename T>(std::type_identity<T>) {
    if (auto refusal = blockchecks::CheckCoversOutput(input, output)) return *refusal;
    if (auto refusal = blockchecks::CheckMargins(input, HalfWindow(kernelSize))) return *refusal;
    if (auto refusal = blockchecks::CheckBlocks(input, output, inputNoData, outputNoData,
                                                blockchecks::Aliasing::kForbidden)) {
      return *refusal;
    }
    AverageBlock(AverageJob<T>{
        {input, output, inputNoData, outputNoData, noDataValue, inputMask, kernelSize},
        MakeConverters<T>(bounds, outputNoData)});
    return FilterResult::Success();
  });
}

}  // namespace zarn::processes::filters
