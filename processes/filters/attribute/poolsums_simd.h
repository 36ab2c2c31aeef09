// SPDX-License-Identifier: Apache-2.0

// Sums of pooled samples and their quotients, compiled once per vector target. Include it only from
// a `_simd.cpp` that Highway's foreach_target.h compiles repeatedly, after hwy/highway.h.

#if defined(ZARN_ATTRIBUTE_POOLSUMS_SIMD_H) == defined(HWY_TARGET_TOGGLE)
#ifdef ZARN_ATTRIBUTE_POOLSUMS_SIMD_H
#undef ZARN_ATTRIBUTE_POOLSUMS_SIMD_H
#else
#define ZARN_ATTRIBUTE_POOLSUMS_SIMD_H
#endif

#include <hwy/highway.h>

#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "processes/filters/framework/orderedkeys.h"
#include "processes/filters/framework/pixelvectors_simd.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

/// Flags of 0 and 255 as lanes of zeros and ones.
template <class D>
HWY_INLINE hn::Vec<D> LoadPooled(D /*du*/, const std::uint8_t* flags) {
  if constexpr (sizeof(hn::TFromD<D>) == 1) {
    return hn::LoadU(D(), flags);
  } else {
    const hn::RebindToSigned<D> di;
    const hn::Rebind<std::int8_t, D> d8;
    const auto bytes = hn::LoadU(d8, reinterpret_cast<const std::int8_t*>(flags));
    if constexpr (sizeof(hn::TFromD<D>) == 8) {
      const hn::Rebind<std::int32_t, D> d32;
      return hn::BitCast(D(), hn::PromoteTo(di, hn::PromoteTo(d32, bytes)));
    } else {
      return hn::BitCast(D(), hn::PromoteTo(di, bytes));
    }
  }
}

/// Quotients of 16-bit sums and counts of up to 255, truncated. A count of 0 gives anything.
template <class D>
HWY_INLINE hn::Vec<D> TruncatedQuotients(D d, hn::Vec<D> sums, hn::Vec<D> counts,
                                         std::integral_constant<int, 16> /*bits*/) {
  // Float is enough: a quotient below 256 is off by up to 2^-17, and one that is no integer stays
  // 1 / 255 below the next. Next to 2^15 the unit in the last place is 2^-8, so that adding it puts
  // the whole part into the second byte. Even and odd lanes apart, so that no lane changes its
  // place.
  const hn::RepartitionToWide<D> dw;
  const hn::RebindToSigned<decltype(dw)> di;
  const hn::RebindToFloat<decltype(dw)> df;
  const auto divide = [&](auto s, auto n) HWY_ATTR {
    const auto quotient =
        hn::Div(hn::ConvertTo(df, hn::BitCast(di, s)), hn::ConvertTo(df, hn::BitCast(di, n)));
    return hn::BitCast(dw, hn::Add(quotient, hn::Set(df, 32768.0F)));
  };
  const auto low = hn::Set(dw, 0xFFFF);
  const auto even =
      divide(hn::And(hn::BitCast(dw, sums), low), hn::And(hn::BitCast(dw, counts), low));
  const auto odd = divide(hn::ShiftRight<16>(hn::BitCast(dw, sums)),
                          hn::ShiftRight<16>(hn::BitCast(dw, counts)));
  const auto whole = hn::And(hn::ShiftRight<8>(even), hn::Set(dw, 0xFF));
  return hn::BitCast(d, hn::Or(whole, hn::And(hn::ShiftLeft<8>(odd), hn::Set(dw, 0xFF0000))));
}

/// The same of 32-bit sums below 2^31 with quotients below 2^16 and counts below 2^15.
template <class D>
HWY_INLINE hn::Vec<D> TruncatedQuotients(D d, hn::Vec<D> sums, hn::Vec<D> counts,
                                         std::integral_constant<int, 32> /*bits*/) {
  // The float quotient is off by less than 1: the remainder tells which way.
  const hn::RebindToSigned<D> di;
  const hn::RebindToFloat<D> df;
  const auto sum = hn::BitCast(di, sums);
  const auto count = hn::BitCast(di, counts);
  const auto quotient =
      hn::ConvertTo(di, hn::Div(hn::ConvertTo(df, sum), hn::ConvertTo(df, count)));
  const auto remainder = hn::Sub(sum, hn::Mul(quotient, count));
  const auto high = hn::VecFromMask(di, hn::Lt(remainder, hn::Zero(di)));
  const auto low = hn::VecFromMask(di, hn::Gt(remainder, hn::Sub(count, hn::Set(di, 1))));
  return hn::BitCast(d, hn::Sub(hn::Add(quotient, high), low));
}

