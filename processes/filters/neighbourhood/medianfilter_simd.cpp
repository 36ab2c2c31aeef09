// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/medianfilter_simd.h"

#include <algorithm>
#include <cstdint>
#include <cstring>

#include "processes/filters/neighbourhood/medianscratch.h"
#include "processes/filters/neighbourhood/windowmedians_simd.h"

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/neighbourhood/medianfilter_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
#include "processes/filters/framework/orderedkeys_simd.h"
#include "processes/filters/neighbourhood/boxsums_simd.h"
#include "processes/filters/neighbourhood/windowstrip_simd.h"
#endif

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128

/// Sets all bits of the samples of excluded pixels, and none of others.
template <typename T>
HWY_ATTR void FlagSamples(const T* row, std::size_t pixels, std::size_t channels,
                          const ExclusionTests<T>& tests, OrderedKey<T>* flags) {
  using Key = OrderedKey<T>;
  const bool vectors = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    using D = hn::ScalableTag<T>;
    const D d;
    const hn::ScalableTag<Key> dk;
    for (std::size_t i = 0; i < pixels; i += hn::Lanes(d)) {
      const PixelVectors<D, kChannels> v(d, row + i * kChannels);
      const auto excluded = tests.ExcludesVector(d, v, i);
      PixelVectors<decltype(dk), kChannels> lanes(dk);
      for (auto& channel : lanes.channel) {
        channel = hn::VecFromMask(dk, hn::RebindMask(dk, excluded));
      }
      lanes.Store(flags + i * kChannels);
    }
  });
  for (std::size_t i = 0; !vectors && i < pixels; ++i) {
    const bool excluded = tests.Excludes(row, channels, i);
    std::fill_n(flags + i * channels, channels, static_cast<Key>(excluded ? ~Key{0} : Key{0}));
  }
}

/// Whether none of the bits that count are those of a negative sample or a NaN. `excluded` is null
/// where all count.
template <typename T>
HWY_ATTR bool SortAsBits(const OrderedKey<T>* bits, const OrderedKey<T>* excluded,
                         std::size_t count) {
  const hn::ScalableTag<OrderedKey<T>> d;
  const std::size_t lanes = hn::Lanes(d);
  auto most = hn::Zero(d);
  const auto load = [&](std::size_t i) HWY_ATTR {
    const auto v = hn::LoadU(d, bits + i);
    return excluded == nullptr ? v : hn::AndNot(hn::LoadU(d, excluded + i), v);
  };
  std::size_t i = 0;
  for (; i + lanes <= count; i += lanes) most = hn::Max(most, load(i));
  most = hn::Max(most, hn::IfThenElseZero(hn::FirstN(d, count - i), load(i)));
  const auto limit = hn::Set(d, kMostSortedBits<T>);
  return hn::AllTrue(d, hn::Eq(hn::Max(most, limit), limit));
}

/// One strip of columns in one band of rows. Each row is looked at once as it enters.
template <typename T>
class MedianStrip {
 public:
  using Key = OrderedKey<T>;

  MedianStrip(const MedianJob<T>& job, const MedianPlan& plan, MedianScratch<T>& scratch,
              std::ptrdiff_t firstColumn)
      : half_(job.half),
        plan_(plan),
        scratch_(scratch),
        strip_(job, scratch.strip, firstColumn, plan.strip) {
    for (MedianRow<T>& row : scratch_.ring) {
      row.dirty = false;
      row.sortsBits = true;
    }
  }

  HWY_ATTR void Run(std::ptrdiff_t begin, std::ptrdiff_t end) {
    for (std::ptrdiff_t y = begin - half_; y < begin + half_; ++y) Enter(y);
    for (std::ptrdiff_t y = begin; y < end; ++y) {
      Enter(y + half_);
      FilterRow(y);
    }
  }

 private:
  // The rows of the window, from the top.
  MedianRow<T>& Window(std::size_t index) const {
    const std::size_t slot = oldest_ + index;
    return scratch_.ring[slot < plan_.taps ? slot : slot - plan_.taps];
  }

  // Moves the window down by one row.
  HWY_ATTR void Enter(std::ptrdiff_t y) {
    MedianRow<T>& row = scratch_.ring[oldest_];
    oldest_ = oldest_ + 1 == plan_.taps ? 0 : oldest_ + 1;
    dirtyRows_ -= row.dirty ? 1 : 0;
    unsortedRows_ -= row.sortsBits ? 0 : 1;
    const T* const samples = strip_.WindowRow(y, row.ownSamples);
    const ExclusionTests<T> tests = strip_.Tests(y);
    row.dirty = tests.Any() && AnyExcluded(samples, plan_.Pixels(), plan_.channels, tests);
    row.excluded = row.dirty ? row.ownExcluded : scratch_.clean;
    if (row.dirty) FlagSamples(samples, plan_.Pixels(), plan_.channels, tests, row.ownExcluded);
    row.bits = reinterpret_cast<const Key*>(samples);
    row.hasKeys = false;
    row.sortsBits = kIsOwnKey<T> ||
                    SortAsBits<T>(row.bits, row.dirty ? row.excluded : nullptr, plan_.Samples());
    dirtyRows_ += row.dirty ? 1 : 0;
    unsortedRows_ += row.sortsBits ? 0 : 1;
  }

