// SPDX-License-Identifier: Apache-2.0

// From window sums to output samples, compiled once per vector target: see boxsums_simd.h for how
// to include it.

#if defined(ZARN_NEIGHBOURHOOD_AVERAGEMEANS_SIMD_H) == defined(HWY_TARGET_TOGGLE)
#ifdef ZARN_NEIGHBOURHOOD_AVERAGEMEANS_SIMD_H
#undef ZARN_NEIGHBOURHOOD_AVERAGEMEANS_SIMD_H
#else
#define ZARN_NEIGHBOURHOOD_AVERAGEMEANS_SIMD_H
#endif

#include <hwy/highway.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <type_traits>

#include "processes/filters/neighbourhood/averagescratch.h"
#include "processes/filters/neighbourhood/boxsums_simd.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

// What is wanted is the double nearest to sum / count, for integers rounded to the nearest, ties to
// even. A shorter computation may take its place where it provably decides the same: an integer
// quotient that is no tie keeps at least 1 / (2 * count) away from every tie, so any error below
// that is harmless; whole windows have an odd count and therefore no ties at all.

/// Output bounds and no-data avoidance that all channels share.
template <typename T>
struct UniformBounds {
  explicit UniformBounds(const BoundPattern<T>& pattern)
      : active(pattern.active && pattern.uniform) {
    if (!active) return;
    low = pattern.low[0];
    high = pattern.high[0];
    noData = pattern.noData[0];
    replacement = pattern.replacement[0];
  }

  template <class D>
  HWY_INLINE hn::Vec<D> operator()(D d, hn::Vec<D> v) const {
    return Bounded(d, v, hn::Set(d, low), hn::Set(d, high), hn::Set(d, noData),
                   hn::Set(d, replacement));
  }

  /// What the output converters do to a mean that already is a sample.
  template <class D, class V>
  static HWY_INLINE V Bounded(D d, V v, V low, V high, V noData, V replacement) {
    if constexpr (std::is_floating_point_v<T>) {
      v = hn::IfThenElse(hn::Lt(v, low), low, hn::IfThenElse(hn::Gt(v, high), high, v));
      // A wider tolerance covers the rounding of the difference.
      const auto distance = hn::Abs(hn::Sub(v, noData));
      if (HWY_LIKELY(hn::AllFalse(d, hn::Lt(distance, hn::Set(d, static_cast<T>(2e-5)))))) return v;
      return Avoided(d, v, noData, replacement);
    } else {
      v = hn::Min(hn::Max(v, low), high);
      return hn::IfThenElse(hn::Eq(v, noData), replacement, v);
    }
  }

  /// The exact test, lane by lane: it is rare.
  template <class D, class V>
  static HWY_NOINLINE V Avoided(D d, V v, V noData, V replacement) {
    HWY_ALIGN T values[HWY_MAX_BYTES / sizeof(T)];
    HWY_ALIGN T avoided[HWY_MAX_BYTES / sizeof(T)];
    HWY_ALIGN T replacements[HWY_MAX_BYTES / sizeof(T)];
    hn::Store(v, d, values);
    hn::Store(noData, d, avoided);
    hn::Store(replacement, d, replacements);
    for (std::size_t i = 0; i < hn::Lanes(d); ++i) {
      if (TouchesNoData(values[i], avoided[i])) values[i] = replacements[i];
    }
    return hn::Load(d, values);
  }

  bool active;
  T low{};
  T high{};
  T noData{};
  T replacement{};
};

/// Rounds floats from 0 to 2^22 to the nearest integer, ties to even, in the low bits of the
/// result: next to 1.5 * 2^23 the unit in the last place is 1.
template <class D, class V>
HWY_INLINE hn::Vec<D> RoundToLowBits(D d, V v) {
  return hn::BitCast(d, hn::Add(v, hn::Set(hn::RebindToFloat<D>(), 12582912.0F)));
}

