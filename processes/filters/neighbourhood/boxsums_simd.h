// SPDX-License-Identifier: Apache-2.0

// Row kernels of the square-window filters, compiled once per vector target. Include it only from a
// `_simd.cpp` that Highway's foreach_target.h compiles repeatedly, after hwy/highway.h.
//
// Rows are padded: every kernel may read up to kRowPadding elements past the length that it is
// given, and write as many past the end of scratch rows, so none has a scalar tail.

#if defined(ZARN_NEIGHBOURHOOD_BOXSUMS_SIMD_H) == defined(HWY_TARGET_TOGGLE)
#ifdef ZARN_NEIGHBOURHOOD_BOXSUMS_SIMD_H
#undef ZARN_NEIGHBOURHOOD_BOXSUMS_SIMD_H
#else
#define ZARN_NEIGHBOURHOOD_BOXSUMS_SIMD_H
#endif

#include <hwy/highway.h>

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <type_traits>

#include "processes/filters/framework/nodata.h"
#include "processes/filters/framework/pixelvectors_simd.h"
#include "processes/filters/neighbourhood/boxrows.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

/// Converts lanes to a wider type; up to 16 bits to double go by way of 32.
template <class D, class V>
HWY_INLINE hn::Vec<D> Widen([[maybe_unused]] D d, V v) {
  using From = hn::TFromV<V>;
  if constexpr (std::is_same_v<From, hn::TFromD<D>>) {
    return v;
  } else if constexpr (std::is_same_v<hn::TFromD<D>, double> && sizeof(From) < 4) {
    return hn::PromoteTo(d, hn::PromoteTo(hn::Rebind<std::int32_t, D>(), v));
  } else {
    return hn::PromoteTo(d, v);
  }
}

/// Loads samples as lanes of the accumulator type, small signed ones shifted (see kSumsShifted).
template <class D, typename T>
HWY_INLINE hn::Vec<D> LoadAs(D d, const T* from) {
  using Acc = hn::TFromD<D>;
  if constexpr (kSumsShifted<T>) {
    using Bits = std::make_unsigned_t<T>;
    const hn::Rebind<Bits, D> db;
    const auto top = hn::Set(db, static_cast<Bits>(Bits{1} << (8 * sizeof(T) - 1)));
    const auto v = hn::Xor(hn::LoadU(db, reinterpret_cast<const Bits*>(from)), top);
    return Widen(d, v);
  } else if constexpr (std::is_same_v<Acc, double>) {
    return LoadDoubles(d, from);
  } else {
    return Widen(d, hn::LoadU(hn::Rebind<T, D>(), from));
  }
}

/// The reasons for which a pixel of a row is excluded; null pointers switch a reason off.
template <typename T>
struct ExclusionTests {
  const T* noData;
  const T* background;
  const std::uint8_t* mask;  ///< of the row

  bool Any() const { return noData != nullptr || background != nullptr || mask != nullptr; }

  bool Excludes(const T* row, std::size_t channels, std::size_t i) const {
    const T* const pixel = row + i * channels;
    return (mask != nullptr && mask[i] == 0) ||
           (noData != nullptr && PixelEquals(pixel, noData, channels)) ||
           (background != nullptr && PixelEquals(pixel, background, channels));
  }

  /// For the pixels from i on.
  template <class D, std::size_t kChannels>
  HWY_INLINE hn::Mask<D> ExcludesVector(D d, const PixelVectors<D, kChannels>& pixels,
                                        std::size_t i) const {
    auto excluded = hn::MaskFromVec(hn::Zero(d));
    if (noData != nullptr) excluded = pixels.Equal(noData);
    if (background != nullptr) excluded = hn::Or(excluded, pixels.Equal(background));
    if (mask != nullptr) excluded = hn::Or(excluded, hn::Not(LoadFlags(d, mask + i)));
    return excluded;
  }
};