/// Sums of 8- or 16-bit keys in lanes twice as wide: one of all bits, which wraps around, and one
/// of the odd keys, which tells the even ones in the other.
template <typename T>
class KeySums {
 public:
  using Key = OrderedKey<T>;
  using D = hn::ScalableTag<Key>;
  using Wide = hn::RepartitionToWide<D>;
  static constexpr int kBits = 8 * sizeof(Key);

  HWY_INLINE KeySums() : all_(hn::Zero(Wide())), odd_(all_) {}

  /// Keys that do not count are zero.
  HWY_INLINE void Add(hn::Vec<D> keys) {
    const auto lanes = hn::BitCast(Wide(), keys);
    all_ = hn::Add(all_, lanes);
    odd_ = hn::Add(odd_, hn::ShiftRight<kBits>(lanes));
  }

  /// The samples nearest to the means of so many keys towards zero.
  HWY_INLINE hn::Vec<D> Means(hn::Vec<D> counts) const {
    const Wide d;
    const auto even = hn::Sub(all_, hn::ShiftLeft<kBits>(odd_));
    const auto lanes = hn::BitCast(d, counts);
    const auto low = hn::Set(d, static_cast<hn::TFromD<Wide>>((1U << kBits) - 1));
    const auto evenMeans = Mean(even, hn::And(lanes, low));
    const auto oddMeans = Mean(odd_, hn::ShiftRight<kBits>(lanes));
    return hn::BitCast(D(), hn::Or(hn::And(evenMeans, low), hn::ShiftLeft<kBits>(oddMeans)));
  }

 private:
  static HWY_INLINE hn::Vec<Wide> Mean(hn::Vec<Wide> sums, hn::Vec<Wide> counts) {
    const Wide d;
    const std::integral_constant<int, 2 * kBits> bits;
    if constexpr (std::is_signed_v<T>) {
      // Of the samples themselves: their magnitude is divided, and their sign put back.
      const hn::RebindToSigned<Wide> di;
      const auto bias = hn::ShiftLeft<kBits - 1>(counts);
      const auto sum = hn::BitCast(di, hn::Sub(sums, bias));
      const auto sign = hn::BroadcastSignBit(sum);
      const auto magnitude = hn::BitCast(d, hn::Abs(sum));
      const auto quotient = hn::BitCast(di, TruncatedQuotients(d, magnitude, counts, bits));
      return hn::BitCast(d, hn::Sub(hn::Xor(quotient, sign), sign));
    } else {
      return TruncatedQuotients(d, sums, counts, bits);
    }
  }

  hn::Vec<Wide> all_;
  hn::Vec<Wide> odd_;
};

/// Truncates doubles to samples and stores them.
template <class D, typename T>
HWY_INLINE void StoreTruncated(D d, hn::Vec<D> values, T* to) {
  const hn::Rebind<T, D> dt;
  const hn::Rebind<std::int32_t, D> di;
  if constexpr (std::is_same_v<T, double>) {
    hn::StoreU(values, dt, to);
  } else if constexpr (std::is_same_v<T, float> || std::is_same_v<T, std::int32_t>) {
    hn::StoreU(hn::DemoteTo(dt, values), dt, to);
  } else if constexpr (std::is_same_v<T, std::uint32_t>) {
    const auto shifted = hn::DemoteTo(di, hn::Sub(hn::Trunc(values), hn::Set(d, 2147483648.0)));
    hn::StoreU(hn::Xor(hn::BitCast(dt, shifted), hn::Set(dt, kTopBit<T>)), dt, to);
  } else {
    hn::StoreU(hn::DemoteTo(dt, hn::DemoteTo(di, values)), dt, to);
  }
}

/// Counts as doubles.
template <class D>
HWY_INLINE hn::Vec<D> LoadCounts(D d, const std::uint16_t* counts) {
  return LoadDoubles(d, counts);
}

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#endif