  // The ordered keys of a row.
  HWY_ATTR const Key* Keys(MedianRow<T>& row) const {
    if (row.hasKeys) return row.ownKeys;
    row.hasKeys = true;
    const hn::ScalableTag<Key> d;
    for (std::size_t i = 0; i < plan_.Samples(); i += hn::Lanes(d)) {
      hn::StoreU(KeysOfBits<T>(d, hn::LoadU(d, row.bits + i)), d, row.ownKeys + i);
    }
    return row.ownKeys;
  }

  HWY_ATTR void FilterRow(std::ptrdiff_t y) {
    const MedianRow<T>& centre = Window(plan_.taps / 2);
    const Key* rows[kMostMedianTaps];
    const Key* excluded[kMostMedianTaps];
    for (std::size_t r = 0; r < plan_.taps; ++r) {
      rows[r] = unsortedRows_ == 0 ? Window(r).bits : Keys(Window(r));
      excluded[r] = Window(r).excluded;
    }
    T* const output = strip_.Output(y);
    const bool inPlace = unsortedRows_ == 0 && !centre.dirty;
    const auto* const next = reinterpret_cast<const Key*>(strip_.InputWindowRow(y + half_ + 1));
    FindMedians(KeyWindows<Key>{rows, dirtyRows_ == 0 ? nullptr : excluded, next, plan_.taps,
                                plan_.channels, plan_.Outputs(), scratch_.windows,
                                inPlace ? reinterpret_cast<Key*>(output) : scratch_.medians});
    if (inPlace) return;
    Key* const medians = scratch_.medians;
    const hn::ScalableTag<Key> d;
    for (std::size_t i = 0; unsortedRows_ != 0 && i < plan_.Outputs(); i += hn::Lanes(d)) {
      hn::StoreU(BitsOfKeys<T>(d, hn::LoadU(d, medians + i)), d, medians + i);
    }
    T* const results = reinterpret_cast<T*>(medians);
    if (!centre.dirty) {
      std::memcpy(output, results, plan_.Outputs() * sizeof(T));
      return;
    }
    const Key* const flags = centre.excluded + plan_.taps / 2 * plan_.channels;
    strip_.Merge(y, results, [&](std::size_t x) { return flags[x * plan_.channels] != 0; });
  }

  const std::ptrdiff_t half_;
  const MedianPlan& plan_;
  MedianScratch<T>& scratch_;
  const WindowStrip<T> strip_;
  std::size_t oldest_ = 0;  // slot of the window's top row
  // Of the window:
  std::ptrdiff_t dirtyRows_ = 0;
  std::ptrdiff_t unsortedRows_ = 0;
};

template <typename T>
HWY_ATTR void RunBand(const MedianJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end,
                      std::byte* memory) {
  const MedianPlan plan = MedianPlan::Of(job);
  if (plan.taps == 1) return MedianRows(job, begin, end);
  if (begin == end || plan.Outputs() == 0) return;
  ScratchCutter cutter(memory);
  MedianScratch<T> scratch = MedianScratch<T>::Cut(plan, cutter);
  std::fill_n(scratch.clean, plan.Samples() + kRowPadding, OrderedKey<T>{0});
  const auto width = static_cast<std::size_t>(job.output.Width());
  for (std::size_t x = 0; x < width; x += plan.strip) {
    MedianPlan own = plan;
    own.strip = std::min(plan.strip, width - x);
    MedianStrip<T>(job, own, scratch, static_cast<std::ptrdiff_t>(x)).Run(begin, end);
  }
}

#else

// Emulated vectors would be slower than the definition.
template <typename T>
void RunBand(const MedianJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end, std::byte*) {
  MedianRows(job, begin, end);
}

#endif

// The dispatch table holds plain functions: one entry per sample type.
#define ZARN_SAMPLE_TYPES(macro)                                                         \
  macro(UInt8, std::uint8_t) macro(Int8, std::int8_t) macro(UInt16, std::uint16_t)       \
      macro(Int16, std::int16_t) macro(UInt32, std::uint32_t) macro(Int32, std::int32_t) \
          macro(Float32, float) macro(Float64, double)
#define ZARN_RUN_BAND(name, T)                                                      \
  void Run##name(const MedianJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end, \
                 std::byte* scratch) {                                              \
    RunBand(job, begin, end, scratch);                                              \
  }
ZARN_SAMPLE_TYPES(ZARN_RUN_BAND)
#undef ZARN_RUN_BAND

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {

template <typename T>
std::size_t MedianScratchBytes(const MedianJob<T>& job) {
  ScratchCutter cutter(nullptr);
  MedianScratch<T>::Cut(MedianPlan::Of(job), cutter);
  return cutter.Size();
}

// Explicit specialisations are exported unless told otherwise.
#define ZARN_ENTRY(name, T)                                                                    \
  HWY_EXPORT(Run##name);                                                                       \
  template std::size_t MedianScratchBytes(const MedianJob<T>& job);                            \
  template <>                                                                                  \
  __attribute__((visibility("hidden"))) void MedianRowsSimd(                                   \
      const MedianJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end, std::byte* scratch) { \
    HWY_DYNAMIC_DISPATCH(Run##name)(job, begin, end, scratch);                                 \
  }
ZARN_SAMPLE_TYPES(ZARN_ENTRY)

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