/// Whether any sample equals the first channel's value: a cheap necessary condition for a pixel to
/// equal the values of all channels.
template <typename T>
HWY_ATTR bool AnySampleEquals(const T* row, std::size_t samples, const T* values) {
  const hn::ScalableTag<T> d;
  const std::size_t lanes = hn::Lanes(d);
  const auto value = hn::Set(d, values[0]);
  auto any = hn::MaskFromVec(hn::Zero(d));
  std::size_t i = 0;
  for (; i + lanes <= samples; i += lanes) any = hn::Or(any, hn::Eq(hn::LoadU(d, row + i), value));
  const auto rest = hn::And(hn::Eq(hn::LoadU(d, row + i), value), hn::FirstN(d, samples - i));
  return !hn::AllFalse(d, hn::Or(any, rest));
}

/// Whether any pixel of a row is excluded; see WithPixelVectors.
template <std::size_t kChannels, typename T>
HWY_ATTR bool AnyVectorExcluded(const T* row, std::size_t pixels, const ExclusionTests<T>& tests) {
  using D = hn::ScalableTag<T>;
  const D d;
  std::size_t i = 0;
  for (; i + hn::Lanes(d) <= pixels; i += hn::Lanes(d)) {
    const PixelVectors<D, kChannels> vectors(d, row + i * kChannels);
    if (!hn::AllFalse(d, tests.ExcludesVector(d, vectors, i))) return true;
  }
  // What lies beyond the row does not count.
  const PixelVectors<D, kChannels> vectors(d, row + i * kChannels);
  const auto excluded = tests.ExcludesVector(d, vectors, i);
  return !hn::AllFalse(d, hn::And(excluded, hn::FirstN(d, pixels - i)));
}

/// Whether any pixel of a row is excluded.
template <typename T>
HWY_ATTR bool AnyExcluded(const T* row, std::size_t pixels, std::size_t channels,
                          ExclusionTests<T> tests) {
  if (channels > 1 && tests.mask == nullptr &&
      (tests.noData == nullptr || !AnySampleEquals(row, pixels * channels, tests.noData)) &&
      (tests.background == nullptr || !AnySampleEquals(row, pixels * channels, tests.background))) {
    return false;
  }
  bool any = false;
  const bool vectors = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    any = AnyVectorExcluded<constant()>(row, pixels, tests);
  });
  for (std::size_t i = 0; !vectors && !any && i < pixels; ++i) {
    any = tests.Excludes(row, channels, i);
  }
  return any;
}

/// Copies a row with the samples of excluded pixels made neutral, and flags these pixels.
template <std::size_t kChannels, typename T>
HWY_ATTR void CopyVectorsUnexcluded(const T* row, std::size_t pixels,
                                    const ExclusionTests<T>& tests, T neutralSample, T* to,
                                    std::uint8_t* flags) {
  using D = hn::ScalableTag<T>;
  const D d;
  const auto neutral = hn::Set(d, neutralSample);
  for (std::size_t i = 0; i < pixels; i += hn::Lanes(d)) {
    PixelVectors<D, kChannels> v(d, row + i * kChannels);
    const auto excluded = tests.ExcludesVector(d, v, i);
    StoreFlags(d, excluded, flags + i);
    for (auto& channel : v.channel) channel = hn::IfThenElse(excluded, neutral, channel);
    v.Store(to + i * kChannels);
  }
}

/// Copies a row, perhaps onto itself, with the samples of excluded pixels made `neutral`, and flags
/// these pixels.
template <typename T>
HWY_ATTR void CopyUnexcluded(const T* row, std::size_t pixels, std::size_t channels,
                             ExclusionTests<T> tests, T neutral, T* to, std::uint8_t* flags) {
  const bool vectors = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    CopyVectorsUnexcluded<constant()>(row, pixels, tests, neutral, to, flags);
  });
  for (std::size_t i = 0; !vectors && i < pixels; ++i) {
    const bool excluded = tests.Excludes(row, channels, i);
    flags[i] = excluded ? 1 : 0;
    for (std::size_t c = i * channels; c < (i + 1) * channels; ++c) {
      to[c] = excluded ? neutral : row[c];
    }
  }
}

