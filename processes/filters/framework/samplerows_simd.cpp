// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/samplerows_simd.h"

#include <hwy/cache_control.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <limits>
#include <type_traits>

#include "processes/filters/framework/nodata.h"

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/framework/samplerows_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#include "processes/filters/framework/outputconverter_simd.h"
#include "processes/filters/framework/pixelvectors_simd.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

bool Vectors() { return HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128; }

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
                   const ExcludedPixels<T>& excluded, T* pixels) {
  const ExcludedPixels<T> e = excluded;
  const bool done = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    const hn::ScalableTag<T> d;
    for (std::size_t i = 0; i < count; i += hn::Lanes(d)) {
      PixelVectors<hn::ScalableTag<T>, kChannels> v(d);
      for (std::size_t c = 0; c < kChannels; ++c) {
        v.channel[c] = hn::LoadU(d, planes + c * pitch + i);
      }
      if (e.flags != nullptr) {
        const auto isExcluded = LoadFlags(d, e.flags + i);
        if (e.value != nullptr) {
          v.Replace(isExcluded, e.value);
        } else {
          v.Replace(isExcluded,
                    PixelVectors<hn::ScalableTag<T>, kChannels>(d, e.old + i * kChannels));
        }
      }
      v.Store(pixels + i * kChannels);
    }
  });
  if (done) return;
  for (std::size_t i = 0; i < count; ++i) {
    const bool isExcluded = e.flags != nullptr && e.flags[i] != 0;
    for (std::size_t c = 0; c < channels; ++c) {
      const std::size_t at = i * channels + c;
      pixels[at] = !isExcluded          ? planes[c * pitch + i]
                   : e.value != nullptr ? e.value[c]
                                        : e.old[at];
    }
  }
}

template <typename T>
HWY_ATTR bool Flag(const T* planes, std::size_t pitch, std::size_t count, std::size_t channels,
                   const T* noData, const std::uint8_t* mask, std::uint8_t* flags) {
  // Only floats have to be compared in double.
  using Lane = std::conditional_t<std::is_same_v<T, float>, double, T>;
  const hn::ScalableTag<Lane> d;
  const hn::Rebind<std::uint8_t, decltype(d)> d8;
  auto any = hn::Zero(d8);
  const auto flag = [&](std::size_t i) HWY_ATTR {
    auto excluded = hn::MaskFromVec(hn::Zero(d));
    if (noData != nullptr) {
      excluded = NearlyEqual(d, planes + i, noData[0]);
      for (std::size_t c = 1; c < channels; ++c) {
        excluded = hn::And(excluded, NearlyEqual(d, planes + c * pitch + i, noData[c]));
      }
    }
    if (mask != nullptr) excluded = hn::Or(excluded, hn::Not(LoadFlags(d, mask + i)));
    StoreFlags(d, excluded, flags + i);
    return hn::LoadU(d8, flags + i);
  };
  std::size_t i = 0;
  for (; i + hn::Lanes(d) <= count; i += hn::Lanes(d)) any = hn::Or(any, flag(i));
  // What lies beyond the row does not count.
  if (i < count) any = hn::Or(any, hn::IfThenElseZero(hn::FirstN(d8, count - i), flag(i)));
  return !hn::AllTrue(d8, hn::Eq(any, hn::Zero(d8)));
}

template <typename T>
HWY_ATTR void Widen(const T* samples, std::size_t count, double* values) {
  const hn::ScalableTag<double> d;
  for (std::size_t i = 0; i < count; i += hn::Lanes(d)) {
    hn::StoreU(LoadDoubles(d, samples + i), d, values + i);
  }
}

template <typename T>
HWY_ATTR void Narrow(const double* values, std::size_t count, const OutputConverter<T>& converter,
                     T* samples) {
  const hn::ScalableTag<double> d;
  const ConverterConstants<T> constants(converter);
  const ConverterVectors<T, decltype(d)> convert(d, constants);
  for (std::size_t i = 0; i < count; i += hn::Lanes(d)) {
    convert.Store(hn::LoadU(d, values + i), samples + i);
  }
}

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
// All sixteen parts of the table are looked up by the low four bits; the high bits choose.
template <class D>
HWY_INLINE hn::Vec<D> LookUpVector(D d, hn::Vec<D> v, const std::uint8_t* table) {
  const auto low = hn::And(v, hn::Set(d, 0x0F));
  const auto bit4 = hn::TestBit(v, hn::Set(d, 0x10));
  const auto bit5 = hn::TestBit(v, hn::Set(d, 0x20));
  const auto bit6 = hn::TestBit(v, hn::Set(d, 0x40));
  const auto bit7 = hn::TestBit(v, hn::Set(d, 0x80));
  const auto part = [&](std::size_t p) HWY_ATTR {
    return hn::TableLookupBytes(hn::LoadDup128(d, table + 16 * p), low);
  };
  const auto two = [&](std::size_t p)
                       HWY_ATTR { return hn::IfThenElse(bit4, part(p + 1), part(p)); };
  const auto four = [&](std::size_t p)
                        HWY_ATTR { return hn::IfThenElse(bit5, two(p + 2), two(p)); };
  const auto eight = [&](std::size_t p)
                         HWY_ATTR { return hn::IfThenElse(bit6, four(p + 4), four(p)); };
  return hn::IfThenElse(bit7, eight(8), eight(0));
}
#endif

