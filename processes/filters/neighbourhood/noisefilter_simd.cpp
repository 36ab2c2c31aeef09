// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/noisefilter_simd.h"

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <type_traits>

#include "processes/filters/neighbourhood/noisescratch.h"

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/neighbourhood/noisefilter_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
#include "processes/filters/neighbourhood/boxsums_simd.h"
#include "processes/filters/neighbourhood/windowstrip_simd.h"
#endif

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128

/// Samples as lanes of sums, and their squares.
template <class D, typename T>
HWY_INLINE hn::Vec<D> LoadSamples(D d, const T* from) {
  if constexpr (std::is_same_v<hn::TFromD<D>, double>) {
    return LoadDoubles(d, from);
  } else {
    return hn::PromoteTo(d, hn::LoadU(hn::Rebind<T, D>(), from));
  }
}
template <class D, typename T>
HWY_INLINE hn::Vec<D> LoadSquares(D d, const T* from) {
  if constexpr (std::is_same_v<hn::TFromD<D>, double>) {
    const auto v = LoadDoubles(d, from);
    return hn::Mul(v, v);
  } else {
    // (Squares of bytes fit 16 bits.)
    const hn::Rebind<std::uint16_t, D> d16;
    const auto v = hn::PromoteTo(d16, hn::LoadU(hn::Rebind<T, D>(), from));
    return hn::PromoteTo(d, hn::Mul(v, v));
  }
}

/// What adds samples up where `Acc` adds up their squares (for 16 bits, see `SlideSmall`).
template <typename Acc>
using SumFor = std::conditional_t<std::is_same_v<Acc, std::int32_t>, std::uint16_t, Acc>;
template <typename Acc>
using NoiseCountFor =
    std::conditional_t<std::is_same_v<Acc, std::int16_t>, std::uint16_t, CountFor<Acc>>;

/// sums[i] += added[i] - removed[i], or the same with squares; `removed` may be null.
template <bool kSquares, typename Acc, typename T>
HWY_ATTR void SlideSums(const T* HWY_RESTRICT added, const T* HWY_RESTRICT removed,
                        std::size_t samples, Acc* HWY_RESTRICT sums) {
  const hn::ScalableTag<Acc> d;
  const auto load = [&](const T* from) HWY_ATTR {
    if constexpr (kSquares) {
      return LoadSquares(d, from);
    } else {
      return LoadSamples(d, from);
    }
  };
  for (std::size_t i = 0; i < samples; i += hn::Lanes(d)) {
    auto sum = hn::Add(hn::LoadU(d, sums + i), load(added + i));
    if (removed != nullptr) sum = hn::Sub(sum, load(removed + i));
    hn::StoreU(sum, d, sums + i);
  }
}

/// The sums of the windows' samples and of their squares, row by row and each row from the left.
template <typename T>
HWY_ATTR void OrderedMoments(const T* const* rows, std::size_t taps, std::size_t step,
                             std::size_t count, double* HWY_RESTRICT sums,
                             double* HWY_RESTRICT squares) {
  const hn::ScalableTag<double> d;
  const std::size_t lanes = hn::Lanes(d);
  for (std::size_t i = 0; i < count; i += 2 * lanes) {
    auto sum0 = hn::Zero(d);
    auto sum1 = sum0;
    auto square0 = sum0;
    auto square1 = sum0;
    for (std::size_t r = 0; r < taps; ++r) {
      const T* from = rows[r] + i;
      for (std::size_t t = 0; t < taps; ++t, from += step) {
        const auto v0 = LoadDoubles(d, from);
        const auto v1 = LoadDoubles(d, from + lanes);
        sum0 = hn::Add(sum0, v0);
        sum1 = hn::Add(sum1, v1);
        square0 = hn::Add(square0, hn::Mul(v0, v0));
        square1 = hn::Add(square1, hn::Mul(v1, v1));
      }
    }
    hn::StoreU(sum0, d, sums + i);
    hn::StoreU(sum1, d, sums + i + lanes);
    hn::StoreU(square0, d, squares + i);
    hn::StoreU(square1, d, squares + i + lanes);
  }
}

/// The windows of a row of samples.
template <typename T, typename Acc>
struct Moments {
  const T* centre;
  const SumFor<Acc>* sums;
  const Acc* squares;
  const NoiseCountFor<Acc>* excluded;  ///< null: all of `window` samples count
  std::size_t window;
  std::size_t count;
};

