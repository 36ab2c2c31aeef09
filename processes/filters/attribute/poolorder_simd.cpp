// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <type_traits>

#include "processes/filters/attribute/poolstatistics_simd.h"

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/attribute/poolorder_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
#include "processes/filters/attribute/poolsums_simd.h"
#include "processes/filters/framework/orderedkeys_simd.h"
#include "processes/filters/framework/sortingnetwork_simd.h"
#endif

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128

/// Gathers the pools of `kBlock` pixels from x on, one row of keys for each cell. Excluded places
/// are filled in with the lowest and the highest key in turn, so that the (lower) middle of the
/// pool is the middle of all: the lowest begins, and is one more when the pool is even.
template <typename Key, std::size_t kBlock>
HWY_ATTR void Gather(const PoolSamples& pools, std::size_t x, Key* HWY_RESTRICT values) {
  const hn::ScalableTag<Key> d;
  const std::size_t offset = pools.channel + pools.first + x;
  for (std::size_t i = 0; i < kBlock; i += hn::Lanes(d)) {
    auto fill = hn::Zero(d);
    const std::uint8_t* flags = pools.flags + x + i;
    Key* to = values + i;
    for (std::size_t k = 0; k < pools.cellCount; ++k, flags += pools.pitch, to += kBlock) {
      const auto keys = hn::LoadU(d, static_cast<const Key*>(pools.cells[k]) + offset + i);
      const auto pooled = LoadPooled(d, flags);
      hn::Store(hn::IfVecThenElse(pooled, keys, fill), d, to);
      fill = hn::Xor(fill, hn::Not(pooled));
    }
  }
}

/// The middle ones of the sorted keys.
template <typename Key>
struct TakeMedians {
  template <std::size_t kBlock>
  HWY_ATTR void Take(const PoolSamples& pools, std::size_t x, const Key* values) const {
    std::copy_n(values + pools.cellCount / 2 * kBlock, kBlock,
                static_cast<Key*>(pools.results) + x);
  }
};

/// The samples of keys as doubles.
template <typename T, class D>
HWY_INLINE hn::Vec<D> LoadSamples(D d, const OrderedKey<T>* keys) {
  if constexpr (std::is_floating_point_v<T>) {
    const hn::Rebind<OrderedKey<T>, D> du;
    const hn::Rebind<T, D> dt;
    const auto samples = hn::BitCast(dt, BitsOfKeys<T>(du, hn::LoadU(du, keys)));
    if constexpr (std::is_same_v<T, double>) {
      return samples;
    } else {
      return hn::PromoteTo(d, samples);
    }
  } else if constexpr (std::is_signed_v<T>) {
    return hn::Sub(LoadDoubles(d, keys), hn::Set(d, static_cast<double>(kTopBit<T>)));
  } else {
    return LoadDoubles(d, keys);
  }
}

/// The means of the middle halves of the sorted keys.
template <typename T>
struct TakeTrimmedMeans {
  using Key = OrderedKey<T>;
  TrimmedRanks ranks;

  template <std::size_t kBlock>
  HWY_ATTR void Take(const PoolSamples& pools, std::size_t x, const Key* values) const {
    T* const results = static_cast<T*>(pools.results) + x;
    if constexpr (sizeof(T) == 1) {
      if (pools.cellCount <= 255) {
        return TakeKeys<kBlock>(pools, pools.counts8 + x, values, results);
      }
    }
    if constexpr (sizeof(T) == 2) {
      return TakeKeys<kBlock>(pools, pools.counts16 + x, values, results);
    }
    TakeDoubles<kBlock>(pools, pools.counts16 + x, values, results);
  }

  template <std::size_t kBlock>
  HWY_ATTR void TakeKeys(const PoolSamples& pools, const Key* counts, const Key* values,
                         T* results) const {
    const hn::ScalableTag<Key> d;
    const auto cells = hn::Set(d, static_cast<Key>(pools.cellCount));
    const auto one = hn::Set(d, 1);
    for (std::size_t i = 0; i < kBlock; i += hn::Lanes(d)) {
      const auto pooled = hn::LoadU(d, counts + i);
      // (Half of the excluded ones, rounded up, without passing the largest byte.)
      const auto excluded = hn::Sub(cells, pooled);
      const auto below = hn::Add(hn::ShiftRight<1>(excluded), hn::And(excluded, one));
      const auto trimmed = hn::ShiftRight<2>(pooled);
      const auto first = hn::Add(below, trimmed);
      const auto count = hn::Sub(pooled, hn::Add(trimmed, trimmed));
      const auto span = hn::Sub(count, one);
      KeySums<T> sums;
      for (std::size_t r = ranks.first; r <= ranks.last; ++r) {
        const auto rank = hn::Sub(hn::Set(d, static_cast<Key>(r)), first);
        const auto counts = hn::Eq(hn::Min(rank, span), rank);
        sums.Add(hn::IfThenElseZero(counts, hn::Load(d, values + r * kBlock + i)));
      }
      const hn::Rebind<T, decltype(d)> dt;
      hn::StoreU(hn::BitCast(dt, sums.Means(count)), dt, results + i);
    }
  }

