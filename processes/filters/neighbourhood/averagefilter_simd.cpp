// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/averagefilter_simd.h"

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <type_traits>

#include "processes/filters/neighbourhood/averagescratch.h"

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/neighbourhood/averagefilter_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
#include "processes/filters/neighbourhood/averagemeans_simd.h"
#include "processes/filters/neighbourhood/boxsums_simd.h"
#include "processes/filters/neighbourhood/windowstrip_simd.h"
#endif

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128

/// One strip of columns in one band of rows: the state that slides down with the window. Each row
/// is looked at once as it enters; sums of columns gain the entering row and lose the leaving one;
/// sums over the columns of a window give its means.
template <typename T, typename Acc>
class Strip {
 public:
  using Count = CountFor<Acc>;

  /// The strip covers output columns `firstColumn` .. + plan.strip - 1.
  Strip(const AverageJob<T>& job, const AveragePlan& plan, const AverageScratch<T>& scratch,
        const BoundPattern<T>& bounds, std::ptrdiff_t firstColumn)
      : job_(job),
        plan_(plan),
        scratch_(scratch),
        bounds_(bounds),
        strip_(job, scratch.strip, firstColumn, plan.strip) {
    for (std::size_t slot = 0; slot <= plan.taps; ++slot) scratch_.ring[slot].dirty = false;
  }

  HWY_ATTR void Run(std::ptrdiff_t begin, std::ptrdiff_t end) {
    for (std::ptrdiff_t y = begin - job_.half; y < begin + job_.half; ++y) Enter(y);
    for (std::ptrdiff_t y = begin; y < end; ++y) {
      Enter(y + job_.half);
      SumColumns();
      AverageRow(y);
    }
  }

 private:
  // The rows that are held, from the oldest: the one that has just left the window, then the
  // window's from the top.
  const WindowRow<T>& Held(std::size_t index) const {
    const std::size_t slots = plan_.taps + 1;
    const std::size_t slot = oldest_ + index;
    return scratch_.ring[slot < slots ? slot : slot - slots];
  }
  const WindowRow<T>& Leaving() const { return Held(0); }
  const WindowRow<T>& Window(std::size_t index) const { return Held(1 + index); }
  const WindowRow<T>& Entering() const { return Held(plan_.taps); }
  const WindowRow<T>& Centre() const { return Window(plan_.taps / 2); }

  template <typename U = Acc>
  static U* Row(std::byte* row) {
    return reinterpret_cast<U*>(row);
  }

  // Moves the window down by one row. A row with excluded pixels is copied with these made neutral.
  HWY_ATTR void Enter(std::ptrdiff_t y) {
    WindowRow<T>& row = scratch_.ring[oldest_];
    oldest_ = oldest_ == plan_.taps ? 0 : oldest_ + 1;
    const std::size_t pixels = plan_.Pixels();
    const T* const input = strip_.WindowRow(y, row.ownSamples);
    const ExclusionTests<T> tests = strip_.Tests(y);
    row.dirty = tests.Any() && AnyExcluded(input, pixels, plan_.channels, tests);
    if (row.dirty) {
      CopyUnexcluded(input, pixels, plan_.channels, tests, kNeutralSample<T>, row.ownSamples,
                     row.ownFlags);
    }
    row.samples = row.dirty ? row.ownSamples : input;
    row.flags = row.dirty ? row.ownFlags : scratch_.clean;
    row.range = RangeOf(row.samples, plan_.Samples());
    dirtyRows_ += (row.dirty ? 1 : 0) - (Leaving().dirty ? 1 : 0);
  }

  // Whether the samples of the window's rows, and of the leaving one if asked, add up exactly in
  // any order.
  bool Exact(bool withLeaving) const {
    if constexpr (!std::is_same_v<Acc, double>) return true;
    RowRange range;
    for (std::size_t r = withLeaving ? 0 : 1; r <= plan_.taps; ++r) range.Include(Held(r).range);
    return range.SumsAreExact(plan_.Window() + plan_.taps);
  }

