// SPDX-License-Identifier: Apache-2.0
#include <type_traits>

#include "processes/filters/attribute/poolstatistics_simd.h"

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/attribute/poolmeans_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
#include "processes/filters/attribute/poolsums_simd.h"
#endif

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128

/// Sums in lanes twice as wide as the keys.
template <typename T>
HWY_ATTR void MeansOfKeys(const PoolSamples& pools, const OrderedKey<T>* counts) {
  using Key = OrderedKey<T>;
  const hn::ScalableTag<Key> d;
  const std::size_t offset = pools.channel + pools.first;
  for (std::size_t x = 0; x < pools.count; x += hn::Lanes(d)) {
    KeySums<T> sums;
    const std::uint8_t* flags = pools.flags + x;
    for (std::size_t k = 0; k < pools.cellCount; ++k, flags += pools.pitch) {
      const auto keys = hn::LoadU(d, static_cast<const Key*>(pools.cells[k]) + offset + x);
      sums.Add(hn::And(keys, LoadPooled(d, flags)));
    }
    hn::StoreU(sums.Means(hn::LoadU(d, counts + x)), d, static_cast<Key*>(pools.results) + x);
  }
}

/// Sums in double, in the order of the cells.
template <typename T>
HWY_ATTR void MeansInDouble(const PoolSamples& pools) {
  using Sample = std::conditional_t<std::is_floating_point_v<T>, T, OrderedKey<T>>;
  const hn::ScalableTag<double> d;
  const hn::RebindToUnsigned<decltype(d)> du;
  const std::size_t offset = pools.channel + pools.first;
  for (std::size_t x = 0; x < pools.count; x += hn::Lanes(d)) {
    auto sum = hn::Zero(d);
    const std::uint8_t* flags = pools.flags + x;
    for (std::size_t k = 0; k < pools.cellCount; ++k, flags += pools.pitch) {
      const auto samples = LoadDoubles(d, static_cast<const Sample*>(pools.cells[k]) + offset + x);
      // Adding zero changes no sum: none is ever -0.
      sum = hn::Add(sum, hn::And(samples, hn::BitCast(d, LoadPooled(du, flags))));
    }
    const auto counts = LoadCounts(d, pools.counts16 + x);
    if constexpr (std::is_integral_v<T> && std::is_signed_v<T>) {
      const double bias = static_cast<double>(kTopBit<T>);
      sum = hn::Sub(sum, hn::Mul(counts, hn::Set(d, bias)));
    }
    StoreTruncated(d, hn::Div(sum, counts), static_cast<T*>(pools.results) + x);
  }
}

template <typename T>
HWY_ATTR void Means(const PoolSamples& pools) {
  if constexpr (sizeof(T) == 1) {
    if (pools.cellCount <= 255) return MeansOfKeys<T>(pools, pools.counts8);
  }
  if constexpr (sizeof(T) == 2) return MeansOfKeys<T>(pools, pools.counts16);
  MeansInDouble<T>(pools);
}

#else

// Never called: the definition takes the place of emulated vectors.
template <typename T>
void Means(const PoolSamples&) {}

#endif

// The dispatch table holds plain functions.
#define ZARN_MEANS(name, T) \
  void name(const PoolSamples& pools) { Means<T>(pools); }
ZARN_MEANS(MeansUInt8, std::uint8_t)
ZARN_MEANS(MeansInt8, std::int8_t)
ZARN_MEANS(MeansUInt16, std::uint16_t)
ZARN_MEANS(MeansInt16, std::int16_t)
ZARN_MEANS(MeansUInt32, std::uint32_t)
ZARN_MEANS(MeansInt32, std::int32_t)
ZARN_MEANS(MeansFloat32, float)
ZARN_MEANS(MeansFloat64, double)
#undef ZARN_MEANS

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {

// Explicit specialisations are exported unless told otherwise.
#define ZARN_HIDDEN __attribute__((visibility("hidden")))
#define ZARN_MEANS(name, T)                                 \
  HWY_EXPORT(name);                                         \
  template <>                                               \
  ZARN_HIDDEN void PoolMeans<T>(const PoolSamples& pools) { \
    HWY_DYNAMIC_DISPATCH(name)(pools);                      \
  }
ZARN_MEANS(MeansUInt8, std::uint8_t)
ZARN_MEANS(MeansInt8, std::int8_t)
ZARN_MEANS(MeansUInt16, std::uint16_t)
ZARN_MEANS(MeansInt16, std::int16_t)
ZARN_MEANS(MeansUInt32, std::uint32_t)
ZARN_MEANS(MeansInt32, std::int32_t)
ZARN_MEANS(MeansFloat32, float)
ZARN_MEANS(MeansFloat64, double)

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