  template <std::size_t kBlock>
  HWY_ATTR void TakeDoubles(const PoolSamples& pools, const std::uint16_t* counts,
                            const Key* values, T* results) const {
    const hn::ScalableTag<double> d;
    const auto cells = hn::Set(d, static_cast<double>(pools.cellCount + 1));
    for (std::size_t i = 0; i < kBlock; i += hn::Lanes(d)) {
      const auto pooled = LoadCounts(d, counts + i);
      const auto below = hn::Trunc(hn::Mul(hn::Sub(cells, pooled), hn::Set(d, 0.5)));
      const auto trimmed = hn::Trunc(hn::Mul(pooled, hn::Set(d, 0.25)));
      const auto first = hn::Add(below, trimmed);
      const auto count = hn::Sub(pooled, hn::Add(trimmed, trimmed));
      const auto end = hn::Add(first, count);
      auto sum = hn::Zero(d);
      for (std::size_t r = ranks.first; r <= ranks.last; ++r) {
        const auto rank = hn::Set(d, static_cast<double>(r));
        const auto counts = hn::And(hn::Ge(rank, first), hn::Lt(rank, end));
        const auto samples = LoadSamples<T>(d, values + r * kBlock + i);
        sum = hn::Add(sum, hn::IfThenElseZero(counts, samples));
      }
      StoreTruncated(d, hn::Div(sum, count), results + i);
    }
  }
};

/// As many pixels at a time as the work area holds, or a vector of bytes.
template <typename Key, class Statistic>
HWY_ATTR void OrderPools(const PoolSamples& pools, const Statistic& statistic) {
  constexpr std::size_t kLarge = PoolWorkBytes(1) / sizeof(Key);
  constexpr std::size_t kSmall = kPoolGroup / sizeof(Key);
  // Beyond, the values of a large block would not stay in the nearest cache.
  constexpr std::size_t kMostLarge = 96;
  auto* const values = static_cast<Key*>(pools.work);
  std::size_t x = 0;
  if (pools.cellCount <= kMostLarge) {
    for (; x + kLarge <= pools.count; x += kLarge) {
      Gather<Key, kLarge>(pools, x, values);
      RunNetwork<Key, kLarge>(*pools.network, values);
      statistic.template Take<kLarge>(pools, x, values);
    }
  }
  for (; x < pools.count; x += kSmall) {
    Gather<Key, kSmall>(pools, x, values);
    RunNetwork<Key, kSmall>(*pools.network, values);
    statistic.template Take<kSmall>(pools, x, values);
  }
}

template <typename Key>
HWY_ATTR void Medians(const PoolSamples& pools) {
  OrderPools<Key>(pools, TakeMedians<Key>());
}

template <typename T>
HWY_ATTR void TrimmedMeans(const PoolSamples& pools) {
  OrderPools<OrderedKey<T>>(pools, TakeTrimmedMeans<T>{TrimmedRanks::OfAny(pools.cellCount)});
}

#else

// Never called: the definition takes the place of emulated vectors.
template <typename Key>
void Medians(const PoolSamples&) {}
template <typename T>
void TrimmedMeans(const PoolSamples&) {}

#endif

// The dispatch table holds plain functions.
#define ZARN_MEDIANS(name, Key) \
  void name(const PoolSamples& pools) { Medians<Key>(pools); }
ZARN_MEDIANS(Medians8, std::uint8_t)
ZARN_MEDIANS(Medians16, std::uint16_t)
ZARN_MEDIANS(Medians32, std::uint32_t)
ZARN_MEDIANS(Medians64, std::uint64_t)
#undef ZARN_MEDIANS
#define ZARN_TRIMMED_MEANS(name, T) \
  void name(const PoolSamples& pools) { TrimmedMeans<T>(pools); }
ZARN_TRIMMED_MEANS(TrimmedUInt8, std::uint8_t)
ZARN_TRIMMED_MEANS(TrimmedInt8, std::int8_t)
ZARN_TRIMMED_MEANS(TrimmedUInt16, std::uint16_t)
ZARN_TRIMMED_MEANS(TrimmedInt16, std::int16_t)
ZARN_TRIMMED_MEANS(TrimmedUInt32, std::uint32_t)
ZARN_TRIMMED_MEANS(TrimmedInt32, std::int32_t)
ZARN_TRIMMED_MEANS(TrimmedFloat32, float)
ZARN_TRIMMED_MEANS(TrimmedFloat64, double)
#undef ZARN_TRIMMED_MEANS

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {

// Explicit specialisations are exported unless told otherwise.
#define ZARN_HIDDEN __attribute__((visibility("hidden")))
#define ZARN_ENTRY(function, name, T)                      \
  HWY_EXPORT(name);                                        \
  template <>                                              \
  ZARN_HIDDEN void function<T>(const PoolSamples& pools) { \
    HWY_DYNAMIC_DISPATCH(name)(pools);                     \
  }
ZARN_ENTRY(PoolMedians, Medians8, std::uint8_t)
ZARN_ENTRY(PoolMedians, Medians16, std::uint16_t)
ZARN_ENTRY(PoolMedians, Medians32, std::uint32_t)
ZARN_ENTRY(PoolMedians, Medians64, std::uint64_t)
ZARN_ENTRY(PoolTrimmedMeans, TrimmedUInt8, std::uint8_t)
ZARN_ENTRY(PoolTrimmedMeans, TrimmedInt8, std::int8_t)
ZARN_ENTRY(PoolTrimmedMeans, TrimmedUInt16, std::uint16_t)
ZARN_ENTRY(PoolTrimmedMeans, TrimmedInt16, std::int16_t)
ZARN_ENTRY(PoolTrimmedMeans, TrimmedUInt32, std::uint32_t)
ZARN_ENTRY(PoolTrimmedMeans, TrimmedInt32, std::int32_t)
ZARN_ENTRY(PoolTrimmedMeans, TrimmedFloat32, float)
ZARN_ENTRY(PoolTrimmedMeans, TrimmedFloat64, double)

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
