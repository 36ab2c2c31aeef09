// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/samplerows_simd.h"

#include <hwy/cache_control.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
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

/// A vector's pixels in memory: what is left of a run is copied here, so that nothing past it is
/// touched.
template <class D, std::size_t kChannels>
struct PixelBuffer {
  using T = hn::TFromD<D>;

  HWY_INLINE T* Fill(const T* pixels, std::size_t count) {
    std::copy_n(pixels, count * kChannels, samples);
    return samples;
  }

  HWY_ALIGN T samples[kChannels * hn::MaxLanes(D())] = {};
};

template <typename T>
HWY_ATTR void Widen(const T* pixels, std::size_t count, std::size_t channels, const T* ahead,
                    double* values, std::size_t pitch) {
  using D = hn::ScalableTag<T>;
  const D d;
  const hn::ScalableTag<double> wide;
  const bool done = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    PixelBuffer<D, kChannels> buffer;
    for (std::size_t i = 0; i < count; i += hn::Lanes(d)) {
      const T* from = pixels + i * kChannels;
      if (i + hn::Lanes(d) > count) from = buffer.Fill(from, count - i);
      for (std::size_t c = 0; c < kChannels; ++c) {
        hwy::Prefetch(ahead + i * kChannels + c * hn::Lanes(d));
      }
      const PixelVectors<D, kChannels> v(d, from);
      for (std::size_t c = 0; c < kChannels; ++c) {
        HWY_ALIGN T row[hn::MaxLanes(d)];
        hn::Store(v.channel[c], d, row);
        for (std::size_t k = 0; k < hn::Lanes(d); k += hn::Lanes(wide)) {
          hn::StoreU(LoadDoubles(wide, row + k), wide, values + c * pitch + i + k);
        }
      }
    }
  });
  if (done) return;
  for (std::size_t c = 0; c < channels; ++c) {
    for (std::size_t i = 0; i < count; ++i) {
      values[c * pitch + i] = static_cast<double>(pixels[i * channels + c]);
    }
  }
}

template <typename T>
HWY_ATTR void Narrow(const double* values, std::size_t pitch, std::size_t count,
                     std::size_t channels, const ConverterConstants<T>* converters, const T* ahead,
                     T* pixels) {
  using D = hn::ScalableTag<T>;
  using Wide = hn::ScalableTag<double>;
  const D d;
  const Wide wide;
  // Long enough that its first samples have left the store buffer when they are read again.
  constexpr std::size_t kRow = 256;
  const auto narrow = [&](std::size_t begin, std::size_t end, std::size_t c, T* row) HWY_ATTR {
    const ConverterVectors<T, Wide> convert(wide, converters[c]);
    const T* const wanted = ahead + (begin + c * (end - begin));
    for (std::size_t i = begin; i < end; i += hn::Lanes(wide)) {
      hwy::Prefetch(wanted + (i - begin));
      convert.Store(hn::LoadU(wide, values + c * pitch + i), row + (i - begin));
    }
  };
  const bool done = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    HWY_ALIGN T rows[kChannels][kRow];
    for (std::size_t begin = 0; begin < count; begin += kRow) {
      const std::size_t end = std::min(count, begin + kRow);
      for (std::size_t c = 0; c < kChannels; ++c) narrow(begin, end, c, rows[c]);
      for (std::size_t i = begin; i < end; i += hn::Lanes(d)) {
        PixelVectors<D, kChannels> v(d);
        for (std::size_t c = 0; c < kChannels; ++c) {
          v.channel[c] = hn::Load(d, rows[c] + (i - begin));
        }
        if (i + hn::Lanes(d) <= end) {
          v.Store(pixels + i * kChannels);
        } else {
          PixelBuffer<D, kChannels> buffer;
          v.Store(buffer.samples);
          std::copy_n(buffer.samples, (end - i) * kChannels, pixels + i * kChannels);
        }
      }
    }
  });
  if (done) return;
  HWY_ALIGN T row[kRow];
  for (std::size_t begin = 0; begin < count; begin += kRow) {
    const std::size_t end = std::min(count, begin + kRow);
    for (std::size_t c = 0; c < channels; ++c) {
      narrow(begin, end, c, row);
      for (std::size_t i = begin; i < end; ++i) pixels[i * channels + c] = row[i - begin];
    }
  }
}

/// Whether `PixelNearlyEquals` may compare in the sample's own type: the difference of a float to
/// this value is then exact, or clearly above the tolerance.
template <typename T>
bool ComparesInOwnType(T noData) {
  return !std::is_same_v<T, float> || noData == 0 ||
         !(std::abs(static_cast<double>(noData)) < 0x1p-28);
}