template <class D, typename T, typename Acc>
HWY_INLINE hn::Vec<D> CountAt(D d, const Moments<T, Acc>& m, std::size_t i) {
  const auto window = hn::Set(d, static_cast<Acc>(m.window));
  return m.excluded == nullptr ? window : hn::Sub(window, LoadAs(d, m.excluded + i));
}

/// Flags the samples that the definition calls noise.
template <typename T>
HWY_ATTR void Judge(const Moments<T, double>& m, std::uint8_t* flags) {
  const hn::ScalableTag<double> d;
  for (std::size_t i = 0; i < m.count; i += hn::Lanes(d)) {
    const auto n = CountAt(d, m, i);
    const auto mean = hn::Div(hn::LoadU(d, m.sums + i), n);
    const auto spread = hn::Sub(hn::LoadU(d, m.squares + i), hn::Mul(hn::Mul(n, mean), mean));
    const auto deviation = hn::Sqrt(hn::Div(spread, hn::Sub(n, hn::Set(d, 1.0))));
    const auto bound = hn::Abs(hn::Add(hn::Mul(hn::Set(d, 1.5), deviation), mean));
    StoreFlags(d, hn::Gt(hn::Abs(LoadDoubles(d, m.centre + i)), bound), flags + i);
  }
}

// For samples that are never negative, v > 1.5 * deviation + mean says, without divisions and
// roots, v * n > S and 4 * (n - 1) * (n * v - S)^2 > 9 * n * (n * Q - S^2), with S and Q the sums
// of samples and of squares. Where the two sides are nearly equal, the rounding of the definition
// decides: then it is asked itself. The terms that could round here, and what rounds there, stay
// far below the width of that band, because n * v - S, unless it is 0, is at least 1.

template <typename T, typename Acc>
HWY_NOINLINE void JudgeOneByOne(const Moments<T, Acc>& m, std::size_t first, std::size_t count,
                                std::uint8_t* flags) {
  for (std::size_t i = first; i < std::min(first + count, m.count); ++i) {
    const std::size_t n = m.window - (m.excluded == nullptr ? 0 : m.excluded[i]);
    flags[i] = StandsOut(static_cast<double>(m.centre[i]), static_cast<double>(n),
                         static_cast<double>(m.sums[i]), static_cast<double>(m.squares[i]))
                   ? 1
                   : 0;
  }
}

/// The same as `Judge` for unsigned samples of up to 16 bits. The definition's variance is off by
/// no more than 2^-50 of the sum of squares, and the terms of the final comparison by 2^-52 of the
/// sample: with up to 4096 samples, that is less than 2^-21 of its distance to the mean.
template <typename T>
HWY_ATTR void JudgeSquares(const Moments<T, double>& m, std::uint8_t* flags) {
  const hn::ScalableTag<double> d;
  for (std::size_t i = 0; i < m.count; i += hn::Lanes(d)) {
    const auto n = CountAt(d, m, i);
    const auto sum = hn::LoadU(d, m.sums + i);
    const auto squares = hn::Mul(n, hn::LoadU(d, m.squares + i));
    const auto distance = hn::Sub(hn::Mul(n, LoadDoubles(d, m.centre + i)), sum);
    const auto weight = hn::Mul(n, hn::Set(d, 2.25));
    const auto allowed = hn::Mul(weight, hn::Sub(squares, hn::Mul(sum, sum)));
    const auto actual = hn::Mul(hn::Sub(n, hn::Set(d, 1.0)), hn::Mul(distance, distance));
    const auto band = hn::Add(hn::Mul(hn::Mul(weight, squares), hn::Set(d, 0x1p-50)),
                              hn::Mul(hn::Abs(allowed), hn::Set(d, 0x1p-20)));
    const auto excess = hn::Sub(actual, allowed);
    const auto isAbove = hn::Gt(distance, hn::Zero(d));
    StoreFlags(d, hn::And(isAbove, hn::Gt(excess, band)), flags + i);
    const auto doubtful = hn::And(isAbove, hn::Le(hn::Abs(excess), band));
    if (HWY_UNLIKELY(!hn::AllFalse(d, doubtful))) JudgeOneByOne(m, i, hn::Lanes(d), flags);
  }
}

