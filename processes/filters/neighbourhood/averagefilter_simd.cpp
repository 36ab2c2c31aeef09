// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/averagefilter_simd.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
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

#include "processes/filters/neighbourhood/boxsums_simd.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

// Every accumulator type comes with the exact integer or floating division that its sums allow.
//
// The mean that is wanted is the double nearest to sum / count, rounded to the nearest integer,
// ties to even. Where neither step can cross a rounding boundary, single precision or integers
// decide the same: distinct quotients keep 1 / (2 * count) away from a tie, which must exceed the
// error.

/// Means of whole windows of bytes, `divisor` samples each: multiplication by the reciprocal.
HWY_ATTR void DivideByReciprocal(const std::uint16_t* HWY_RESTRICT sums, const Reciprocal16& by,
                                 std::size_t samples, std::uint8_t* HWY_RESTRICT means) {
  const hn::ScalableTag<std::uint16_t> d;
  const hn::Rebind<std::uint8_t, decltype(d)> d8;
  const auto multiplier = hn::Set(d, by.multiplier);
  const auto bias = hn::Set(d, by.bias);
  for (std::size_t i = 0; i < samples; i += hn::Lanes(d)) {
    const auto product = hn::MulHigh(hn::Add(hn::LoadU(d, sums + i), bias), multiplier);
    hn::StoreU(hn::TruncateTo(d8, hn::ShiftRightSame(product, by.shift)), d8, means + i);
  }
}

/// Loads 16- or 32-bit counters as 32-bit lanes.
template <class D, typename Acc>
HWY_INLINE hn::Vec<D> LoadCounters(D d, const Acc* from) {
  if constexpr (sizeof(Acc) == 2) {
    return hn::PromoteTo(d, hn::LoadU(hn::Rebind<std::uint16_t, D>(), from));
  } else {
    return hn::LoadU(d, from);
  }
}

/// Means in single precision; `excluded` (null: none) is taken from `whole` for each sample.
template <typename Acc, typename T>
HWY_ATTR void DivideAsFloat(const Acc* HWY_RESTRICT sums, const Acc* HWY_RESTRICT excluded,
                            std::uint64_t whole, std::size_t samples, T* HWY_RESTRICT means) {
  const hn::ScalableTag<float> d;
  const hn::RebindToSigned<decltype(d)> di;
  const hn::Rebind<T, decltype(d)> dt;
  const auto all = hn::Set(di, static_cast<std::int32_t>(whole));
  auto count = hn::ConvertTo(d, all);
  for (std::size_t i = 0; i < samples; i += hn::Lanes(d)) {
    if (excluded != nullptr) {
      count = hn::ConvertTo(d, hn::Sub(all, LoadCounters(di, excluded + i)));
    }
    const auto mean = hn::Div(hn::ConvertTo(d, LoadCounters(di, sums + i)), count);
    hn::StoreU(hn::DemoteTo(dt, hn::NearestInt(mean)), dt, means + i);
  }
}

/// Brings double lanes to the sample type; integers are rounded, ties to even.
template <class D, typename T>
HWY_INLINE void StoreMeans(D d, hn::Vec<D> mean, T* to) {
  const hn::Rebind<T, D> dt;
  if constexpr (std::is_same_v<T, double>) {
    hn::StoreU(mean, d, to);
  } else if constexpr (std::is_same_v<T, float>) {
    hn::StoreU(hn::DemoteTo(dt, mean), dt, to);
  } else {
    const hn::Rebind<std::int32_t, D> di;
    const auto rounded = hn::Round(mean);
    if constexpr (std::is_same_v<T, std::int32_t>) {
      hn::StoreU(hn::DemoteTo(di, rounded), di, to);
    } else if constexpr (std::is_same_v<T, std::uint32_t>) {
      const auto shifted = hn::DemoteTo(di, hn::Sub(rounded, hn::Set(d, 2147483648.0)));
      hn::StoreU(hn::Xor(hn::BitCast(dt, shifted), hn::Set(dt, 0x80000000U)), dt, to);
    } else {
      hn::StoreU(hn::DemoteTo(dt, hn::DemoteTo(di, rounded)), dt, to);
    }
  }
}

/// Means in double precision.
template <typename Acc, typename T>
HWY_ATTR void DivideAsDouble(const Acc* HWY_RESTRICT sums, const Acc* HWY_RESTRICT excluded,
                             std::uint64_t whole, std::size_t samples, T* HWY_RESTRICT means) {
  const hn::ScalableTag<double> d;
  const auto all = hn::Set(d, static_cast<double>(whole));
  auto count = all;
  for (std::size_t i = 0; i < samples; i += hn::Lanes(d)) {
    if (excluded != nullptr) count = hn::Sub(all, LoadAs(d, excluded + i));
    StoreMeans(d, hn::Div(LoadAs(d, sums + i), count), means + i);
  }
}