template <typename T>
HWY_ATTR bool Flag(const T* pixels, std::size_t count, std::size_t channels, const T* noData,
                   const std::uint8_t* mask, std::uint8_t* flags) {
  using D = hn::ScalableTag<T>;
  const D d;
  const hn::Rebind<std::uint8_t, D> d8;
  bool any = false;
  const auto usePixelVectors = [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    auto found = hn::Zero(d8);
    const auto flag = [&](const T* from, const std::uint8_t* maskFrom, std::size_t i) HWY_ATTR {
      auto excluded = hn::MaskFromVec(hn::Zero(d));
      if (noData != nullptr) {
        excluded = PixelVectors<D, kChannels>(d, from).NearlyEqual(noData);
      }
      if (mask != nullptr) excluded = hn::Or(excluded, hn::Not(LoadFlags(d, maskFrom)));
      StoreFlags(d, excluded, flags + i);
      return hn::LoadU(d8, flags + i);
    };
    std::size_t i = 0;
    for (; i + hn::Lanes(d) <= count; i += hn::Lanes(d)) {
      found = hn::Or(found, flag(pixels + i * kChannels, mask == nullptr ? nullptr : mask + i, i));
    }
    if (i < count) {
      PixelBuffer<D, kChannels> buffer;
      PixelBuffer<decltype(d8), 1> maskBuffer;
      const std::uint8_t* const maskRest =
          mask == nullptr ? nullptr : maskBuffer.Fill(mask + i, count - i);
      const auto rest = flag(buffer.Fill(pixels + i * kChannels, count - i), maskRest, i);
      // What lies beyond the row does not count.
      found = hn::Or(found, hn::IfThenElseZero(hn::FirstN(d8, count - i), rest));
    }
    any = !hn::AllTrue(d8, hn::Eq(found, hn::Zero(d8)));
  };
  const bool plain =
      noData == nullptr || std::all_of(noData, noData + channels, ComparesInOwnType<T>);
  if (plain && WithPixelVectors(channels, usePixelVectors)) return any;
  for (std::size_t i = 0; i < count; ++i) {
    const bool excluded =
        (mask != nullptr && mask[i] == 0) ||
        (noData != nullptr && PixelNearlyEquals(pixels + i * channels, noData, channels));
    flags[i] = excluded ? 1 : 0;
    any = any || excluded;
  }
  return any;
}

template <typename T>
HWY_ATTR void FlagSame(const T* pixels, std::size_t count, std::size_t channels, const T* value,
                       std::uint8_t* flags) {
  const bool done = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    using D = hn::ScalableTag<T>;
    const D d;
    std::size_t i = 0;
    for (; i + hn::Lanes(d) <= count; i += hn::Lanes(d)) {
      StoreFlags(d, PixelVectors<D, kChannels>(d, pixels + i * kChannels).Equal(value), flags + i);
    }
    if (i == count) return;
    PixelBuffer<D, kChannels> buffer;
    const T* const rest = buffer.Fill(pixels + i * kChannels, count - i);
    StoreFlags(d, PixelVectors<D, kChannels>(d, rest).Equal(value), flags + i);
  });
  for (std::size_t i = 0; !done && i < count; ++i) {
    flags[i] = PixelEquals(pixels + i * channels, value, channels) ? 1 : 0;
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
    const auto lookUp = [&](const std::uint8_t* from, std::uint8_t* to) HWY_ATTR {
      PixelVectors<D, kChannels> v(d, from);
      for (std::size_t c = 0; c < kChannels; ++c) {
        v.channel[c] = LookUpVector(d, v.channel[c], tables[c].data());
      }
      v.Store(to);
    };
    std::size_t i = 0;
    for (; i + hn::Lanes(d) <= count; i += hn::Lanes(d)) {
      for (std::size_t c = 0; c < kChannels; ++c) {
        hwy::Prefetch(pixels + i * kChannels + kBytesAhead + c * hn::Lanes(d));
      }
      lookUp(pixels + i * kChannels, results + i * kChannels);
    }
    if (i == count) return;
    PixelBuffer<D, kChannels> buffer;
    lookUp(buffer.Fill(pixels + i * kChannels, count - i), buffer.samples);
    std::copy_n(buffer.samples, (count - i) * kChannels, results + i * kChannels);
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
  for (; i + lanes <= count; i += lanes) any = hn::Or(any, isNear(samples + i));
  if (i < count) {
    PixelBuffer<decltype(d), 1> buffer;
    const auto rest = isNear(buffer.Fill(samples + i, count - i));
    any = hn::Or(any, hn::And(rest, hn::FirstN(d, count - i)));
  }
  return !hn::AllFalse(d, any);
}

template <typename T>
HWY_ATTR void Replace(const std::uint8_t* flags, const T* value, std::size_t count,
                      std::size_t channels, T* pixels) {
  const bool done = WithPixelVectors(channels, [&](auto constant) HWY_ATTR {
    constexpr std::size_t kChannels = constant();
    using D = hn::ScalableTag<T>;
    const D d;
    const auto replace = [&](std::size_t i, T* at) HWY_ATTR {
      const auto isExcluded = LoadFlags(d, flags + i);
      if (hn::AllFalse(d, isExcluded)) return;
      PixelVectors<D, kChannels> v(d, at);
      v.Replace(isExcluded, value);
      v.Store(at);
    };
    std::size_t i = 0;
    for (; i + hn::Lanes(d) <= count; i += hn::Lanes(d)) replace(i, pixels + i * kChannels);
    if (i == count) return;
    PixelBuffer<D, kChannels> buffer;
    replace(i, buffer.Fill(pixels + i * kChannels, count - i));
    std::copy_n(buffer.samples, (count - i) * kChannels, pixels + i * kChannels);
  });
  if (done) return;
  for (std::size_t i = 0; i < count; ++i) {
    if (flags[i] != 0) std::copy_n(value, channels, pixels + i * channels);
  }
}