/// The same in integers and single precision, for bytes. The definition's variance is off by less
/// than 2^-18 of itself.
template <typename T>
HWY_ATTR void JudgeSquares(const Moments<T, std::int32_t>& m, std::uint8_t* flags) {
  const hn::ScalableTag<std::int32_t> d;
  const hn::ScalableTag<float> df;
  for (std::size_t i = 0; i < m.count; i += hn::Lanes(d)) {
    const auto n = CountAt(d, m, i);
    const auto sum = LoadAs(d, m.sums + i);
    const auto variance = hn::Sub(hn::Mul(n, hn::LoadU(d, m.squares + i)), hn::Mul(sum, sum));
    const auto count = hn::ConvertTo(df, n);
    const auto sample = hn::ConvertTo(df, LoadSamples(d, m.centre + i));
    const auto distance = hn::Sub(hn::Mul(count, sample), hn::ConvertTo(df, sum));
    const auto allowed = hn::Mul(hn::Mul(count, hn::Set(df, 2.25F)), hn::ConvertTo(df, variance));
    const auto actual = hn::Mul(hn::Sub(count, hn::Set(df, 1.0F)), hn::Mul(distance, distance));
    const auto band = hn::Mul(allowed, hn::Set(df, 0x1p-16F));
    const auto excess = hn::Sub(actual, allowed);
    const auto isAbove = hn::Gt(distance, hn::Zero(df));
    StoreFlags(df, hn::And(isAbove, hn::Gt(excess, band)), flags + i);
    const auto doubtful = hn::And(isAbove, hn::Le(hn::Abs(excess), band));
    if (HWY_UNLIKELY(!hn::AllFalse(df, doubtful))) JudgeOneByOne(m, i, hn::Lanes(d), flags);
  }
}

// Bytes in windows of up to five by five. What is judged does not change when all samples are less
// by the same amount, so they are taken as v = byte - 128, and then all that is summed up by
// columns fits 16 bits: v itself, and in place of its square the triangular number v * (v - 1) / 2,
// which is from 0 to 8256, less the middle of that range. An excluded sample is one of 128 and adds
// nothing.

constexpr int kSmallMiddle = 128;
constexpr int kTriangleMiddle = 4128;

/// Moves the sums of columns down by one row; `removed` may be null.
HWY_ATTR inline void SlideSmall(const std::uint8_t* HWY_RESTRICT added,
                                const std::uint8_t* HWY_RESTRICT removed, std::size_t samples,
                                std::int16_t* HWY_RESTRICT sums,
                                std::int16_t* HWY_RESTRICT triangles) {
  const hn::ScalableTag<std::int16_t> d;
  const auto middle = hn::Set(d, std::int16_t{kSmallMiddle});
  const auto twoMiddlesAndOne = hn::Set(d, std::int16_t{2 * kSmallMiddle + 1});
  for (std::size_t i = 0; i < samples; i += hn::Lanes(d)) {
    const auto in = LoadSamples(d, added + i);
    const auto out = removed == nullptr ? middle : LoadSamples(d, removed + i);
    const auto change = hn::Sub(in, out);
    // Twice the difference of two triangular numbers.
    const auto twice = hn::Mul(change, hn::Sub(hn::Add(in, out), twoMiddlesAndOne));
    hn::StoreU(hn::Add(hn::LoadU(d, sums + i), change), d, sums + i);
    hn::StoreU(hn::Add(hn::LoadU(d, triangles + i), hn::ShiftRight<1>(twice)), d, triangles + i);
  }
}

/// The windows of a row of samples.
struct SmallMoments {
  const std::uint8_t* centre;
  const std::int16_t* sums;       ///< of the columns, from the window's left on
  const std::int16_t* triangles;  ///< the same
  const std::uint16_t* excluded;  ///< null: all samples count
  std::size_t taps;
  std::size_t step;
  std::size_t count;
};

HWY_NOINLINE void JudgeSmallOneByOne(const SmallMoments& m, std::size_t first, std::size_t count,
                                     std::uint8_t* flags) {
  const auto window = static_cast<int>(m.taps * m.taps);
  for (std::size_t i = first; i < std::min(first + count, m.count); ++i) {
    const int n = window - (m.excluded == nullptr ? 0 : m.excluded[i]);
    int shifted = 0;
    int triangles = window * kTriangleMiddle;
    for (std::size_t t = 0; t < m.taps; ++t) {
      shifted += m.sums[i + t * m.step];
      triangles += m.triangles[i + t * m.step];
    }
    const int sum = shifted + kSmallMiddle * n;
    const int squares =
        2 * triangles + shifted + 2 * kSmallMiddle * shifted + kSmallMiddle * kSmallMiddle * n;
    flags[i] = StandsOut(m.centre[i], n, sum, squares) ? 1 : 0;
  }
}

