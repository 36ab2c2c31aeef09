// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/attribute/poolplanes_simd.h"

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/attribute/poolplanes_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#include "processes/filters/framework/pixelvectors_simd.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

template <typename T>
HWY_ATTR void Split(const T* pixels, std::size_t count, std::size_t channels, T* planes,
                    std::size_t pitch) {
  const bool done = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    const hn::ScalableTag<T> d;
    for (std::size_t i = 0; i < count; i += hn::Lanes(d)) {
      const PixelVectors<hn::ScalableTag<T>, kChannels> v(d, pixels + i * kChannels);
      for (std::size_t c = 0; c < kChannels; ++c) {
        hn::StoreU(v.channel[c], d, planes + c * pitch + i);
      }
    }
  });
  if (done) return;
  for (std::size_t c = 0; c < channels; ++c) {
    for (std::size_t i = 0; i < count; ++i) planes[c * pitch + i] = pixels[i * channels + c];
  }
}

template <typename T>
HWY_ATTR void Join(const T* planes, std::size_t pitch, std::size_t count, std::size_t channels,
                   T* pixels) {
  const bool done = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    const hn::ScalableTag<T> d;
    for (std::size_t i = 0; i < count; i += hn::Lanes(d)) {
      PixelVectors<hn::ScalableTag<T>, kChannels> v(d);
      for (std::size_t c = 0; c < kChannels; ++c) {
        v.channel[c] = hn::LoadU(d, planes + c * pitch + i);
      }
      v.Store(pixels + i * kChannels);
    }
  });
  if (done) return;
  for (std::size_t c = 0; c < channels; ++c) {
    for (std::size_t i = 0; i < count; ++i) pixels[i * channels + c] = planes[c * pitch + i];
  }
}

// The dispatch table holds plain functions: one entry per sample type.
#define ZARN_PLANE_FUNCTIONS(name, T)                                                          \
  void Split##name(const T* pixels, std::size_t count, std::size_t channels, T* planes,        \
                   std::size_t pitch) {                                                        \
    Split(pixels, count, channels, planes, pitch);                                             \
  }                                                                                            \
  void Join##name(const T* planes, std::size_t pitch, std::size_t count, std::size_t channels, \
                  T* pixels) {                                                                 \
    Join(planes, pitch, count, channels, pixels);                                              \
  }
#define ZARN_SAMPLE_TYPES(macro)                                                         \
  macro(UInt8, std::uint8_t) macro(Int8, std::int8_t) macro(UInt16, std::uint16_t)       \
      macro(Int16, std::int16_t) macro(UInt32, std::uint32_t) macro(Int32, std::int32_t) \
          macro(Float32, float) macro(Float64, double)
ZARN_SAMPLE_TYPES(ZARN_PLANE_FUNCTIONS)

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {

// Explicit specialisations are exported unless told otherwise.
#define ZARN_HIDDEN __attribute__((visibility("hidden")))
#define ZARN_PLANE_ENTRIES(name, T)                                                        \
  HWY_EXPORT(Split##name);                                                                 \
  HWY_EXPORT(Join##name);                                                                  \
  template <>                                                                              \
  ZARN_HIDDEN void SplitChannels(const T* pixels, std::size_t count, std::size_t channels, \
                                 T* planes, std::size_t pitch) {                           \
    HWY_DYNAMIC_DISPATCH(Split##name)(pixels, count, channels, planes, pitch);             \
  }                                                                                        \
  template <>                                                                              \
  ZARN_HIDDEN void JoinChannels(const T* planes, std::size_t pitch, std::size_t count,     \
                                std::size_t channels, T* pixels) {                         \
    HWY_DYNAMIC_DISPATCH(Join##name)(planes, pitch, count, channels, pixels);              \
  }
ZARN_SAMPLE_TYPES(ZARN_PLANE_ENTRIES)

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
