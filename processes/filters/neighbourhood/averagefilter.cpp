// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/averagefilter.h"

#include <cstddef>
#include <memory>
#include <new>
#include <type_traits>
#include <vector>

#include "processes/filters/framework/blockchecks.h"
#include "processes/filters/framework/channelconverters.h"
#include "processes/filters/framework/parallel.h"
#include "processes/filters/framework/sampletypes.h"
#include "processes/filters/neighbourhood/averagerows.h"
#if ZARN_SIMD
#include "processes/filters/neighbourhood/averagefilter_simd.h"
#endif

namespace zarn::processes::filters {
namespace {

constexpr const char* kUnknownType = "Unknown raster block data type for average filter.";

template <typename T>
void AverageBlock(const AverageJob<T>& job) {
  const std::ptrdiff_t rows = job.output.Height();
  const std::ptrdiff_t bands = parallel::BandCount(rows);
#if ZARN_SIMD
  constexpr std::align_val_t kAlignment{64};
  const std::size_t bytes = AverageScratchBytes(job);
  const auto release = [&](std::byte* memory) { ::operator delete[](memory, kAlignment); };
  const std::unique_ptr<std::byte[], decltype(release)> scratch(
      new (kAlignment) std::byte[bytes * static_cast<std::size_t>(bands)], release);
  const auto average = [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
    AverageRowsSimd(job, begin, end, scratch.get() + static_cast<std::size_t>(band) * bytes);
  };
#else
  const auto average = [&](std::ptrdiff_t, std::ptrdiff_t begin, std::ptrdiff_t end) {
    AverageRows(job, begin, end);
  };
#endif
  parallel::ForEachRowBand(rows, bands, average);
}

}  // namespace

FilterResult CPUAverageFilter::Process(const gobs::Raster& input, gobs::Raster& output,
                                       std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                       const std::uint8_t* inputMask) {
  const gobs::NativeDataTypeCode code = gobs::GetDataTypeCode(input);
  const std::vector<ChannelBounds> bounds = TypeBounds(code, input.Channels());
  return VisitSampleType(code, kUnknownType, [&]<typename T>(std::type_identity<T>) {
    const int half = HalfWindow(kernelSize);
    if (auto refusal = blockchecks::CheckCoversOutput(input, output)) return *refusal;
    if (auto refusal = blockchecks::CheckMargins(input, half)) return *refusal;
    if (auto refusal = blockchecks::CheckBlocks(input, output, inputNoData, outputNoData,
                                                blockchecks::Aliasing::kForbidden)) {
      return *refusal;
    }
    const AverageJob<T> job{
        BlockView<const T>(input),
        BlockView<T>(output),
        BlockView<const std::uint8_t>::Beside(input, inputMask, 1),
        WindowRules<T>(input, inputNoData, outputNoData, noDataValue, inputMask),
        MakeConverters<T>(bounds, outputNoData),
        half,
    };
    parallel::AllowDynamicThreads();
    AverageBlock(job);
    return FilterResult::Success();
  });
}

}  // namespace zarn::processes::filters