/// The sums of the products of the two halves of each pair.
template <class D32, class V16>
HWY_INLINE hn::Vec<D32> PairProducts(D32 d, V16 a, V16 b) {
#if HWY_ARCH_X86
  auto unused = hn::Zero(d);
  return hn::ReorderWidenMulAccumulate(d, a, b, hn::Zero(d), unused);
#else
  const auto wideA = hn::BitCast(d, a);
  const auto wideB = hn::BitCast(d, b);
  const auto low = [&](auto v) HWY_ATTR { return hn::ShiftRight<16>(hn::ShiftLeft<16>(v)); };
  return hn::Add(hn::Mul(low(wideA), low(wideB)),
                 hn::Mul(hn::ShiftRight<16>(wideA), hn::ShiftRight<16>(wideB)));
#endif
}

/// Half of the windows of a vector, as pairs of 16 bits: the lower or the upper ones of each block,
/// so that `ReorderDemote2To` has them all in order again.
template <bool kUpper>
struct HalfBlocks {
  hn::ScalableTag<std::int16_t> d;
  hn::RepartitionToWide<decltype(d)> d32;
  hn::RepartitionToWide<hn::RebindToUnsigned<decltype(d)>> du32;
  using V = hn::Vec<hn::ScalableTag<std::int16_t>>;

  HWY_INLINE V Pairs(V first, V second) const {
    if constexpr (kUpper) return hn::InterleaveUpper(d, first, second);
    return hn::InterleaveLower(d, first, second);
  }
  /// From rows in memory.
  HWY_INLINE V Pairs(const std::int16_t* first, const std::int16_t* second) const {
    return Pairs(hn::LoadU(d, first), hn::LoadU(d, second));
  }
  /// The same pair everywhere.
  HWY_INLINE V Pair(int first, int second) const {
    return hn::OddEven(hn::Set(d, static_cast<std::int16_t>(second)),
                       hn::Set(d, static_cast<std::int16_t>(first)));
  }
};

/// The rule 4 * (n - 1) * (n * v - S)^2 > 9 * n * (n * Q - S^2) where all of n = kTaps^2 samples
/// count, divided by what both sides share, with Q = 2 * triangles + S. All of it fits 32 bits.
template <std::size_t kTaps>
struct SmallRule {
  static constexpr int kWindow = kTaps * kTaps;
  static constexpr int kShared = kTaps == 5 ? 3 : 1;
  static constexpr int kActual = 4 * (kWindow - 1) / kShared;
  static constexpr int kAllowed = 9 * kWindow / kShared;
  static_assert(kActual == 32, "eight times the product of what fits 16 bits");
  static constexpr int kTriangles = 2 * kAllowed * kWindow;

  /// By how much the windows exceed the bound; `distance` is n * v - S, at least 0.
  template <class Half, class V>
  static HWY_INLINE auto Excess(const Half& half, V distance, V sum, const std::int16_t* triangles,
                                std::size_t step) {
    const auto& d = half.d;
    const auto& d32 = half.d32;
    const V moments = half.Pairs(distance, sum);
    const auto squares =
        PairProducts(d32, moments, hn::Mul(moments, half.Pair(kActual / 8, kAllowed / 8)));
    const V rest = half.Pairs(sum, hn::LoadU(d, triangles + (kTaps - 1) * step));
    const V factors = hn::Add(hn::Mul(rest, half.Pair(kAllowed % 8, 0)),
                              half.Pair(-kAllowed * kWindow, -kTriangles));
    auto excess = hn::Add(PairProducts(d32, rest, factors), hn::ShiftLeft<3>(squares));
    for (std::size_t t = 0; t + 1 < kTaps; t += 2) {
      const std::int16_t* const at = triangles + t * step;
      excess = hn::Add(excess, PairProducts(d32, half.Pairs(at, at + step),
                                            half.Pair(-kTriangles, -kTriangles)));
    }
    return hn::Sub(excess, hn::Set(d32, kTriangles * kWindow * kTriangleMiddle));
  }
};