/// The binary digits that the row uses.
HWY_ATTR inline RowRange RangeOf(const float* row, std::size_t samples) {
  const hn::ScalableTag<std::uint32_t> d;
  const std::size_t lanes = hn::Lanes(d);
  const auto* const bits = reinterpret_cast<const std::uint32_t*>(row);
  auto most = hn::Zero(d);
  auto leastLessOne = hn::Set(d, 0xFFFFFFFFU);  // a zero sample wraps around and never is the least
  const auto include = [&](hn::Vec<decltype(d)> v) HWY_ATTR {
    const auto magnitude = hn::And(v, hn::Set(d, 0x7FFFFFFFU));
    most = hn::Max(most, magnitude);
    leastLessOne = hn::Min(leastLessOne, hn::Sub(magnitude, hn::Set(d, 1)));
  };
  std::size_t i = 0;
  for (; i + lanes <= samples; i += lanes) include(hn::LoadU(d, bits + i));
  if (i < samples) {
    include(hn::IfThenElseZero(hn::FirstN(d, samples - i), hn::LoadU(d, bits + i)));
  }
  const std::uint32_t high = hn::GetLane(hn::MaxOfLanes(d, most));
  const std::uint32_t low = hn::GetLane(hn::MinOfLanes(d, leastLessOne)) + 1;
  return RowRange::OfFloatMagnitudes(low, high);
}

HWY_ATTR inline RowRange RangeOf(const double* row, std::size_t samples) {
  RowRange range;
  for (std::size_t i = 0; i < samples && !range.Hopeless(); ++i) range.Include(row[i]);
  return range;
}

/// Integers are multiples of 1; only how large they get matters.
template <typename T>
HWY_ATTR RowRange RangeOf(const T*, std::size_t) {
  return RowRange::OfIntegers(8 * static_cast<int>(sizeof(T)));
}

/// columns[i] += added[i]
template <typename Acc, typename T>
HWY_ATTR void AddColumns(Acc* HWY_RESTRICT columns, const T* HWY_RESTRICT added,
                         std::size_t samples) {
  const hn::ScalableTag<Acc> d;
  for (std::size_t i = 0; i < samples; i += hn::Lanes(d)) {
    hn::StoreU(hn::Add(hn::LoadU(d, columns + i), LoadAs(d, added + i)), d, columns + i);
  }
}

/// columns[i] += added[i] - removed[i]
template <typename Acc, typename T>
HWY_ATTR void SlideColumns(Acc* HWY_RESTRICT columns, const T* HWY_RESTRICT added,
                           const T* HWY_RESTRICT removed, std::size_t samples) {
  const hn::ScalableTag<Acc> d;
  for (std::size_t i = 0; i < samples; i += hn::Lanes(d)) {
    const auto sum = hn::Add(hn::LoadU(d, columns + i), LoadAs(d, added + i));
    hn::StoreU(hn::Sub(sum, LoadAs(d, removed + i)), d, columns + i);
  }
}

/// A sink that keeps the vectors that it is given.
template <typename Acc>
struct Stores {
  template <class D>
  HWY_INLINE void operator()(D d, hn::Vec<D> v, std::size_t i) const {
    hn::StoreU(v, d, to + i);
  }
  Acc* to;
};

/// Hands terms[0][i] + terms[1][i] + ... to `sink(d, sums, i)`, for i < count. `kTerms` is the
/// number of terms where it is worth a loop of its own, else 0.
template <std::size_t kTerms, typename Acc, class Sink>
HWY_ATTR void SumTerms(const Acc* const* terms, std::size_t termCount, std::size_t count,
                       Sink sink) {
  const hn::ScalableTag<Acc> d;
  const std::size_t lanes = hn::Lanes(d);
  const Acc* from[kTerms == 0 ? kMaxTerms : kTerms];
  const std::size_t n = kTerms == 0 ? termCount : kTerms;
  for (std::size_t t = 0; t < n; ++t) from[t] = terms[t];
  for (std::size_t i = 0; i < count; i += 2 * lanes) {
    auto low = hn::LoadU(d, from[0] + i);
    auto high = hn::LoadU(d, from[0] + i + lanes);
    for (std::size_t t = 1; t < n; ++t) {
      low = hn::Add(low, hn::LoadU(d, from[t] + i));
      high = hn::Add(high, hn::LoadU(d, from[t] + i + lanes));
    }
    sink(d, low, i);
    sink(d, high, i + lanes);
  }
}