/// Rounded quotients of 16-bit numbers, in the low bits of each lane.
template <class D>
HWY_INLINE hn::Vec<D> RoundedQuotients(D d, hn::Vec<D> sums, hn::Vec<D> counts) {
  const hn::RebindToSigned<D> di;
  const hn::RebindToFloat<D> df;
  const auto quotients =
      hn::Div(hn::ConvertTo(df, hn::BitCast(di, sums)), hn::ConvertTo(df, hn::BitCast(di, counts)));
  return RoundToLowBits(d, quotients);
}

/// Where the means of a row go: straight into the row, but for the vectors that would pass its end,
/// which `spill` takes.
template <typename T>
class MeanRow {
 public:
  MeanRow(T* row, T* spill, std::size_t length, const UniformBounds<T>& bounds)
      : row_(row), spill_(spill), length_(length), bounds_(bounds) {}

  /// For a vector of `lanes` sums at sample i; the same for all parts of the vector.
  T* Place(std::size_t i, std::size_t lanes) const {
    return (i + lanes <= length_ ? row_ : spill_) + i;
  }

  /// Stores lanes of the sample's width, bounded.
  template <class D, class V>
  HWY_INLINE void Store(D d, V v, T* to) const {
    hn::StoreU(bounds_.active ? bounds_(d, v) : v, d, to);
  }

  /// Stores unsigned lanes of up to 16 bits, shifted back for signed samples.
  template <class D, class V>
  HWY_INLINE void StoreUnsigned(D d, V v, T* to) const {
    if constexpr (kSumsShifted<T>) {
      const hn::Rebind<T, D> dt;
      const auto top = hn::Set(dt, std::numeric_limits<T>::min());
      Store(dt, hn::Xor(hn::BitCast(dt, v), top), to);
    } else {
      Store(d, v, to);
    }
  }

  /// Stores double lanes as samples; integers are rounded.
  template <class D, class V>
  HWY_INLINE void StoreDouble(D d, V mean, T* to) const {
    const hn::Rebind<T, D> dt;
    if constexpr (std::is_same_v<T, double>) {
      Store(dt, mean, to);
    } else if constexpr (std::is_same_v<T, float>) {
      Store(dt, hn::DemoteTo(dt, mean), to);
    } else {
      const hn::Rebind<std::int32_t, D> di;
      const auto rounded = hn::Round(mean);
      if constexpr (std::is_same_v<T, std::int32_t>) {
        Store(dt, hn::DemoteTo(di, rounded), to);
      } else if constexpr (std::is_same_v<T, std::uint32_t>) {
        const auto shifted = hn::DemoteTo(di, hn::Sub(rounded, hn::Set(d, 2147483648.0)));
        Store(dt, hn::Xor(hn::BitCast(dt, shifted), hn::Set(dt, 0x80000000U)), to);
      } else {
        const hn::Rebind<std::make_unsigned_t<T>, D> db;
        StoreUnsigned(db, hn::DemoteTo(db, hn::DemoteTo(di, rounded)), to);
      }
    }
  }

  /// Divides integer sums in single precision.
  template <class DI, class V>
  HWY_INLINE void StoreFloatQuotients(DI di, V sums, V counts, T* to) const {
    const hn::RebindToFloat<DI> d;
    StoreFloat(di, hn::Div(hn::ConvertTo(d, sums), hn::ConvertTo(d, counts)), to);
  }

  /// Rounds float lanes.
  template <class DI, class V>
  HWY_INLINE void StoreFloat(DI /*di*/, V mean, T* to) const {
    const hn::Rebind<std::make_unsigned_t<T>, DI> db;
    StoreUnsigned(db, hn::TruncateTo(db, RoundToLowBits(hn::RebindToUnsigned<DI>(), mean)), to);
  }

  /// Brings the spilled end of the row home; the sums came in vectors of `lanes`.
  void Finish(std::size_t lanes) const {
    const std::size_t begin = length_ - length_ % lanes;
    if (row_ != spill_) std::memcpy(row_ + begin, spill_ + begin, (length_ - begin) * sizeof(T));
  }

