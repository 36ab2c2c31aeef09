// SPDX-License-Identifier: Apache-2.0

// Row kernels of the square-window filters, compiled once per vector target. Include it only from a
// `_simd.cpp` that Highway's foreach_target.h compiles repeatedly, after hwy/highway.h.
//
// Rows are padded copies: every kernel may read and write up to kRowPadding elements past the
// length that it is given, so none has a scalar tail.

#if defined(ZARN_NEIGHBOURHOOD_BOXSUMS_SIMD_H_) == defined(HWY_TARGET_TOGGLE)
#ifdef ZARN_NEIGHBOURHOOD_BOXSUMS_SIMD_H_
#undef ZARN_NEIGHBOURHOOD_BOXSUMS_SIMD_H_
#else
#define ZARN_NEIGHBOURHOOD_BOXSUMS_SIMD_H_
#endif

#include <hwy/highway.h>

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <type_traits>

#include "processes/filters/framework/nodata.h"
#include "processes/filters/neighbourhood/boxrows.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

/// Loads samples as lanes of the accumulator type.
template <class D, typename T>
HWY_INLINE hn::Vec<D> LoadAs(D d, const T* from) {
  using Acc = hn::TFromD<D>;
  const hn::Rebind<T, D> dt;
  const auto v = hn::LoadU(dt, from);
  if constexpr (std::is_same_v<T, Acc>) {
    return v;
  } else if constexpr (std::is_same_v<Acc, double> && sizeof(T) < 4) {
    return hn::PromoteTo(d, hn::PromoteTo(hn::Rebind<std::int32_t, D>(), v));
  } else if constexpr (std::is_same_v<Acc, double> && std::is_same_v<T, std::uint32_t>) {
    const hn::Rebind<std::int32_t, D> di;
    const auto shifted = hn::BitCast(di, hn::Xor(v, hn::Set(dt, 0x80000000U)));
    return hn::Add(hn::PromoteTo(d, shifted), hn::Set(d, 2147483648.0));
  } else {
    return hn::PromoteTo(d, v);
  }
}

/// Loads one byte per lane and tells which are not zero.
template <class D>
HWY_INLINE hn::Mask<D> LoadFlags([[maybe_unused]] D d, const std::uint8_t* from) {
  const hn::RebindToUnsigned<D> du;
  const hn::Rebind<std::uint8_t, D> d8;
  const auto bytes = hn::LoadU(d8, from);
  hn::Vec<decltype(du)> lanes;
  if constexpr (sizeof(hn::TFromD<D>) == 1) {
    lanes = bytes;
  } else if constexpr (sizeof(hn::TFromD<D>) == 8) {
    lanes = hn::PromoteTo(du, hn::PromoteTo(hn::Rebind<std::uint32_t, D>(), bytes));
  } else {
    lanes = hn::PromoteTo(du, bytes);
  }
  return hn::RebindMask(d, hn::Ne(lanes, hn::Zero(du)));
}

/// Stores one byte per lane: 1 where `mask` is set, else 0.
template <class D>
HWY_INLINE void StoreFlags([[maybe_unused]] D d, hn::Mask<D> mask, std::uint8_t* to) {
  const hn::RebindToUnsigned<D> du;
  const hn::Rebind<std::uint8_t, D> d8;
  const auto ones = hn::IfThenElseZero(hn::RebindMask(du, mask), hn::Set(du, 1));
  if constexpr (sizeof(hn::TFromD<D>) == 1) {
    hn::StoreU(ones, d8, to);
  } else {
    hn::StoreU(hn::TruncateTo(d8, ones), d8, to);
  }
}

/// The pixels whose channels all equal `value`, for a vector of pixels.
template <class D, typename T>
HWY_INLINE hn::Mask<D> EqualPixels(D d, const T* row, std::size_t channels, const T* value) {
  if (channels == 1) return hn::Eq(hn::LoadU(d, row), hn::Set(d, value[0]));
  hn::Vec<D> a, b, c;
  hn::LoadInterleaved3(d, row, a, b, c);
  return hn::And(hn::And(hn::Eq(a, hn::Set(d, value[0])), hn::Eq(b, hn::Set(d, value[1]))),
                 hn::Eq(c, hn::Set(d, value[2])));
}