/// The sign of that for any number n of samples.
template <std::size_t kTaps, class Half, class V>
HWY_INLINE auto SignOfExcess(const Half& half, V n, V distance, V sum,
                             const std::int16_t* triangles, std::size_t step) {
  const auto& d = half.d;
  const auto& d32 = half.d32;
  const auto& du32 = half.du32;
  const V zero = hn::Zero(d);
  const V one = hn::Set(d, 1);
  const auto wide = [&](V v) HWY_ATTR {
    return hn::BitCast(du32, PairProducts(d32, half.Pairs(v, zero), one));
  };
  const auto square = [&](V v) HWY_ATTR {
    return hn::BitCast(du32, PairProducts(d32, half.Pairs(v, zero), half.Pairs(v, zero)));
  };
  const V last = hn::LoadU(d, triangles + (kTaps - 1) * step);
  auto all = hn::Add(PairProducts(d32, half.Pairs(zero, last), one),
                     hn::Set(d32, static_cast<int>(kTaps * kTaps) * kTriangleMiddle));
  for (std::size_t t = 0; t + 1 < kTaps; t += 2) {
    const std::int16_t* const at = triangles + t * step;
    all = hn::Add(all, PairProducts(d32, half.Pairs(at, at + step), one));
  }
  const auto count = wide(n);
  const auto squares = hn::Add(hn::ShiftLeft<1>(hn::BitCast(du32, all)), wide(sum));
  const auto spread = hn::Sub(hn::Mul(count, squares), square(sum));
  const auto allowed = hn::Mul(hn::Mul(count, hn::Set(du32, 9)), spread);
  const auto actual = hn::Mul(hn::Sub(hn::ShiftLeft<2>(count), hn::Set(du32, 4)), square(distance));
  const auto sign = hn::IfThenElse(hn::RebindMask(d32, hn::Gt(actual, allowed)), hn::Set(d32, 1),
                                   hn::Set(d32, -1));
  return hn::IfThenElse(hn::RebindMask(d32, hn::Eq(actual, allowed)), hn::Zero(d32), sign);
}

/// Flags the samples that the definition calls noise. All numbers are exact, and the definition
/// errs by far less than any two different sides are apart: only where they are equal it is asked
/// itself.
template <std::size_t kTaps, bool kHoles>
HWY_ATTR void JudgeSmall(const SmallMoments& m, std::uint8_t* flags) {
  const hn::ScalableTag<std::int16_t> d;
  const HalfBlocks<false> lower;
  const HalfBlocks<true> upper;
  const hn::Rebind<std::uint8_t, decltype(d)> d8;
  const auto middle = hn::Set(d, std::int16_t{kSmallMiddle});
  for (std::size_t i = 0; i < m.count; i += hn::Lanes(d)) {
    auto sum = hn::LoadU(d, m.sums + i);
    for (std::size_t t = 1; t < kTaps; ++t) {
      sum = hn::Add(sum, hn::LoadU(d, m.sums + i + t * m.step));
    }
    auto n = hn::Set(d, static_cast<std::int16_t>(kTaps * kTaps));
    if constexpr (kHoles) {
      n = hn::Sub(n, hn::LoadU(d, reinterpret_cast<const std::int16_t*>(m.excluded) + i));
    }
    const auto v = hn::Sub(LoadSamples(d, m.centre + i), middle);
    const auto distance = hn::Max(hn::Sub(hn::Mul(n, v), sum), hn::Zero(d));
    const std::int16_t* const triangles = m.triangles + i;
    const auto excess = [&](const auto& half) HWY_ATTR {
      if constexpr (kHoles) {
        return SignOfExcess<kTaps>(half, n, distance, sum, triangles, m.step);
      } else {
        return SmallRule<kTaps>::Excess(half, distance, sum, triangles, m.step);
      }
    };
    // (Saturation keeps signs and zeros.)
    const auto signs = hn::ReorderDemote2To(d, excess(lower), excess(upper));
    hn::StoreU(hn::DemoteTo(d8, signs), d8, flags + i);
    const auto doubtful = hn::And(hn::Eq(signs, hn::Zero(d)), hn::Gt(distance, hn::Zero(d)));
    if (HWY_UNLIKELY(!hn::AllFalse(d, doubtful))) JudgeSmallOneByOne(m, i, hn::Lanes(d), flags);
  }
}

template <std::size_t kTaps>
HWY_ATTR void JudgeSmall(const SmallMoments& m, std::uint8_t* flags) {
  m.excluded == nullptr ? JudgeSmall<kTaps, false>(m, flags) : JudgeSmall<kTaps, true>(m, flags);
}

HWY_ATTR inline void JudgeSmall(const SmallMoments& m, std::uint8_t* flags) {
  m.taps == 3 ? JudgeSmall<3>(m, flags) : JudgeSmall<5>(m, flags);
}

/// One strip of columns in one band of rows, as the average filter has it: each row is looked at
/// once as it enters, and sums of columns gain the entering row and lose the leaving one.
template <typename T, typename Acc>
class NoiseStrip {
 public:
  using Count = NoiseCountFor<Acc>;
  using Sum = SumFor<Acc>;
  static constexpr bool kSmall = std::is_same_v<Acc, std::int16_t>;
  static constexpr T kNeutral = static_cast<T>(kSmall ? kSmallMiddle : 0);

