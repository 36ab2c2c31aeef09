// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <new>
#include <type_traits>
#include <utility>
#include <vector>

#include "host/sys/openmp.h"
#include "processes/filters/attribute/iattributefilter.h"
#include "processes/filters/attribute/labelraster.h"
#include "processes/filters/attribute/pooling.h"
#include "processes/filters/framework/blockchecks.h"
#include "processes/filters/framework/parallel.h"
#include "processes/filters/framework/sampletypes.h"
#if ZARN_SIMD
#include "processes/filters/attribute/poolband.h"
#endif

namespace zarn::processes::filters {

/// The arguments of `IAttributeFilter::ProcessBlocks` with the filter's settings.
struct PoolCall {
  const IAttributeFilter& settings;
  const std::vector<int>& kernelOffsets;
  const gobs::Raster& in;
  const gobs::Raster& attr;
  gobs::Raster& out;
  int attrScale;
  const std::uint8_t* inputMask;
  const std::uint8_t* outputMask;
};

/// The cells of a kernel from its list of pairs, and how far they reach.
std::vector<PoolOffset> PoolOffsets(const std::vector<int>& pairs);
PoolReach ReachOf(const std::vector<PoolOffset>& offsets);

/// Whether `code` is one of the sample types that are handled.
bool IsHandledType(gobs::NativeDataTypeCode code);

/// What all attribute filters refuse once the types are known.
blockchecks::Refusal CheckPoolCall(const PoolCall& call, const std::vector<PoolOffset>& offsets);

template <class Statistic, typename T>
void RunPools(const PoolingJob<T>& job) {
  const std::ptrdiff_t rows = job.output.Height();
  const std::ptrdiff_t bands = parallel::BandCount(rows);
#if ZARN_SIMD
  if (const PoolPlan<T> plan(job, Statistic::kAlgo); plan.Usable()) {
    constexpr std::align_val_t kAlignment{64};
    const std::size_t bytes = PoolScratch<T>::Bytes(plan);
    const std::size_t size = bytes * static_cast<std::size_t>(bands);
    const auto release = [&](std::byte* memory) { ::operator delete[](memory, kAlignment); };
    const std::unique_ptr<std::byte[], decltype(release)> scratch(
        new (kAlignment) std::byte[size](), release);
    parallel::ForEachRowBand(
        rows, bands, [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
          PoolBand<T>(job, plan, scratch.get() + static_cast<std::size_t>(band) * bytes)
              .Run(begin, end);
        });
    return;
  }
#endif
  const std::size_t cells = job.offsets.size();
  std::vector<const T*> pools(static_cast<std::size_t>(bands) * cells);
  std::vector<T> samples(pools.size());
  parallel::ForEachRowBand(
      rows, bands, [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
        const std::size_t first = static_cast<std::size_t>(band) * cells;
        ReduceRows<Statistic>(job, begin, end, pools.data() + first, samples.data() + first);
      });
}

/// Processes a block with one of the filters: `Statistic` has its reduction `Of(samples, count)`,
/// which may reorder the samples, its number, and
/// its texts.
template <class Statistic>
FilterResult PoolBlock(const PoolCall& call) {
  const IAttributeFilter& settings = call.settings;
  return VisitSampleType(gobs::GetDataTypeCode(call.in), Statistic::kUnknownType,
                         [&]<typename T>(std::type_identity<T>) {
                           if (!IsHandledType(gobs::GetDataTypeCode(call.attr))) {
                             return FilterResult::Failure(Statistic::kUnknownAttributeType);
                           }
                           std::vector<PoolOffset> offsets = PoolOffsets(call.kernelOffsets);
                           if (auto refusal = CheckPoolCall(call, offsets)) return *refusal;
                           if (offsets.empty()) return FilterResult::Success();
                           std::unique_ptr<LabelRaster> labels;
                           if (settings.useAttributes) {
                             labels =
                                 MakeLabelRaster(call.attr, call.attrScale,
                                                 settings.attrNoDataValue, settings.attrTolerance);
                           }
                           const PoolReach reach = ReachOf(offsets);
                           const PoolingJob<T> job{
                               BlockView<const T>(call.in),
                               BlockView<T>(call.out),
                               BlockView<const std::uint8_t>::Beside(call.in, call.inputMask, 1),
                               BlockView<const std::uint8_t>::Beside(call.out, call.outputMask, 1),
                               call.inputMask != nullptr,
                               call.outputMask != nullptr,
                               std::vector<T>(settings.useNoData ? call.in.Channels() : 0,
                                              TruncateToSample<T>(settings.noDataValue)),
                               labels.get(),
                               std::move(offsets),
                               reach,
                           };
                           const sys::OMPDynamic dynamic(true);
                           RunPools<Statistic>(job);
                           return FilterResult::Success();
                         });
}

}  // namespace zarn::processes::filters