  // Brings the sums of each column, of samples and of exclusions, down to the window's rows. Sums
  // of samples that could round are given up.
  HWY_ATTR void SumColumns() {
    Acc* const columns = Row(scratch_.columns);
    if (columnsReady_ && Exact(true)) {
      SlideColumns(columns, Entering().samples, Leaving().samples, plan_.Samples());
    } else if ((columnsReady_ = Exact(false))) {
      std::fill_n(columns, plan_.Samples() + kRowPadding, Acc{0});
      for (std::size_t r = 0; r < plan_.taps; ++r) {
        AddColumns(columns, Window(r).samples, plan_.Samples());
      }
    }
    auto* const excluded = Row<Count>(scratch_.excludedColumns);
    if (!countsReady_) {
      std::fill_n(excluded, plan_.Pixels() + kRowPadding, Count{0});
      for (std::size_t r = 0; r < plan_.taps; ++r) {
        AddColumns(excluded, Window(r).flags, plan_.Pixels());
      }
      countsReady_ = true;
    } else if (Entering().dirty || Leaving().dirty) {
      SlideColumns(excluded, Entering().flags, Leaving().flags, plan_.Pixels());
    }
  }

  // Writes output row y.
  HWY_ATTR void AverageRow(std::ptrdiff_t y) {
    T* const out = strip_.Output(y);
    const UniformBounds<T> uniform(bounds_);
    const bool direct = !Centre().dirty && (uniform.active || !bounds_.active);
    const MeanRow<T> row(direct ? out : scratch_.means, scratch_.means, plan_.Outputs(), uniform);
    const Means<T, Acc> means(plan_, CountExcluded(), row);
    if (columnsReady_) {
      WindowSums(Row(scratch_.columns), plan_.taps, plan_.channels, plan_.Outputs(),
                 Row(scratch_.levels), scratch_.pitch, means);
    } else if constexpr (std::is_same_v<Acc, double>) {
      for (std::size_t r = 0; r < plan_.taps; ++r) scratch_.ordered[r] = Window(r).samples;
      OrderedSums(scratch_.ordered, plan_.taps, plan_.channels, plan_.Outputs(), means);
    }
    row.Finish(hn::Lanes(hn::ScalableTag<Acc>()));
    if (direct) return;
    if (bounds_.active && !uniform.active) BoundMeans(bounds_, plan_.Outputs(), scratch_.means);
    if (!Centre().dirty) {
      std::memcpy(out, scratch_.means, plan_.Outputs() * sizeof(T));
    } else {
      const std::uint8_t* const flags = Centre().flags + job_.half;
      strip_.Merge(y, scratch_.means, [&](std::size_t x) { return flags[x] != 0; });
    }
  }

  // How many pixels of each window are excluded, once for each output sample; null when none is.
  HWY_ATTR const Count* CountExcluded() {
    if (dirtyRows_ == 0) return nullptr;
    const auto* const columns = Row<Count>(scratch_.excludedColumns);
    auto* const levels = Row<Count>(scratch_.levels);
    auto* const counts = Row<Count>(scratch_.counts);
    if (plan_.channels == 1) {
      WindowSums(columns, plan_.taps, 1, plan_.strip, levels, scratch_.pitch,
                 Stores<Count>{counts});
    } else {
      // The level past the last one is free.
      Count* const perPixel = levels + SharedLevels(plan_.taps) * scratch_.pitch;
      WindowSums(columns, plan_.taps, 1, plan_.strip, levels, scratch_.pitch,
                 Stores<Count>{perPixel});
      RepeatForChannels(perPixel, plan_.strip, plan_.channels, counts);
    }
    return counts;
  }

  const AverageJob<T>& job_;
  const AveragePlan& plan_;
  const AverageScratch<T>& scratch_;
  const BoundPattern<T>& bounds_;
  const WindowStrip<T> strip_;
  std::size_t oldest_ = 0;        // slot of the row that has just left the window
  std::ptrdiff_t dirtyRows_ = 0;  // of the window
  bool columnsReady_ = false;     // the column sums hold the window's rows
  bool countsReady_ = false;
};

template <typename T, typename Acc>
HWY_ATTR void RunStrips(const AverageJob<T>& job, const AveragePlan& plan, std::ptrdiff_t begin,
                        std::ptrdiff_t end, std::byte* memory) {
  if (begin == end || plan.Outputs() == 0) return;
  const AverageScratch<T> scratch = AverageScratch<T>::Take(plan, memory);
  const BoundPattern<T> bounds = BoundPattern<T>::Of(job, scratch.bounds);
  const auto width = static_cast<std::size_t>(job.output.Width());
  for (std::size_t x = 0; x < width; x += plan.strip) {
    AveragePlan own = plan;
    own.strip = std::min(plan.strip, width - x);
    Strip<T, Acc>(job, own, scratch, bounds, static_cast<std::ptrdiff_t>(x)).Run(begin, end);
  }
}

