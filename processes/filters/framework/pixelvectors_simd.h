// SPDX-License-Identifier: Apache-2.0
// Pixels as vectors, compiled once per vector target. Include it only from a `_simd.cpp` that
// Highway's foreach_target.h compiles repeatedly, after hwy/highway.h, or from a header like it.

#if defined(ZARN_FRAMEWORK_PIXELVECTORS_SIMD_H) == defined(HWY_TARGET_TOGGLE)
#ifdef ZARN_FRAMEWORK_PIXELVECTORS_SIMD_H
#undef ZARN_FRAMEWORK_PIXELVECTORS_SIMD_H
#else
#define ZARN_FRAMEWORK_PIXELVECTORS_SIMD_H
#endif

#include <hwy/highway.h>

#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "processes/filters/framework/nodata.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

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

/// Loads samples of up to 32 bits, or doubles, as doubles.
template <class D, typename T>
HWY_INLINE hn::Vec<D> LoadDoubles(D d, const T* from) {
  const auto v = hn::LoadU(hn::Rebind<T, D>(), from);
  if constexpr (std::is_same_v<T, double>) {
    return v;
  } else if constexpr (std::is_same_v<T, std::uint32_t>) {
    const hn::Rebind<std::int32_t, D> di;
    const auto top = hn::Set(hn::Rebind<T, D>(), 0x80000000U);
    const auto shifted = hn::PromoteTo(d, hn::BitCast(di, hn::Xor(v, top)));
    return hn::Add(shifted, hn::Set(d, 2147483648.0));
  } else if constexpr (sizeof(T) < 4) {
    return hn::PromoteTo(d, hn::PromoteTo(hn::Rebind<std::int32_t, D>(), v));
  } else {
    return hn::PromoteTo(d, v);
  }
}

/// A vector of pixels of one to four channels, one vector for each channel.
template <class D, std::size_t kChannels>
struct PixelVectors {
  static_assert(kChannels >= 1 && kChannels <= 4);

  explicit HWY_INLINE PixelVectors(D tag) : d(tag) {}
  template <typename T>
  HWY_INLINE PixelVectors(D tag, const T* from) : d(tag) {
    if constexpr (kChannels == 1) {
      channel[0] = hn::LoadU(d, from);
    } else if constexpr (kChannels == 2) {
      hn::LoadInterleaved2(d, from, channel[0], channel[1]);
    } else if constexpr (kChannels == 3) {
      hn::LoadInterleaved3(d, from, channel[0], channel[1], channel[2]);
    } else {
      hn::LoadInterleaved4(d, from, channel[0], channel[1], channel[2], channel[3]);
    }
  }

  /// The pixels whose channels all equal `value`.
  template <typename T>
  HWY_INLINE hn::Mask<D> Equal(const T* value) const {
    auto equal = hn::Eq(channel[0], hn::Set(d, value[0]));
    for (std::size_t c = 1; c < kChannels; ++c) {
      equal = hn::And(equal, hn::Eq(channel[c], hn::Set(d, value[c])));
    }
    return equal;
  }

  /// The same, floating samples within the tolerance of no-data values, compared in their type.
  template <typename T>
  HWY_INLINE hn::Mask<D> NearlyEqual(const T* value) const {
    if constexpr (std::is_floating_point_v<T>) {
      const auto tolerance = hn::Set(d, static_cast<T>(kNoDataTolerance));
      const auto isNear = [&](std::size_t c) HWY_ATTR {
        return hn::Lt(hn::Abs(hn::Sub(channel[c], hn::Set(d, value[c]))), tolerance);
      };
      auto nearly = isNear(0);
      for (std::size_t c = 1; c < kChannels; ++c) nearly = hn::And(nearly, isNear(c));
      return nearly;
    } else {
      return Equal(value);
    }
  }

  /// Replaces the chosen pixels by `value`, or by those of another vector.
  template <class Mask, typename T>
  HWY_INLINE void Replace(Mask chosen, const T* value) {
    for (std::size_t c = 0; c < kChannels; ++c) {
      channel[c] = hn::IfThenElse(chosen, hn::Set(d, value[c]), channel[c]);
    }
  }
  template <class Mask>
  HWY_INLINE void Replace(Mask chosen, const PixelVectors& others) {
    for (std::size_t c = 0; c < kChannels; ++c) {
      channel[c] = hn::IfThenElse(chosen, others.channel[c], channel[c]);
    }
  }

  template <typename T>
  HWY_INLINE void Store(T* to) const {
    if constexpr (kChannels == 1) {
      hn::StoreU(channel[0], d, to);
    } else if constexpr (kChannels == 2) {
      hn::StoreInterleaved2(channel[0], channel[1], d, to);
    } else if constexpr (kChannels == 3) {
      hn::StoreInterleaved3(channel[0], channel[1], channel[2], d, to);
    } else {
      hn::StoreInterleaved4(channel[0], channel[1], channel[2], channel[3], d, to);
    }
  }

  D d;
  hn::Vec<D> channel[kChannels];
};

/// Calls `use` with the number of channels as a constant where vectors of such pixels exist, and
/// tells whether they do.
template <class Use>
HWY_INLINE bool WithPixelVectors(std::size_t channels, const Use& use) {
  switch (channels) {
    case 1:
      use(std::integral_constant<std::size_t, 1>());
      return true;
    case 2:
      use(std::integral_constant<std::size_t, 2>());
      return true;
    case 3:
      use(std::integral_constant<std::size_t, 3>());
      return true;
    case 4:
      use(std::integral_constant<std::size_t, 4>());
      return true;
    default:
      return false;
  }
}

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#endif
