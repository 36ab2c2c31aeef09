// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/colorbalance/gainoffsetcb_simd.h"

#include <hwy/cache_control.h>

#include <algorithm>
#include <cstdint>

#include "processes/filters/framework/converterconstants.h"
#include "processes/filters/framework/samplerows_simd.h"

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/colorbalance/gainoffsetcb_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#include "processes/filters/framework/outputconverter_simd.h"
#include "processes/filters/framework/pixelvectors_simd.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

template <typename T>
HWY_ATTR void ApplyPattern(const GainOffsetPattern<T>& pattern, const T* samples, std::size_t count,
                           T* results) {
  using D = hn::ScalableTag<double>;
  const D d;
  const std::size_t lanes = hn::Lanes(d);
  const std::size_t channels = pattern.channels;
  const std::size_t step = lanes % channels;
  const double* const gain = pattern.gain.data();
  const double* const offset = pattern.offset.data();
  const auto converters = [&](std::size_t phase) HWY_ATTR {
    const auto load = [&](const std::vector<double>& row)
                          HWY_ATTR { return hn::LoadU(d, row.data() + phase); };
    return ConverterVectors<T, D>(d, load(pattern.low), load(pattern.high), load(pattern.noData),
                                  load(pattern.replacement), pattern.avoids);
  };
  std::size_t phase = 0;  // the channel of a vector's first sample
  const auto applyAll = [&](const auto& convert) HWY_ATTR {
    const auto apply = [&](const T* from, T* to) HWY_ATTR {
      const auto v = hn::Mul(LoadDoubles(d, from), hn::LoadU(d, gain + phase));
      convert().Store(hn::Add(v, hn::LoadU(d, offset + phase)), to);
    };
    constexpr std::size_t kLine = 64 / sizeof(T);
    std::size_t i = 0;
    for (; i + kLine <= count; i += kLine) {
      hwy::Prefetch(samples + i + kBytesAhead / sizeof(T));
      for (std::size_t k = 0; k < kLine; k += lanes) {
        apply(samples + i + k, results + i + k);
        phase += step;
        if (phase >= channels) phase -= channels;
      }
    }
    for (; i < count; i += lanes) {
      // Nothing past the samples is touched.
      const std::size_t rest = std::min(count - i, lanes);
      HWY_ALIGN T buffer[hn::MaxLanes(d)] = {};
      std::copy_n(samples + i, rest, buffer);
      apply(buffer, buffer);
      std::copy_n(buffer, rest, results + i);
      phase += step;
      if (phase >= channels) phase -= channels;
    }
  };
  if (pattern.oneConverter) {
    const ConverterVectors<T, D> all = converters(0);
    applyAll([&]() HWY_ATTR -> const ConverterVectors<T, D>& { return all; });
  } else {
    applyAll([&]() HWY_ATTR { return converters(phase); });
  }
}

#define ZARN_SAMPLE_TYPES(macro)                                                       \
  macro(UInt16, std::uint16_t) macro(Int16, std::int16_t) macro(UInt32, std::uint32_t) \
      macro(Int32, std::int32_t) macro(Float32, float) macro(Float64, double)
// The dispatch table holds plain functions: one entry per sample type.
#define ZARN_APPLY(name, T)                                                                  \
  void Apply##name(const GainOffsetPattern<T>& pattern, const T* samples, std::size_t count, \
                   T* results) {                                                             \
    ApplyPattern(pattern, samples, count, results);                                          \
  }
ZARN_SAMPLE_TYPES(ZARN_APPLY)
#undef ZARN_APPLY

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {

template <typename T>
GainOffsetPattern<T>::GainOffsetPattern(const double* gains, const double* offsets,
                                        const std::vector<OutputConverter<T>>& converters)
    : channels(converters.size()) {
  constexpr std::size_t kMostLanes = 8;
  for (std::size_t i = 0; channels > 0 && i < channels + kMostLanes; ++i) {
    const ConverterConstants<T> constants(converters[i % channels]);
    gain.push_back(gains[i % channels]);
    offset.push_back(offsets[i % channels]);
    low.push_back(constants.low);
    high.push_back(constants.high);
    noData.push_back(constants.noData);
    replacement.push_back(constants.replacement);
    avoids = avoids || constants.avoids;
    oneConverter = oneConverter && constants == ConverterConstants<T>(converters.front());
  }
}

#define ZARN_APPLY_ENTRY(name, T)                                                           \
  HWY_EXPORT(Apply##name);                                                                  \
  template <>                                                                               \
  void GainOffsetPattern<T>::Apply(const T* samples, std::size_t count, T* results) const { \
    HWY_DYNAMIC_DISPATCH(Apply##name)(*this, samples, count, results);                      \
  }                                                                                         \
  template class GainOffsetPattern<T>;
ZARN_SAMPLE_TYPES(ZARN_APPLY_ENTRY)

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