template <typename T>
HWY_ATTR void RunBand(const AverageJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end,
                      std::byte* scratch) {
  const AveragePlan plan = AveragePlan::Of(job);
  switch (plan.sum) {
    case SumType::kUInt16:
      if constexpr (sizeof(T) == 1) RunStrips<T, std::uint16_t>(job, plan, begin, end, scratch);
      break;
    case SumType::kInt32:
      if constexpr (sizeof(T) <= 2) RunStrips<T, std::int32_t>(job, plan, begin, end, scratch);
      break;
    case SumType::kDouble:
      RunStrips<T, double>(job, plan, begin, end, scratch);
      break;
  }
}

#else

// Emulated vectors would be slower than the definition.
template <typename T>
void RunBand(const AverageJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end, std::byte*) {
  AverageRows(job, begin, end);
}

#endif

// One entry per sample type, because the dispatch table holds plain functions.
#define ZARN_RUN_BAND(name, type)                                                  \
  void name(const AverageJob<type>& job, std::ptrdiff_t begin, std::ptrdiff_t end, \
            std::byte* scratch) {                                                  \
    RunBand(job, begin, end, scratch);                                             \
  }
ZARN_RUN_BAND(RunUInt8, std::uint8_t)
ZARN_RUN_BAND(RunInt8, std::int8_t)
ZARN_RUN_BAND(RunUInt16, std::uint16_t)
ZARN_RUN_BAND(RunInt16, std::int16_t)
ZARN_RUN_BAND(RunUInt32, std::uint32_t)
ZARN_RUN_BAND(RunInt32, std::int32_t)
ZARN_RUN_BAND(RunFloat32, float)
ZARN_RUN_BAND(RunFloat64, double)
#undef ZARN_RUN_BAND

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {
namespace {

// The function of one sample type for the best target of this CPU.
template <typename T>
struct Entry;
#define ZARN_ENTRY(name, type)                                                             \
  HWY_EXPORT(name);                                                                        \
  template <>                                                                              \
  struct Entry<type> {                                                                     \
    static void Run(const AverageJob<type>& job, std::ptrdiff_t begin, std::ptrdiff_t end, \
                    std::byte* scratch) {                                                  \
      HWY_DYNAMIC_DISPATCH(name)(job, begin, end, scratch);                                \
    }                                                                                      \
  };
ZARN_ENTRY(RunUInt8, std::uint8_t)
ZARN_ENTRY(RunInt8, std::int8_t)
ZARN_ENTRY(RunUInt16, std::uint16_t)
ZARN_ENTRY(RunInt16, std::int16_t)
ZARN_ENTRY(RunUInt32, std::uint32_t)
ZARN_ENTRY(RunInt32, std::int32_t)
ZARN_ENTRY(RunFloat32, float)
ZARN_ENTRY(RunFloat64, double)
#undef ZARN_ENTRY

}  // namespace

template <typename T>
std::size_t AverageScratchBytes(const AverageJob<T>& job) {
  return AverageScratch<T>::Bytes(AveragePlan::Of(job));
}

template <typename T>
void AverageRowsSimd(const AverageJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end,
                     std::byte* scratch) {
  Entry<T>::Run(job, begin, end, scratch);
}

#define ZARN_INSTANTIATE(type)                                                           \
  template std::size_t AverageScratchBytes(const AverageJob<type>& job);                 \
  template void AverageRowsSimd(const AverageJob<type>&, std::ptrdiff_t, std::ptrdiff_t, \
                                std::byte*);
ZARN_INSTANTIATE(std::uint8_t)
ZARN_INSTANTIATE(std::int8_t)
ZARN_INSTANTIATE(std::uint16_t)
ZARN_INSTANTIATE(std::int16_t)
ZARN_INSTANTIATE(std::uint32_t)
ZARN_INSTANTIATE(std::int32_t)
ZARN_INSTANTIATE(float)
ZARN_INSTANTIATE(double)
#undef ZARN_INSTANTIATE

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
