// SPDX-License-Identifier: Apache-2.0

// Ordered keys of vectors of samples, compiled once per vector target. Include it only from a
// `_simd.cpp` that Highway's foreach_target.h compiles repeatedly, after hwy/highway.h.

#if defined(ZARN_FRAMEWORK_ORDEREDKEYS_SIMD_H) == defined(HWY_TARGET_TOGGLE)
#ifdef ZARN_FRAMEWORK_ORDEREDKEYS_SIMD_H
#undef ZARN_FRAMEWORK_ORDEREDKEYS_SIMD_H
#else
#define ZARN_FRAMEWORK_ORDEREDKEYS_SIMD_H
#endif

#include <hwy/highway.h>

#include <type_traits>

#include "processes/filters/framework/orderedkeys.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

/// Whether samples are their own keys.
template <typename T>
inline constexpr bool kIsOwnKey = std::is_integral_v<T>&& std::is_unsigned_v<T>;

/// `ToOrderedKey` of the bits of samples; `d` is of the keys.
template <typename T, class D>
HWY_INLINE hn::Vec<D> KeysOfBits(D d, hn::Vec<D> bits) {
  if constexpr (kIsOwnKey<T>) {
    return bits;
  } else {
    const auto top = hn::Set(d, kTopBit<T>);
    if constexpr (std::is_floating_point_v<T>) {
      const hn::RebindToSigned<D> ds;
      const auto negative = hn::BitCast(d, hn::BroadcastSignBit(hn::BitCast(ds, bits)));
      const auto keys = hn::Xor(bits, hn::Or(negative, top));
      return hn::Sub(keys, hn::Set(d, kSignedNaNs<T>));
    } else {
      return hn::Xor(bits, top);
    }
  }
}

/// The inverse.
template <typename T, class D>
HWY_INLINE hn::Vec<D> BitsOfKeys(D d, hn::Vec<D> keys) {
  if constexpr (std::is_floating_point_v<T>) {
    const hn::RebindToSigned<D> ds;
    const auto shifted = hn::Add(keys, hn::Set(d, kSignedNaNs<T>));
    const auto positive = hn::BitCast(d, hn::BroadcastSignBit(hn::BitCast(ds, shifted)));
    return hn::Xor(shifted, hn::Or(hn::Not(positive), hn::Set(d, kTopBit<T>)));
  } else {
    return KeysOfBits<T>(d, keys);
  }
}

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#endif