/// Hands columns[i] + columns[i + step] + ... (`taps` terms) to `sink(d, sums, i)`, for i < count.
/// The order of summation is free, so the terms must add up exactly in any order.
///
/// Level l holds the sums of 4^l terms; the digits of `taps` to the base of 4 tell how many of each
/// level make up a window. `levels` is scratch for levels 1, 2, ..., `pitch` elements each.
template <typename Acc, class Sink>
HWY_ATTR void WindowSums(const Acc* columns, std::size_t taps, std::size_t step, std::size_t count,
                         Acc* levels, std::size_t pitch, Sink sink) {
  const hn::ScalableTag<Acc> d;
  const std::size_t lanes = hn::Lanes(d);
  const Acc* terms[kMaxTerms];
  std::size_t termCount = 0;
  if (taps <= kDirectTaps) {
    for (; termCount < taps; ++termCount) terms[termCount] = columns + termCount * step;
  } else {
    const std::size_t length = count + (taps - 1) * step;
    const Acc* level = columns;
    std::size_t covered = 0;
    for (std::size_t size = 1; size <= taps; size *= 4, levels += pitch) {
      const std::size_t reach = size * step;
      for (std::size_t digit = taps / size % 4; digit > 0; --digit, covered += size) {
        terms[termCount++] = level + covered * step;
      }
      if (4 * size > taps) break;
      const std::size_t end = length - (4 * size - 1) * step;
      for (std::size_t i = 0; i < end; i += lanes) {
        const Acc* const from = level + i;
        const auto two = hn::Add(hn::LoadU(d, from), hn::LoadU(d, from + reach));
        const auto more = hn::Add(hn::LoadU(d, from + 2 * reach), hn::LoadU(d, from + 3 * reach));
        hn::StoreU(hn::Add(two, more), d, levels + i);
      }
      level = levels;
    }
  }
  switch (termCount) {
    case 3:
      return SumTerms<3>(terms, termCount, count, sink);
    case 5:
      return SumTerms<5>(terms, termCount, count, sink);
    case 7:
      return SumTerms<7>(terms, termCount, count, sink);
    default:
      return SumTerms<0>(terms, termCount, count, sink);
  }
}

/// Repeats each pixel's value for its channels.
template <typename Acc>
HWY_ATTR void RepeatForChannels(const Acc* HWY_RESTRICT perPixel, std::size_t pixels,
                                std::size_t channels, Acc* HWY_RESTRICT perSample) {
  if (channels == 3) {
    const hn::ScalableTag<Acc> d;
    for (std::size_t i = 0; i < pixels; i += hn::Lanes(d)) {
      const auto v = hn::LoadU(d, perPixel + i);
      hn::StoreInterleaved3(v, v, v, d, perSample + 3 * i);
    }
    return;
  }
  for (std::size_t i = 0; i < pixels; ++i) {
    for (std::size_t c = 0; c < channels; ++c) perSample[i * channels + c] = perPixel[i];
  }
}

/// Hands the sums of the windows' samples, added in double row by row and each row from the left,
/// to `sink(d, sums, i)`. `rows` are the window's rows from the top, starting at its left column.
template <typename T, class Sink>
HWY_ATTR void OrderedSums(const T* const* rows, std::size_t taps, std::size_t step,
                          std::size_t count, Sink sink) {
  const hn::ScalableTag<double> d;
  const std::size_t lanes = hn::Lanes(d);
  for (std::size_t i = 0; i < count; i += 4 * lanes) {
    // Four independent chains hide the latency of the additions.
    auto s0 = hn::Zero(d);
    auto s1 = s0;
    auto s2 = s0;
    auto s3 = s0;
    for (std::size_t r = 0; r < taps; ++r) {
      const T* from = rows[r] + i;
      for (std::size_t t = 0; t < taps; ++t, from += step) {
        s0 = hn::Add(s0, LoadAs(d, from));
        s1 = hn::Add(s1, LoadAs(d, from + lanes));
        s2 = hn::Add(s2, LoadAs(d, from + 2 * lanes));
        s3 = hn::Add(s3, LoadAs(d, from + 3 * lanes));
      }
    }
    sink(d, s0, i);
    sink(d, s1, i + lanes);
    sink(d, s2, i + 2 * lanes);
    sink(d, s3, i + 3 * lanes);
  }
}

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#endif