 private:
  T* row_;
  T* spill_;
  std::size_t length_;
  UniformBounds<T> bounds_;
};

/// The excluded samples of the windows from i on.
template <class D, typename Count>
HWY_INLINE hn::Vec<D> Missing(D d, const Count* excluded, std::size_t i) {
  return excluded == nullptr ? hn::Zero(d) : LoadAs(d, excluded + i);
}
template <class D, class V>
HWY_INLINE bool IsZero(D d, V v) {
  return hn::AllTrue(d, hn::Eq(v, hn::Zero(d)));
}

/// Takes the vectors of window sums, one kind per accumulator. The counts of excluded samples are
/// null where no window has any.
template <typename T, typename Acc>
class Means;

template <typename T>
class Means<T, std::uint16_t> {
 public:
  Means(const AveragePlan& plan, const std::uint8_t* excluded, const MeanRow<T>& row)
      : by_(plan.reciprocal),
        window_(static_cast<std::uint16_t>(plan.Window())),
        excluded_(excluded),
        row_(row) {}

  template <class D>
  HWY_INLINE void operator()(D d, hn::Vec<D> sums, std::size_t i) const {
    T* const to = row_.Place(i, hn::Lanes(d));
    const auto missing = Missing(d, excluded_, i);
    if (by_.exact && (excluded_ == nullptr || IsZero(d, missing))) {
      const hn::Rebind<std::uint8_t, D> d8;
      const auto product =
          hn::MulHigh(hn::Add(sums, hn::Set(d, by_.bias)), hn::Set(d, by_.multiplier));
      row_.StoreUnsigned(d8, hn::TruncateTo(d8, hn::ShiftRightSame(product, by_.shift)), to);
      return;
    }
    // Even and odd lanes apart, so that no lane changes its place.
    const auto counts = hn::Sub(hn::Set(d, window_), missing);
    const hn::RepartitionToWide<D> dw;
    const auto low = hn::Set(dw, 0xFFFF);
    const auto even = RoundedQuotients(dw, hn::And(hn::BitCast(dw, sums), low),
                                       hn::And(hn::BitCast(dw, counts), low));
    const auto odd = RoundedQuotients(dw, hn::ShiftRight<16>(hn::BitCast(dw, sums)),
                                      hn::ShiftRight<16>(hn::BitCast(dw, counts)));
    const auto rounded = hn::OddEven(hn::BitCast(d, hn::ShiftLeft<16>(odd)), hn::BitCast(d, even));
    const hn::Rebind<std::uint8_t, D> d8;
    row_.StoreUnsigned(d8, hn::TruncateTo(d8, rounded), to);
  }

 private:
  Reciprocal16 by_;
  std::uint16_t window_;
  const std::uint8_t* excluded_;
  MeanRow<T> row_;
};

template <typename T>
class Means<T, std::int32_t> {
 public:
  Means(const AveragePlan& plan, const std::uint16_t* excluded, const MeanRow<T>& row)
      : window_(static_cast<std::int32_t>(plan.Window())),
        floatMultiplies_(plan.floatMultiplies),
        floatDivides_(plan.floatDivides),
        doubleMultiplies_(plan.doubleMultiplies),
        excluded_(excluded),
        row_(row) {}

  template <class D>
  HWY_INLINE void operator()(D d, hn::Vec<D> sums, std::size_t i) const {
    T* const to = row_.Place(i, hn::Lanes(d));
    const auto missing = Missing(d, excluded_, i);
    const bool whole = excluded_ == nullptr || IsZero(d, missing);
    const auto counts = hn::Sub(hn::Set(d, window_), missing);
    if (whole && floatMultiplies_) {
      const hn::RebindToFloat<D> df;
      const auto factor = hn::Set(df, 1.0F / static_cast<float>(window_));
      row_.StoreFloat(d, hn::Mul(hn::ConvertTo(df, sums), factor), to);
    } else if (floatDivides_) {
      row_.StoreFloatQuotients(d, sums, counts, to);
    } else {
      const hn::Half<D> dh;
      StoreHalf(hn::LowerHalf(dh, sums), hn::LowerHalf(dh, counts), whole, to);
      StoreHalf(hn::UpperHalf(dh, sums), hn::UpperHalf(dh, counts), whole, to + hn::Lanes(dh));
    }
  }