/// Flags the pixels of a row that are excluded: mask byte 0, no-data or background. Null pointers
/// switch a reason off. Returns whether any pixel is flagged.
template <typename T>
HWY_ATTR bool FlagExcluded(const T* row, std::size_t pixels, std::size_t channels, const T* noData,
                           const T* background, const std::uint8_t* mask, std::uint8_t* flags) {
  const hn::ScalableTag<T> d;
  const std::size_t lanes = hn::Lanes(d);
  if (channels != 1 && channels != 3) {
    std::uint8_t any = 0;
    for (std::size_t i = 0; i < pixels; ++i) {
      const T* const pixel = row + i * channels;
      const bool excluded = (mask != nullptr && mask[i] == 0) ||
                            (noData != nullptr && PixelEquals(pixel, noData, channels)) ||
                            (background != nullptr && PixelEquals(pixel, background, channels));
      flags[i] = excluded ? 1 : 0;
      any |= flags[i];
    }
    return any != 0;
  }
  const auto never = hn::MaskFromVec(hn::Zero(d));
  auto any = never;
  for (std::size_t i = 0; i < pixels; i += lanes) {
    auto excluded = never;
    if (noData != nullptr) excluded = EqualPixels(d, row + i * channels, channels, noData);
    if (background != nullptr) {
      excluded = hn::Or(excluded, EqualPixels(d, row + i * channels, channels, background));
    }
    if (mask != nullptr) excluded = hn::Or(excluded, hn::Not(LoadFlags(d, mask + i)));
    StoreFlags(d, excluded, flags + i);
    // The last vector may reach into the padding, whose content does not count.
    if (i + lanes > pixels) return !hn::AllFalse(d, any) || std::memchr(flags + i, 1, pixels - i);
    any = hn::Or(any, excluded);
  }
  return !hn::AllFalse(d, any);
}

/// Zeroes the samples of flagged pixels.
template <typename T>
HWY_ATTR void ZeroFlagged(T* row, std::size_t pixels, std::size_t channels,
                          const std::uint8_t* flags) {
  if (channels == 1) {
    const hn::ScalableTag<T> d;
    for (std::size_t i = 0; i < pixels; i += hn::Lanes(d)) {
      const auto kept = hn::IfThenZeroElse(LoadFlags(d, flags + i), hn::LoadU(d, row + i));
      hn::StoreU(kept, d, row + i);
    }
  } else if (channels == 3) {
    const hn::ScalableTag<T> d;
    for (std::size_t i = 0; i < pixels; i += hn::Lanes(d)) {
      hn::Vec<decltype(d)> a, b, c;
      hn::LoadInterleaved3(d, row + 3 * i, a, b, c);
      const auto flagged = LoadFlags(d, flags + i);
      hn::StoreInterleaved3(hn::IfThenZeroElse(flagged, a), hn::IfThenZeroElse(flagged, b),
                            hn::IfThenZeroElse(flagged, c), d, row + 3 * i);
    }
  } else {
    for (std::size_t i = 0; i < pixels; ++i) {
      if (flags[i] == 0) continue;
      for (std::size_t c = 0; c < channels; ++c) row[i * channels + c] = T{0};
    }
  }
}

/// Toggles the top bit of every sample: maps a signed type onto the unsigned one in order.
template <typename T>
HWY_ATTR void FlipSign(T* row, std::size_t samples) {
  using Bits = std::make_unsigned_t<T>;
  const hn::ScalableTag<Bits> d;
  auto* const bits = reinterpret_cast<Bits*>(row);
  const auto top = hn::Set(d, static_cast<Bits>(Bits{1} << (8 * sizeof(T) - 1)));
  for (std::size_t i = 0; i < samples; i += hn::Lanes(d)) {
    hn::StoreU(hn::Xor(hn::LoadU(d, bits + i), top), d, bits + i);
  }
}