/// The channel of a vector's first sample, as vectors of `lanes` samples go by.
struct ChannelPhase {
  ChannelPhase(std::size_t lanes, std::size_t count) : step(lanes % count), channels(count) {}
  void Advance() {
    value += step;
    if (value >= channels) value -= channels;
  }
  std::size_t value = 0;
  std::size_t step;
  std::size_t channels;
};

/// What the output converters do to a mean that already is a sample, with constants that repeat
/// with the channels.
template <typename T>
HWY_ATTR void BoundMeans(const BoundPattern<T>& pattern, std::size_t samples, T* means) {
  const hn::ScalableTag<T> d;
  const std::size_t lanes = hn::Lanes(d);
  ChannelPhase phase(lanes, pattern.channels);
  for (std::size_t i = 0; i < samples; i += lanes) {
    auto v = hn::LoadU(d, means + i);
    const auto low = hn::LoadU(d, pattern.low + phase.value);
    const auto high = hn::LoadU(d, pattern.high + phase.value);
    v = hn::IfThenElse(hn::Lt(v, low), low, hn::IfThenElse(hn::Gt(v, high), high, v));
    if constexpr (!std::is_floating_point_v<T>) {
      const auto touches = hn::Eq(v, hn::LoadU(d, pattern.noData + phase.value));
      v = hn::IfThenElse(touches, hn::LoadU(d, pattern.replacement + phase.value), v);
    }
    hn::StoreU(v, d, means + i);
    phase.Advance();
  }
  if constexpr (std::is_floating_point_v<T>) {
    if (!pattern.avoids) return;
    const hn::ScalableTag<double> dd;
    const hn::Rebind<T, decltype(dd)> dt;
    ChannelPhase channel(hn::Lanes(dd), pattern.channels);
    for (std::size_t i = 0; i < samples; i += hn::Lanes(dd)) {
      const auto v = LoadAs(dd, means + i);
      const auto distance = hn::Abs(hn::Sub(v, LoadAs(dd, pattern.noData + channel.value)));
      const auto touches = hn::Lt(distance, hn::Set(dd, 1e-5));
      const auto other = LoadAs(dd, pattern.replacement + channel.value);
      StoreMeans(dd, hn::IfThenElse(touches, other, v), means + i);
      channel.Advance();
    }
  }
}

/// One band of rows: the state that slides down with the window.
template <typename T, typename Acc>
class Band {
 public:
  // Samples of up to 16 bits are summed as unsigned ones: a constant shift of all samples shifts
  // the mean by as much, and an even one keeps the ties.
  static constexpr bool kFlips = std::is_signed_v<T> && std::is_integral_v<T> && sizeof(T) < 4;
  using Stored = typename StoredSample<T>::Type;

  Band(const AverageJob<T>& job, std::byte* scratch)
      : job_(job),
        rows_(AverageScratch<Stored>::Take(AverageShape::Of(job), scratch)),
        pattern_(BoundPattern<T>::Of(job, rows_.pattern)) {}

  HWY_ATTR void Run(std::ptrdiff_t begin, std::ptrdiff_t end) {
    if (begin == end) return;
    for (std::ptrdiff_t r = begin - job_.half; r < begin + job_.half; ++r) Enter(r);
    for (std::ptrdiff_t y = begin; y < end; ++y) {
      Enter(y + job_.half);
      SumColumns();
      SumWindows();
      BoundAndWrite(y);
    }
  }

 private:
  const AverageShape& Shape() const { return rows_.shape; }
  // The rows of the window from the top, and before them the one that has just left it.
  const WindowRow<Stored>& Leaving() const { return rows_.window[0]; }
  const WindowRow<Stored>* Window() const { return rows_.window + 1; }
  const WindowRow<Stored>& Entering() const { return rows_.window[Shape().taps]; }
  const WindowRow<Stored>& Centre() const { return rows_.window[1 + job_.half]; }

  // Moves the window down by one row: copies an input row, with excluded pixels zeroed and flagged.
  HWY_ATTR void Enter(std::ptrdiff_t y) {
    const AverageShape& shape = Shape();
    std::rotate(rows_.window, rows_.window + 1, rows_.window + shape.slots);
    WindowRow<Stored>& row = rows_.window[shape.taps];
    T* const raw = reinterpret_cast<T*>(row.samples);
    std::memcpy(raw, job_.input.Pixel(-job_.half, y), shape.samples * sizeof(T));
    std::memset(raw + shape.samples, 0, kVectorBytes);  // for the range
    row.dirty = Flag(raw, row.flags, y);
    dirtyRows_ += (row.dirty ? 1 : 0) - (Leaving().dirty ? 1 : 0);
    if constexpr (kFlips) FlipSign(raw, shape.samples);
    if (row.dirty) ZeroFlagged(row.samples, shape.pixels, shape.channels, row.flags);
    row.range = RangeOf(row.samples, shape.samples);
  }