// The dispatch table holds plain functions: one entry per sample type.
#define ZARN_ROW_FUNCTIONS(name, T)                                                                \
  void Widen##name(const T* pixels, std::size_t count, std::size_t channels, const T* ahead,       \
                   double* values, std::size_t pitch) {                                            \
    Widen(pixels, count, channels, ahead, values, pitch);                                          \
  }                                                                                                \
  void Narrow##name(const double* values, std::size_t pitch, std::size_t count,                    \
                    std::size_t channels, const ConverterConstants<T>* converters, const T* ahead, \
                    T* pixels) {                                                                   \
    Narrow(values, pitch, count, channels, converters, ahead, pixels);                             \
  }                                                                                                \
  bool Flag##name(const T* pixels, std::size_t count, std::size_t channels, const T* noData,       \
                  const std::uint8_t* mask, std::uint8_t* flags) {                                 \
    return Flag(pixels, count, channels, noData, mask, flags);                                     \
  }                                                                                                \
  void FlagSame##name(const T* pixels, std::size_t count, std::size_t channels, const T* value,    \
                      std::uint8_t* flags) {                                                       \
    FlagSame(pixels, count, channels, value, flags);                                               \
  }                                                                                                \
  bool AnyNear##name(const T* samples, std::size_t count, T value) {                               \
    return AnyNear(samples, count, value);                                                         \
  }                                                                                                \
  void Replace##name(const std::uint8_t* flags, const T* value, std::size_t count,                 \
                     std::size_t channels, T* pixels) {                                            \
    Replace(flags, value, count, channels, pixels);                                                \
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
#define ZARN_ROW_ENTRIES(name, T)                                                                  \
  HWY_EXPORT(Widen##name);                                                                         \
  HWY_EXPORT(Narrow##name);                                                                        \
  HWY_EXPORT(Flag##name);                                                                          \
  HWY_EXPORT(FlagSame##name);                                                                      \
  HWY_EXPORT(AnyNear##name);                                                                       \
  HWY_EXPORT(Replace##name);                                                                       \
  template <>                                                                                      \
  ZARN_HIDDEN void WidenPixels(const T* pixels, std::size_t count, std::size_t channels,           \
                               const T* ahead, double* values, std::size_t pitch) {                \
    HWY_DYNAMIC_DISPATCH(Widen##name)(pixels, count, channels, ahead, values, pitch);              \
  }                                                                                                \
  template <>                                                                                      \
  ZARN_HIDDEN void NarrowPixels(const double* values, std::size_t pitch, std::size_t count,        \
                                std::size_t channels, const ConverterConstants<T>* converters,     \
                                const T* ahead, T* pixels) {                                       \
    HWY_DYNAMIC_DISPATCH(Narrow##name)(values, pitch, count, channels, converters, ahead, pixels); \
  }                                                                                                \
  template <>                                                                                      \
  ZARN_HIDDEN bool FlagExcluded(const T* pixels, std::size_t count, std::size_t channels,          \
                                const T* noData, const std::uint8_t* mask, std::uint8_t* flags) {  \
    return HWY_DYNAMIC_DISPATCH(Flag##name)(pixels, count, channels, noData, mask, flags);         \
  }                                                                                                \
  template <>                                                                                      \
  ZARN_HIDDEN void FlagEqual(const T* pixels, std::size_t count, std::size_t channels,             \
                             const T* value, std::uint8_t* flags) {                                \
    HWY_DYNAMIC_DISPATCH(FlagSame##name)(pixels, count, channels, value, flags);                   \
  }                                                                                                \
  template <>                                                                                      \
  ZARN_HIDDEN bool AnySampleNear(const T* samples, std::size_t count, T value) {                   \
    return HWY_DYNAMIC_DISPATCH(AnyNear##name)(samples, count, value);                             \
  }                                                                                                \
  template <>                                                                                      \
  ZARN_HIDDEN void ReplaceExcluded(const std::uint8_t* flags, const T* value, std::size_t count,   \
                                   std::size_t channels, T* pixels) {                              \
    HWY_DYNAMIC_DISPATCH(Replace##name)(flags, value, count, channels, pixels);                    \
  }
ZARN_SAMPLE_TYPES(ZARN_ROW_ENTRIES)

HWY_EXPORT(Vectors);
bool HasVectors() { return HWY_DYNAMIC_DISPATCH(Vectors)(); }

HWY_EXPORT(LookUp);
void LookUpBytes(const std::uint8_t* pixels, std::size_t count, std::size_t channels,
                 const ByteTable* tables, std::uint8_t* results) {
  HWY_DYNAMIC_DISPATCH(LookUp)(pixels, count, channels, tables, results);
}

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