  NoiseStrip(const NoiseJob<T>& job, const NoisePlan& plan, const NoiseScratch<T>& scratch,
             std::ptrdiff_t firstColumn)
      : half_(job.half),
        removed_(job.removed),
        plan_(plan),
        scratch_(scratch),
        strip_(job, scratch.strip, firstColumn, plan.strip) {
    for (std::size_t slot = 0; slot <= plan.taps; ++slot) scratch_.ring[slot].dirty = false;
  }

  HWY_ATTR void Run(std::ptrdiff_t begin, std::ptrdiff_t end) {
    for (std::ptrdiff_t y = begin - half_; y < begin + half_; ++y) Enter(y);
    for (std::ptrdiff_t y = begin; y < end; ++y) {
      Enter(y + half_);
      SumColumns();
      FilterRow(y);
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
  static U* Row(double* row) {
    return reinterpret_cast<U*>(row);
  }

  HWY_ATTR void Enter(std::ptrdiff_t y) {
    WindowRow<T>& row = scratch_.ring[oldest_];
    oldest_ = oldest_ == plan_.taps ? 0 : oldest_ + 1;
    const T* const input = strip_.WindowRow(y, row.ownSamples);
    const ExclusionTests<T> tests = strip_.Tests(y);
    strip_.PrefetchRow(y + 1);
    row.dirty = tests.Any() && AnyExcluded(input, plan_.Pixels(), plan_.channels, tests);
    if (row.dirty) {
      CopyUnexcluded(input, plan_.Pixels(), plan_.channels, tests, kNeutral, row.ownSamples,
                     row.ownFlags);
    }
    row.samples = row.dirty ? row.ownSamples : input;
    row.flags = row.dirty ? row.ownFlags : scratch_.clean;
    if constexpr (std::is_same_v<Acc, double>) {
      row.range = RangeOf(row.samples, plan_.Samples()).OfSquares();
    }
    dirtyRows_ += (row.dirty ? 1 : 0) - (Leaving().dirty ? 1 : 0);
  }

  // Whether the squares of the samples of the window's rows, and of the leaving one if asked, add
  // up exactly in any order; then so do the samples.
  bool Exact(bool withLeaving) const {
    if constexpr (!std::is_same_v<Acc, double>) return true;
    RowRange range;
    for (std::size_t r = withLeaving ? 0 : 1; r <= plan_.taps; ++r) range.Include(Held(r).range);
    return range.SumsAreExact(plan_.Window() + plan_.taps);
  }

  HWY_ATTR void SumColumns() {
    auto* const sums = Row<Sum>(scratch_.columns);
    Acc* const squares = Row(scratch_.squareColumns);
    const std::size_t samples = plan_.Samples();
    const auto slide = [&](const T* added, const T* removed) HWY_ATTR {
      if constexpr (kSmall) {
        SlideSmall(added, removed, samples, sums, squares);
      } else {
        SlideSums<false>(added, removed, samples, sums);
        SlideSums<true>(added, removed, samples, squares);
      }
    };
    if (columnsReady_ && Exact(true)) {
      slide(Entering().samples, Leaving().samples);
    } else if ((columnsReady_ = Exact(false))) {
      std::fill_n(sums, samples + kRowPadding, Sum{0});
      const int begin = kSmall ? -kTriangleMiddle * static_cast<int>(plan_.taps) : 0;
      std::fill_n(squares, samples + kRowPadding, static_cast<Acc>(begin));
      for (std::size_t r = 0; r < plan_.taps; ++r) slide(Window(r).samples, nullptr);
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
  HWY_ATTR void FilterRow(std::ptrdiff_t y) {
    const T* const centre = Centre().samples + plan_.taps / 2 * plan_.channels;
    const Moments<T, Acc> moments{centre,          Row<Sum>(scratch_.sums), Row(scratch_.squares),
                                  CountExcluded(), plan_.Window(),          plan_.Outputs()};
    SumWindows();
    if constexpr (kSmall) {
      JudgeSmall(SmallMoments{centre, Row<Sum>(scratch_.columns), Row(scratch_.squareColumns),
                              moments.excluded, plan_.taps, plan_.channels, plan_.Outputs()},
                 scratch_.noise);
    } else if (plan_.compares) {
      if constexpr (std::is_same_v<T, std::uint8_t> || std::is_same_v<T, std::uint16_t>) {
        JudgeSquares(moments, scratch_.noise);
      }
    } else if constexpr (std::is_same_v<Acc, double>) {
      Judge(moments, scratch_.noise);
    }
    const hn::ScalableTag<T> d;
    const std::size_t lanes = hn::Lanes(d);
    const auto removed = hn::Set(d, removed_);
    const std::uint8_t* const isolated =
        plan_.channels == 1 ? scratch_.isolated : scratch_.isolatedSamples;
    const bool anyIsolated = dirtyRows_ != 0;
    const auto result = [&](std::size_t i) HWY_ATTR {
      auto isNoise = LoadFlags(d, scratch_.noise + i);
      if (anyIsolated) isNoise = hn::Or(isNoise, LoadFlags(d, isolated + i));
      return hn::IfThenElse(isNoise, removed, hn::LoadU(d, centre + i));
    };
    if (!Centre().dirty) {
      T* const output = strip_.Output(y);
      std::size_t i = 0;
      for (; i + lanes <= plan_.Outputs(); i += lanes) hn::StoreU(result(i), d, output + i);
      hn::StoreU(result(i), d, scratch_.results);
      std::memcpy(output + i, scratch_.results, (plan_.Outputs() - i) * sizeof(T));
      return;
    }
    for (std::size_t i = 0; i < plan_.Outputs(); i += lanes) {
      hn::StoreU(result(i), d, scratch_.results + i);
    }
    const std::uint8_t* const flags = Centre().flags + half_;
    strip_.Merge(y, scratch_.results, [&](std::size_t x) { return flags[x] != 0; });
  }

  HWY_ATTR void SumWindows() {
    if constexpr (kSmall) {
      // (`JudgeSmall` takes the columns.)
    } else if (columnsReady_) {
      WindowSums(Row<Sum>(scratch_.columns), plan_.taps, plan_.channels, plan_.Outputs(),
                 Row<Sum>(scratch_.levels), scratch_.pitch, Stores<Sum>{Row<Sum>(scratch_.sums)});
      WindowSums(Row(scratch_.squareColumns), plan_.taps, plan_.channels, plan_.Outputs(),
                 Row(scratch_.levels), scratch_.pitch, Stores<Acc>{Row(scratch_.squares)});
    } else if constexpr (std::is_same_v<Acc, double>) {
      for (std::size_t r = 0; r < plan_.taps; ++r) scratch_.ordered[r] = Window(r).samples;
      OrderedMoments(scratch_.ordered, plan_.taps, plan_.channels, plan_.Outputs(), scratch_.sums,
                     scratch_.squares);
    }
  }

  // How many pixels of each window are excluded, once for each output sample, and which windows
  // have too few left; null when none is excluded.
  HWY_ATTR const Count* CountExcluded() {
    if (dirtyRows_ == 0) return nullptr;
    auto* const perPixel = Row<Count>(scratch_.excluded);
    WindowSums(Row<Count>(scratch_.excludedColumns), plan_.taps, 1, plan_.strip,
               Row<Count>(scratch_.levels), scratch_.pitch, Stores<Count>{perPixel});
    FlagIsolated(perPixel);
    if (plan_.channels == 1) return perPixel;
    RepeatForChannels(scratch_.isolated, plan_.strip, plan_.channels, scratch_.isolatedSamples);
    auto* const perSample = Row<Count>(scratch_.excludedSamples);
    RepeatForChannels(perPixel, plan_.strip, plan_.channels, perSample);
    return perSample;
  }

  HWY_ATTR void FlagIsolated(const Count* excluded) {
    const std::uint8_t* rows[3];
    for (std::size_t r = 0; r < 3; ++r) rows[r] = Window(plan_.taps / 2 - 1 + r).flags;
    const hn::ScalableTag<std::uint8_t> d8;
    for (std::size_t i = 0; i < plan_.Pixels(); i += hn::Lanes(d8)) {
      const auto two = hn::Add(hn::LoadU(d8, rows[0] + i), hn::LoadU(d8, rows[1] + i));
      hn::StoreU(hn::Add(two, hn::LoadU(d8, rows[2] + i)), d8, scratch_.coreColumns + i);
    }
    const hn::ScalableTag<Count> d;
    const std::uint8_t* const core = scratch_.coreColumns + plan_.taps / 2 - 1;
    // One more than may be missing.
    const auto most = hn::Set(d, static_cast<Count>(plan_.Window() - kLeastInWindow + 1));
    const auto mostInCore = hn::Set(d, static_cast<Count>(9 - kLeastInCore + 1));
    for (std::size_t i = 0; i < plan_.strip; i += hn::Lanes(d)) {
      const auto missing = hn::LoadU(d, excluded + i);
      const auto two = hn::Add(LoadAs(d, core + i), LoadAs(d, core + i + 1));
      const auto missingInCore = hn::Add(two, LoadAs(d, core + i + 2));
      const auto isIsolated = hn::Or(hn::Eq(hn::Max(missing, most), missing),
                                     hn::Eq(hn::Max(missingInCore, mostInCore), missingInCore));
      StoreFlags(d, isIsolated, scratch_.isolated + i);
    }
  }

  const std::ptrdiff_t half_;
  const T removed_;
  const NoisePlan& plan_;
  const NoiseScratch<T>& scratch_;
  const WindowStrip<T> strip_;
  std::size_t oldest_ = 0;        // slot of the row that has just left the window
  std::ptrdiff_t dirtyRows_ = 0;  // of the window
  bool columnsReady_ = false;     // the column sums hold the window's rows
  bool countsReady_ = false;
};

template <typename T, typename Acc>
HWY_ATTR void RunStrips(const NoiseJob<T>& job, const NoisePlan& plan, std::ptrdiff_t begin,
                        std::ptrdiff_t end, std::byte* memory) {
  ScratchCutter cutter(memory);
  const NoiseScratch<T> scratch = NoiseScratch<T>::Cut(plan, false, cutter);
  std::fill_n(scratch.clean, plan.Pixels() + kRowPadding, std::uint8_t{0});
  const auto width = static_cast<std::size_t>(job.output.Width());
  for (std::size_t x = 0; x < width; x += plan.strip) {
    NoisePlan own = plan;
    own.strip = std::min(plan.strip, width - x);
    NoiseStrip<T, Acc>(job, own, scratch, static_cast<std::ptrdiff_t>(x)).Run(begin, end);
  }
}

template <typename T>
HWY_ATTR void RunBand(const NoiseJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end,
                      std::byte* memory) {
  const NoisePlan plan = NoisePlan::Of(job);
  // (A window of one pixel has no neighbours: everything goes.)
  if (plan.taps == 1) return NoiseRows(job, begin, end);
  if (begin == end || plan.Outputs() == 0) return;
  if constexpr (std::is_same_v<T, std::uint8_t>) {
    if (plan.small) return RunStrips<T, std::int16_t>(job, plan, begin, end, memory);
    if (plan.integers) return RunStrips<T, std::int32_t>(job, plan, begin, end, memory);
  }
  RunStrips<T, double>(job, plan, begin, end, memory);
}

#else

// Emulated vectors would be slower than the definition.
template <typename T>
void RunBand(const NoiseJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end, std::byte*) {
  NoiseRows(job, begin, end);
}

#endif

// The dispatch table holds plain functions: one entry per sample type.
#define ZARN_SAMPLE_TYPES(macro)                                                         \
  macro(UInt8, std::uint8_t) macro(Int8, std::int8_t) macro(UInt16, std::uint16_t)       \
      macro(Int16, std::int16_t) macro(UInt32, std::uint32_t) macro(Int32, std::int32_t) \
          macro(Float32, float) macro(Float64, double)
#define ZARN_RUN_BAND(name, T)                                                     \
  void Run##name(const NoiseJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end, \
                 std::byte* scratch) {                                             \
    RunBand(job, begin, end, scratch);                                             \
  }
ZARN_SAMPLE_TYPES(ZARN_RUN_BAND)
#undef ZARN_RUN_BAND

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {

template <typename T>
std::size_t NoiseScratchBytes(const NoiseJob<T>& job) {
  ScratchCutter cutter(nullptr);
  NoiseScratch<T>::Cut(NoisePlan::Of(job), true, cutter);
  return cutter.Size();
}

// Explicit specialisations are exported unless told otherwise.
#define ZARN_ENTRY(name, T)                                                                   \
  HWY_EXPORT(Run##name);                                                                      \
  template std::size_t NoiseScratchBytes(const NoiseJob<T>& job);                             \
  template <>                                                                                 \
  __attribute__((visibility("hidden"))) void NoiseRowsSimd(                                   \
      const NoiseJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end, std::byte* scratch) { \
    HWY_DYNAMIC_DISPATCH(Run##name)(job, begin, end, scratch);                                \
  }
ZARN_SAMPLE_TYPES(ZARN_ENTRY)

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