HWY_ATTR void LookUp(const std::uint8_t* pixels, std::size_t count, std::size_t channels,
                     const ByteTable* tables, std::uint8_t* results) {
#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
  const bool done = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    using D = hn::ScalableTag<std::uint8_t>;
    const D d;
    for (std::size_t i = 0; i < count; i += hn::Lanes(d)) {
      for (std::size_t c = 0; c < kChannels; ++c) {
        hwy::Prefetch(pixels + i * kChannels + kBytesAhead + c * hn::Lanes(d));
      }
      PixelVectors<D, kChannels> v(d, pixels + i * kChannels);
      for (std::size_t c = 0; c < kChannels; ++c) {
        v.channel[c] = LookUpVector(d, v.channel[c], tables[c].data());
      }
      v.Store(results + i * kChannels);
    }
  });
  if (done) return;
#endif
  for (std::size_t i = 0; i < count * channels; ++i) results[i] = tables[i % channels][pixels[i]];
}

template <typename T>
HWY_ATTR bool AnyNear(const T* samples, std::size_t count, T value) {
  const hn::ScalableTag<T> d;
  const std::size_t lanes = hn::Lanes(d);
  const auto wanted = hn::Set(d, value);
  auto any = hn::MaskFromVec(hn::Zero(d));
  const auto isNear = [&](const T* from) HWY_ATTR {
    const auto v = hn::LoadU(d, from);
    if constexpr (std::is_floating_point_v<T>) {
      // Wide enough for the difference's rounding.
      return hn::Lt(hn::Abs(hn::Sub(v, wanted)), hn::Set(d, static_cast<T>(2 * kNoDataTolerance)));
    } else {
      return hn::Eq(v, wanted);
    }
  };
  std::size_t i = 0;
  for (; i + lanes <= count; i += lanes) {
    hwy::Prefetch(samples + i + kBytesAhead / sizeof(T));
    any = hn::Or(any, isNear(samples + i));
  }
  const auto rest = hn::And(isNear(samples + i), hn::FirstN(d, count - i));
  return !hn::AllFalse(d, hn::Or(any, rest));
}

template <typename T>
HWY_ATTR void Replace(const ExcludedPixels<T>& excluded, std::size_t count, std::size_t channels,
                      T* pixels) {
  const ExcludedPixels<T> e = excluded;
  const bool done = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    using D = hn::ScalableTag<T>;
    const D d;
    for (std::size_t i = 0; i < count; i += hn::Lanes(d)) {
      const auto isExcluded = LoadFlags(d, e.flags + i);
      if (hn::AllFalse(d, isExcluded)) continue;
      PixelVectors<D, kChannels> v(d, pixels + i * kChannels);
      if (e.value != nullptr) {
        v.Replace(isExcluded, e.value);
      } else {
        v.Replace(isExcluded, PixelVectors<D, kChannels>(d, e.old + i * kChannels));
      }
      v.Store(pixels + i * kChannels);
    }
  });
  if (done) return;
  for (std::size_t i = 0; i < count * channels; ++i) {
    if (e.flags[i / channels] == 0) continue;
    pixels[i] = e.value != nullptr ? e.value[i % channels] : e.old[i];
  }
}

HWY_ATTR void StreamAligned(const std::byte* from, std::size_t size, std::byte* to) {
  const hn::ScalableTag<std::uint8_t> d;
  const auto* const source = reinterpret_cast<const std::uint8_t*>(from);
  auto* const target = reinterpret_cast<std::uint8_t*>(to);
  for (std::size_t i = 0; i < size; i += hn::Lanes(d)) {
    hn::Stream(hn::LoadU(d, source + i), d, target + i);
  }
}

// The dispatch table holds plain functions: one entry per sample type.
#define ZARN_ROW_FUNCTIONS(name, T)                                                               \
  void Split##name(const T* pixels, std::size_t count, std::size_t channels, T* planes,           \
                   std::size_t pitch) {                                                           \
    Split(pixels, count, channels, planes, pitch);                                                \
  }                                                                                               \
  void Join##name(const T* planes, std::size_t pitch, std::size_t count, std::size_t channels,    \
                  const ExcludedPixels<T>& excluded, T* pixels) {                                 \
    Join(planes, pitch, count, channels, excluded, pixels);                                       \
  }                                                                                               \
  bool Flag##name(const T* planes, std::size_t pitch, std::size_t count, std::size_t channels,    \
                  const T* noData, const std::uint8_t* mask, std::uint8_t* flags) {               \
    return Flag(planes, pitch, count, channels, noData, mask, flags);                             \
  }                                                                                               \
  bool AnyNear##name(const T* samples, std::size_t count, T value) {                              \
    return AnyNear(samples, count, value);                                                        \
  }                                                                                               \
  void Replace##name(const ExcludedPixels<T>& excluded, std::size_t count, std::size_t channels,  \
                     T* pixels) {                                                                 \
    Replace(excluded, count, channels, pixels);                                                   \
  }                                                                                               \
  void Widen##name(const T* samples, std::size_t count, double* values) {                         \
    Widen(samples, count, values);                                                                \
  }                                                                                               \
  void Narrow##name(const double* values, std::size_t count, const OutputConverter<T>& converter, \
                    T* samples) {                                                                 \
    Narrow(values, count, converter, samples);                                                    \
  }