  // Sets a byte for every excluded pixel of an input row, and tells whether there is any.
  HWY_ATTR bool Flag(const T* raw, std::uint8_t* flags, std::ptrdiff_t y) {
    const AverageShape& shape = Shape();
    const WindowRules<T>& rules = job_.rules;
    const std::uint8_t* mask = nullptr;
    if (rules.mask() != nullptr) {
      std::memcpy(rows_.bytes, job_.mask.Pixel(-job_.half, y), shape.pixels);
      mask = rows_.bytes;
    }
    return FlagExcluded(raw, shape.pixels, shape.channels,
                        rules.HasInputNoData() ? rules.inputNoData().data() : nullptr,
                        rules.HasBackground() ? rules.background().data() : nullptr, mask, flags);
  }

  // Whether the samples of the window's rows, and of the leaving one if asked, add up exactly in
  // any order.
  bool Exact(bool withLeaving) const {
    if constexpr (!std::is_same_v<Acc, double>) return true;
    const std::uint64_t taps = Shape().taps;
    RowRange range;
    for (std::size_t r = withLeaving ? 0 : 1; r <= taps; ++r) range.Include(rows_.window[r].range);
    return range.SumsAreExact(taps * (taps + 1));
  }

  // Brings the sums of each column down to the window's rows, if they are exact.
  HWY_ATTR void SumColumns() {
    const AverageShape& shape = Shape();
    Acc* const columns = rows_.template Row<Acc>(rows_.columns);
    if (columnsReady_ && Exact(true)) {
      SlideColumns(columns, Entering().samples, Leaving().samples, shape.samples);
    } else if ((columnsReady_ = Exact(false))) {
      std::fill_n(columns, shape.samples + kRowPadding, Acc{0});
      for (std::size_t r = 0; r < shape.taps; ++r) {
        AddColumns(columns, Window()[r].samples, shape.samples);
      }
    }
  }

  // Fills `means` with the means around the pixels of the centre row.
  HWY_ATTR void SumWindows() {
    const AverageShape& shape = Shape();
    Acc* const columns = rows_.template Row<Acc>(rows_.columns);
    Acc* const powers = rows_.template Row<Acc>(rows_.powers);
    Acc* const sums = rows_.template Row<Acc>(rows_.sums);
    if (columnsReady_) {
      WindowSums(columns, shape.taps, shape.channels, shape.outputs, powers, sums);
    } else if constexpr (std::is_same_v<Acc, double>) {
      OrderedSums(Window(), shape.taps, shape.channels, shape.outputs, sums);
    }
    Divide(sums, CountExcluded());
  }

  // How many pixels of each window are excluded, once for each output sample; null when none is.
  HWY_ATTR const Acc* CountExcluded() {
    const AverageShape& shape = Shape();
    Acc* const columns = rows_.template Row<Acc>(rows_.excludedColumns);
    if (!countsReady_) {
      std::fill_n(columns, shape.pixels + kRowPadding, Acc{0});
      for (std::size_t r = 0; r < shape.taps; ++r) {
        AddColumns(columns, Window()[r].flags, shape.pixels);
      }
      countsReady_ = true;
    } else if (Entering().dirty || Leaving().dirty) {
      SlideColumns(columns, Entering().flags, Leaving().flags, shape.pixels);
    }
    if (dirtyRows_ == 0) return nullptr;
    Acc* const powers = rows_.template Row<Acc>(rows_.powers);
    Acc* const counts = rows_.template Row<Acc>(rows_.counts);
    const std::size_t width = shape.outputs / shape.channels;
    WindowSums(columns, shape.taps, std::size_t{1}, width, powers, counts);
    if (shape.channels == 1) return counts;
    RepeatForChannels(counts, width, shape.channels, powers);
    return powers;
  }

  HWY_ATTR void Divide(const Acc* sums, const Acc* excluded) {
    const AverageShape& shape = Shape();
    const std::uint64_t whole = shape.taps * shape.taps;
    if constexpr (std::is_same_v<Acc, std::uint16_t>) {
      if (excluded == nullptr && shape.reciprocal.exact) {
        DivideByReciprocal(sums, shape.reciprocal, shape.outputs, rows_.means);
      } else {
        DivideAsFloat(sums, excluded, whole, shape.outputs, rows_.means);
      }
    } else if constexpr (std::is_same_v<Acc, std::int32_t>) {
      if (shape.floatDivides) {
        DivideAsFloat(sums, excluded, whole, shape.outputs, rows_.means);
      } else {
        DivideAsDouble(sums, excluded, whole, shape.outputs, rows_.means);
      }
    } else {
      DivideAsDouble(sums, excluded, whole, shape.outputs, rows_.means);
    }
  }