 private:
  // Half a vector, in double precision.
  template <class V>
  HWY_INLINE void StoreHalf(V sums, V counts, bool whole, T* to) const {
    const hn::ScalableTag<double> d;
    const auto sum = hn::PromoteTo(d, sums);
    if (whole && doubleMultiplies_) {
      row_.StoreDouble(d, hn::Mul(sum, hn::Set(d, 1.0 / window_)), to);
    } else {
      row_.StoreDouble(d, hn::Div(sum, hn::PromoteTo(d, counts)), to);
    }
  }

  std::int32_t window_;
  bool floatMultiplies_;
  bool floatDivides_;
  bool doubleMultiplies_;
  const std::uint16_t* excluded_;
  MeanRow<T> row_;
};

template <typename T>
class Means<T, double> {
 public:
  Means(const AveragePlan& plan, const std::uint32_t* excluded, const MeanRow<T>& row)
      : window_(static_cast<double>(plan.Window())),
        doubleMultiplies_(plan.doubleMultiplies),
        excluded_(excluded),
        row_(row) {}

  template <class D>
  HWY_INLINE void operator()(D d, hn::Vec<D> sums, std::size_t i) const {
    T* const to = row_.Place(i, hn::Lanes(d));
    const auto missing = Missing(d, excluded_, i);
    const bool whole = excluded_ == nullptr || IsZero(d, missing);
    if (whole && !std::is_same_v<T, double>) {
      const auto product = hn::Mul(sums, hn::Set(d, 1.0 / window_));
      if (std::is_same_v<T, float> ? NarrowsSafely(d, product) : doubleMultiplies_) {
        row_.StoreDouble(d, product, to);
        return;
      }
    }
    row_.StoreDouble(d, hn::Div(sums, hn::Sub(hn::Set(d, window_), missing)), to);
  }

 private:
  // The product differs from the quotient by no more than two units in the last place. That can
  // change the float only where a midpoint of two floats is as near, or below the normal floats.
  template <class D>
  static HWY_INLINE bool NarrowsSafely(D d, hn::Vec<D> product) {
    const hn::RebindToUnsigned<D> du;
    constexpr std::uint64_t kMidpoint = std::uint64_t{1} << 28;
    const auto tail = hn::And(hn::BitCast(du, product), hn::Set(du, 2 * kMidpoint - 1));
    const auto distance = hn::Sub(tail, hn::Set(du, kMidpoint - 4));
    const auto near = hn::Lt(distance, hn::Set(du, 9));
    const auto tiny = hn::Lt(hn::Abs(product), hn::Set(d, 1.1754943508222875e-38));
    return hn::AllFalse(d, hn::Or(hn::RebindMask(d, near), tiny));
  }

  double window_;
  bool doubleMultiplies_;
  const std::uint32_t* excluded_;
  MeanRow<T> row_;
};

/// Bounds a row of means whose channels have constants of their own.
template <typename T>
HWY_ATTR void BoundMeans(const BoundPattern<T>& pattern, std::size_t samples, T* means) {
  const hn::ScalableTag<T> d;
  const std::size_t lanes = hn::Lanes(d);
  const std::size_t step = lanes % pattern.channels;
  std::size_t phase = 0;  // the channel of the vector's first sample
  for (std::size_t i = 0; i < samples; i += lanes) {
    const auto load = [&](const T* constants) HWY_ATTR { return hn::LoadU(d, constants + phase); };
    const auto v =
        UniformBounds<T>::Bounded(d, hn::LoadU(d, means + i), load(pattern.low), load(pattern.high),
                                  load(pattern.noData), load(pattern.replacement));
    hn::StoreU(v, d, means + i);
    phase += step;
    if (phase >= pattern.channels) phase -= pattern.channels;
  }
}

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#endif
