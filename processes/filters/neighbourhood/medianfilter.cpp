// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/medianfilter.h"

#include <cstddef>
#include <type_traits>

#include "processes/filters/framework/blockchecks.h"
#include "processes/filters/framework/messages.h"
#include "processes/filters/framework/sampletypes.h"
#include "processes/filters/neighbourhood/medianrows.h"
#include "processes/filters/neighbourhood/windowbands.h"
#if ZARN_SIMD
#include "processes/filters/neighbourhood/medianfilter_simd.h"
#endif

namespace zarn::processes::filters {
namespace {

constexpr const char* kWindowTooLarge = "Only filters of 7x7 or smaller are supported.";

template <typename T>
void MedianBlock(const MedianJob<T>& job) {
#if ZARN_SIMD
  ForEachWindowBand(job.output.Height(), MedianScratchBytes(job),
                    [&](std::ptrdiff_t begin, std::ptrdiff_t end, std::byte* scratch) {
                      MedianRowsSimd(job, begin, end, scratch);
                    });
#else
  ForEachWindowBand(
      job.output.Height(), 0,
      [&](std::ptrdiff_t begin, std::ptrdiff_t end, std::byte*) { MedianRows(job, begin, end); });
#endif
}

}  // namespace

FilterResult CPUMedianFilter::Process(const gobs::Raster& input, gobs::Raster& output,
                                      std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                      const std::uint8_t* inputMask) {
  const gobs::NativeDataTypeCode code = gobs::GetDataTypeCode(input);
  return VisitSampleType(
      code, messages::kUnknownMedianType, [&]<typename T>(std::type_identity<T>) {
        if (auto refusal = blockchecks::CheckCoversOutput(input, output)) return *refusal;
        if (auto refusal = blockchecks::CheckMargins(input, HalfWindow(kernelSize))) {
          return *refusal;
        }
        if (kernelSize > kMostMedianTaps) return FilterResult::Failure(kWindowTooLarge);
        if (auto refusal = blockchecks::CheckBlocks(input, output, inputNoData, outputNoData,
                                                    blockchecks::Aliasing::kForbidden)) {
          return *refusal;
        }
        MedianBlock(MedianJob<T>(input, output, inputNoData, outputNoData, noDataValue, inputMask,
                                 kernelSize));
        return FilterResult::Success();
      });
}

}  // namespace zarn::processes::filters