  HWY_ATTR void BoundAndWrite(std::ptrdiff_t y) {
    const AverageShape& shape = Shape();
    if constexpr (kFlips) FlipSign(reinterpret_cast<T*>(rows_.means), shape.outputs);
    T* const means = reinterpret_cast<T*>(rows_.means);
    if (pattern_.active) BoundMeans(pattern_, shape.outputs, means);
    T* const out = job_.output.Pixel(0, y);
    if (!Centre().dirty) {
      std::memcpy(out, means, shape.outputs * sizeof(T));
    } else if (shape.channels == 1) {
      MergeRow(y, means, out);
    } else {
      MergeRuns(y, means, out);
    }
  }

  // Single channel: chooses between mean, no-data, background and the old value, lane by lane.
  HWY_ATTR void MergeRow(std::ptrdiff_t y, T* HWY_RESTRICT means, T* HWY_RESTRICT out) {
    const WindowRules<T>& rules = job_.rules;
    const std::size_t width = Shape().outputs;
    T* const centre = reinterpret_cast<T*>(rows_.centre);
    T* const old = reinterpret_cast<T*>(rows_.old);
    std::memcpy(centre, job_.input.Pixel(0, y), width * sizeof(T));
    std::memcpy(old, out, width * sizeof(T));
    std::memset(rows_.bytes, 1, width);
    if (rules.mask() != nullptr) std::memcpy(rows_.bytes, job_.mask.Pixel(0, y), width);
    const hn::ScalableTag<T> d;
    for (std::size_t i = 0; i < width; i += hn::Lanes(d)) {
      const auto pixel = hn::LoadU(d, centre + i);
      const auto kept = hn::LoadU(d, old + i);
      auto v = hn::LoadU(d, means + i);
      if (rules.HasBackground()) {
        const auto background = hn::Set(d, rules.background()[0]);
        v = hn::IfThenElse(hn::Eq(pixel, background), background, v);
      }
      if (rules.HasInputNoData()) {
        const auto is = hn::Eq(pixel, hn::Set(d, rules.inputNoData()[0]));
        const auto written = rules.HasOutputNoData() ? hn::Set(d, rules.outputNoData()[0]) : kept;
        v = hn::IfThenElse(is, written, v);
      }
      v = hn::IfThenElse(LoadFlags(d, rows_.bytes + i), v, kept);
      hn::StoreU(v, d, means + i);
    }
    std::memcpy(out, means, width * sizeof(T));
  }

  // Several channels: copies runs of computed pixels, and decides excluded ones one by one.
  HWY_ATTR void MergeRuns(std::ptrdiff_t y, const T* means, T* out) {
    const std::size_t channels = Shape().channels;
    const std::size_t width = Shape().outputs / channels;
    const std::uint8_t* const flags = Centre().flags + job_.half;
    for (std::size_t x = 0; x < width;) {
      const auto* const next =
          static_cast<const std::uint8_t*>(std::memchr(flags + x, 1, width - x));
      const std::size_t runEnd = next == nullptr ? width : static_cast<std::size_t>(next - flags);
      std::memcpy(out + x * channels, means + x * channels, (runEnd - x) * channels * sizeof(T));
      for (x = runEnd; x < width && flags[x] != 0; ++x) {
        const Exclusion reason = job_.Classify(static_cast<std::ptrdiff_t>(x), y);
        job_.rules.WriteExcluded(reason, out + x * channels);
      }
    }
  }

  const AverageJob<T>& job_;
  AverageScratch<Stored> rows_;
  BoundPattern<T> pattern_;
  std::ptrdiff_t dirtyRows_ = 0;  // of the window
  bool columnsReady_ = false;     // the column sums hold the window's rows
  bool countsReady_ = false;
};

template <typename T>
HWY_ATTR void RunBand(const AverageJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end,
                      std::byte* scratch) {
#if HWY_TARGET == HWY_SCALAR || HWY_TARGET == HWY_EMU128
  // Emulated vectors would be slower than the definition.
  static_cast<void>(scratch);
  AverageRows(job, begin, end);
#else
  switch (AverageShape::Of(job).sum) {
    case SumType::kUInt16:
      if constexpr (sizeof(T) == 1) Band<T, std::uint16_t>(job, scratch).Run(begin, end);
      break;
    case SumType::kInt32:
      if constexpr (sizeof(T) <= 2) Band<T, std::int32_t>(job, scratch).Run(begin, end);
      break;
    case SumType::kDouble:
      Band<T, double>(job, scratch).Run(begin, end);
      break;
  }
#endif
}

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
  using Stored = typename StoredSample<T>::Type;
  return AverageScratch<Stored>::Bytes(AverageShape::Of(job));
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