/// The binary digits that the row uses.
HWY_ATTR inline RowRange RangeOf(const float* row, std::size_t samples) {
  const hn::ScalableTag<std::uint32_t> d;
  const auto one = hn::Set(d, 1);
  auto most = hn::Zero(d);
  auto leastLessOne = hn::Set(d, 0xFFFFFFFFU);  // a zero sample wraps around and never is the least
  const auto* const bits = reinterpret_cast<const std::uint32_t*>(row);
  for (std::size_t i = 0; i < samples; i += hn::Lanes(d)) {
    const auto magnitude = hn::And(hn::LoadU(d, bits + i), hn::Set(d, 0x7FFFFFFFU));
    most = hn::Max(most, magnitude);
    leastLessOne = hn::Min(leastLessOne, hn::Sub(magnitude, one));
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

/// sums[i] = columns[i] + columns[i + step] + ... (`taps` terms), for i < count. The order of
/// summation is free, so the terms must add up exactly in any order.
/// `powers` is scratch of the columns' length.
template <typename Acc>
HWY_ATTR void WindowSums(const Acc* HWY_RESTRICT columns, std::size_t taps, std::size_t step,
                         std::size_t count, Acc* HWY_RESTRICT powers, Acc* HWY_RESTRICT sums) {
  const hn::ScalableTag<Acc> d;
  const std::size_t lanes = hn::Lanes(d);
  if (taps <= kDirectTaps) {
    for (std::size_t i = 0; i < count; i += lanes) {
      auto sum = hn::LoadU(d, columns + i);
      for (std::size_t t = 1; t < taps; ++t) {
        sum = hn::Add(sum, hn::LoadU(d, columns + i + t * step));
      }
      hn::StoreU(sum, d, sums + i);
    }
    return;
  }
  // By the binary digits of `taps` (an odd number): `powers` holds the sums of 2, 4, 8, ... terms,
  // and each digit that is set appends one of them to what the lower digits have covered.
  const std::size_t length = count + (taps - 1) * step;
  std::size_t covered = 1;
  const Acc* half = columns;
  const Acc* head = columns;
  for (std::size_t size = 2; size <= taps; size *= 2) {
    const std::size_t reach = size / 2 * step;
    const std::size_t end = length - (size - 1) * step;
    for (std::size_t i = 0; i < end; i += lanes) {
      const auto sum = hn::Add(hn::LoadU(d, half + i), hn::LoadU(d, half + i + reach));
      hn::StoreU(sum, d, powers + i);
    }
    half = powers;
    if ((taps & size) == 0) continue;
    for (std::size_t i = 0; i < count; i += lanes) {
      const auto sum = hn::Add(hn::LoadU(d, head + i), hn::LoadU(d, powers + i + covered * step));
      hn::StoreU(sum, d, sums + i);
    }
    head = sums;
    covered += size;
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

/// sums[i]: the window's samples added in double row by row, each row from the left. `rows` are the
/// window's rows from the top, starting at its left column.
template <typename T>
HWY_ATTR void OrderedSums(const WindowRow<T>* rows, std::size_t taps, std::size_t step,
                          std::size_t count, double* HWY_RESTRICT sums) {
  const hn::ScalableTag<double> d;
  const std::size_t lanes = hn::Lanes(d);
  for (std::size_t i = 0; i < count; i += 4 * lanes) {
    // Four independent chains hide the latency of the additions.
    auto s0 = hn::Zero(d);
    auto s1 = s0;
    auto s2 = s0;
    auto s3 = s0;
    for (std::size_t r = 0; r < taps; ++r) {
      const T* from = rows[r].samples + i;
      for (std::size_t t = 0; t < taps; ++t, from += step) {
        s0 = hn::Add(s0, LoadAs(d, from));
        s1 = hn::Add(s1, LoadAs(d, from + lanes));
        s2 = hn::Add(s2, LoadAs(d, from + 2 * lanes));
        s3 = hn::Add(s3, LoadAs(d, from + 3 * lanes));
      }
    }
    hn::StoreU(s0, d, sums + i);
    hn::StoreU(s1, d, sums + i + lanes);
    hn::StoreU(s2, d, sums + i + 2 * lanes);
    hn::StoreU(s3, d, sums + i + 3 * lanes);
  }
}

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#endif