#define ZARN_SAMPLE_TYPES(macro)                                                         \
  macro(UInt8, std::uint8_t) macro(Int8, std::int8_t) macro(UInt16, std::uint16_t)       \
      macro(Int16, std::int16_t) macro(UInt32, std::uint32_t) macro(Int32, std::int32_t) \
          macro(Float32, float) macro(Float64, double)
ZARN_SAMPLE_TYPES(ZARN_ROW_FUNCTIONS)

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {

// Explicit specialisations are exported unless told otherwise.
#define ZARN_HIDDEN __attribute__((visibility("hidden")))
#define ZARN_ROW_ENTRIES(name, T)                                                                 \
  HWY_EXPORT(Split##name);                                                                        \
  HWY_EXPORT(Join##name);                                                                         \
  HWY_EXPORT(Flag##name);                                                                         \
  HWY_EXPORT(AnyNear##name);                                                                      \
  HWY_EXPORT(Replace##name);                                                                      \
  HWY_EXPORT(Widen##name);                                                                        \
  HWY_EXPORT(Narrow##name);                                                                       \
  template <>                                                                                     \
  ZARN_HIDDEN void SplitChannels(const T* pixels, std::size_t count, std::size_t channels,        \
                                 T* planes, std::size_t pitch) {                                  \
    HWY_DYNAMIC_DISPATCH(Split##name)(pixels, count, channels, planes, pitch);                    \
  }                                                                                               \
  template <>                                                                                     \
  ZARN_HIDDEN void JoinChannels(const T* planes, std::size_t pitch, std::size_t count,            \
                                std::size_t channels, const ExcludedPixels<T>& excluded,          \
                                T* pixels) {                                                      \
    HWY_DYNAMIC_DISPATCH(Join##name)(planes, pitch, count, channels, excluded, pixels);           \
  }                                                                                               \
  template <>                                                                                     \
  ZARN_HIDDEN bool FlagExcluded(const T* planes, std::size_t pitch, std::size_t count,            \
                                std::size_t channels, const T* noData, const std::uint8_t* mask,  \
                                std::uint8_t* flags) {                                            \
    return HWY_DYNAMIC_DISPATCH(Flag##name)(planes, pitch, count, channels, noData, mask, flags); \
  }                                                                                               \
  template <>                                                                                     \
  ZARN_HIDDEN bool AnySampleNear(const T* samples, std::size_t count, T value) {                  \
    return HWY_DYNAMIC_DISPATCH(AnyNear##name)(samples, count, value);                            \
  }                                                                                               \
  template <>                                                                                     \
  ZARN_HIDDEN void ReplaceExcluded(const ExcludedPixels<T>& excluded, std::size_t count,          \
                                   std::size_t channels, T* pixels) {                             \
    HWY_DYNAMIC_DISPATCH(Replace##name)(excluded, count, channels, pixels);                       \
  }                                                                                               \
  template <>                                                                                     \
  ZARN_HIDDEN void WidenSamples(const T* samples, std::size_t count, double* values) {            \
    HWY_DYNAMIC_DISPATCH(Widen##name)(samples, count, values);                                    \
  }                                                                                               \
  template <>                                                                                     \
  ZARN_HIDDEN void NarrowSamples(const double* values, std::size_t count,                         \
                                 const OutputConverter<T>& converter, T* samples) {               \
    HWY_DYNAMIC_DISPATCH(Narrow##name)(values, count, converter, samples);                        \
  }
ZARN_SAMPLE_TYPES(ZARN_ROW_ENTRIES)

HWY_EXPORT(Vectors);
bool HasVectors() { return HWY_DYNAMIC_DISPATCH(Vectors)(); }

HWY_EXPORT(LookUp);
void LookUpBytes(const std::uint8_t* pixels, std::size_t count, std::size_t channels,
                 const ByteTable* tables, std::uint8_t* results) {
  HWY_DYNAMIC_DISPATCH(LookUp)(pixels, count, channels, tables, results);
}

HWY_EXPORT(StreamAligned);
void StreamBytes(const std::byte* from, std::size_t size, std::byte* to) {
  constexpr std::size_t kAlignment = 64;
  const std::size_t past = reinterpret_cast<std::uintptr_t>(to) % kAlignment;
  const std::size_t head = std::min(size, past == 0 ? 0 : kAlignment - past);
  const std::size_t body = (size - head) / kAlignment * kAlignment;
  std::memcpy(to, from, head);
  HWY_DYNAMIC_DISPATCH(StreamAligned)(from + head, body, to + head);
  std::memcpy(to + head + body, from + head + body, size - head - body);
}

void FinishStreaming() { hwy::FlushStream(); }

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
