// SPDX-License-Identifier: Apache-2.0
#include "host/utils/resample_simd.h"

#include <hwy/cache_control.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <type_traits>
#include <utility>

// Targets that share their kernels with another one, and those whose vectors may be longer than a
// run or of unknown length.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "host/utils/resample_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#ifndef ZARN_HOST_UTILS_RESAMPLE_SIMD_CPP_
#define ZARN_HOST_UTILS_RESAMPLE_SIMD_CPP_

namespace zarn::utils {

/// What tells integers of one size apart. Their samples become doubles by way of the low bits of a
/// number whose unit in the last place is 1.
struct SampleRange {
  std::uint64_t flipped = 0;  ///< in each sample of a word: the sign bit of signed ones
  double base = 0.0;          ///< what the number stands for without the low bits
  double low = 0.0;
  double high = 0.0;
};

inline constexpr double kUnitsInLowBits = 0x1p52;
// Half as much again keeps the unit at 1 for negative numbers too.
inline constexpr double kSignedUnitsInLowBits = 0x1.8p52;

template <typename T>
constexpr SampleRange RangeOf() {
  if constexpr (std::is_floating_point_v<T>) {
    return {};
  } else {
    using Limits = std::numeric_limits<T>;
    SampleRange range{0, kUnitsInLowBits, static_cast<double>(Limits::min()),
                      static_cast<double>(Limits::max())};
    if (std::is_signed_v<T>) {
      for (std::size_t bit = 8 * sizeof(T) - 1; bit < 64; bit += 8 * sizeof(T)) {
        range.flipped |= std::uint64_t{1} << bit;
      }
      range.base -= range.low;
    }
    return range;
  }
}

}  // namespace zarn::utils

#endif

HWY_BEFORE_NAMESPACE();
namespace zarn::utils::HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

using D = hn::ScalableTag<double>;
using DU = hn::RebindToUnsigned<D>;
using Doubles = hn::Vec<D>;

#define ZARN_INLINED HWY_ATTR __attribute__((always_inline))

bool Vectors() { return HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128; }

/// Calls `use` with the constants 0 .. kCount - 1.
template <class Use, std::size_t... kIndex>
HWY_INLINE void WithIndices(const Use& use, std::index_sequence<kIndex...>) {
  (use(std::integral_constant<std::size_t, kIndex>()), ...);
}
template <std::size_t kCount, class Use>
HWY_INLINE void WithEach(const Use& use) {
  WithIndices(use, std::make_index_sequence<kCount>());
}

/// How the neighbours in one row of a kernel come in words of 64 bits: side by side with all their
/// channels, or one sample to a word, for one channel after the other.
template <typename S, std::size_t kTapCount, std::size_t kChannelCount>
struct SideBySide {
  static constexpr std::size_t kTaps = kTapCount;
  static constexpr std::size_t kChannels = kChannelCount;
  static constexpr std::size_t kPerWord = 8 / sizeof(S);
  static constexpr std::size_t kWords = (kTaps * kChannels + kPerWord - 1) / kPerWord;
  static constexpr std::size_t Word(std::size_t tap, std::size_t channel) {
    return (tap * kChannels + channel) / kPerWord;
  }
  static constexpr std::size_t Shift(std::size_t tap, std::size_t channel) {
    return (tap * kChannels + channel) % kPerWord * 8 * sizeof(S);
  }
  static std::size_t WordStep(std::size_t) { return 8; }
};
template <typename S, std::size_t kTapCount>
struct OneByOne {
  static constexpr std::size_t kTaps = kTapCount;
  static constexpr std::size_t kChannels = 1;
  static constexpr std::size_t kWords = kTaps;
  static constexpr std::size_t Word(std::size_t tap, std::size_t) { return tap; }
  static constexpr std::size_t Shift(std::size_t, std::size_t) { return 0; }
  static std::size_t WordStep(std::size_t pixelBytes) { return pixelBytes; }
};

/// The sample at bit `kShift` of each word.
template <typename S, std::size_t kShift>
HWY_INLINE Doubles SamplesOf(hn::Vec<DU> words, [[maybe_unused]] Doubles base) {
  const D d;
  const DU du;
  if constexpr (kShift != 0) words = hn::ShiftRight<static_cast<int>(kShift)>(words);
  if constexpr (std::is_same_v<S, double>) {
    return hn::BitCast(d, words);
  } else if constexpr (std::is_same_v<S, float>) {
    const hn::Rebind<std::uint32_t, D> d32;
    return hn::PromoteTo(d, hn::BitCast(hn::Rebind<float, D>(), hn::TruncateTo(d32, words)));
  } else {
    if constexpr (kShift + 8 * sizeof(S) < 64) {
      words = hn::And(words, hn::Set(du, std::numeric_limits<S>::max()));
    }
    return hn::Sub(hn::BitCast(d, hn::Or(words, hn::BitCast(du, hn::Set(d, kUnitsInLowBits)))),
                   base);
  }
}

/// The weights of the neighbours along one axis, as the definition has them.
template <std::size_t kTaps>
struct TapWeights {
  explicit HWY_INLINE TapWeights(Doubles f) {
    const D d;
    const auto one = hn::Set(d, 1.0);
    if constexpr (kTaps == 2) {
      weight[0] = hn::Sub(one, f);
      weight[1] = f;
    } else {
      const auto half = hn::Set(d, 0.5);
      const auto threeHalves = hn::Set(d, 1.5);
      const auto halfF = hn::Mul(half, f);
      weight[0] = hn::Mul(hn::Sub(hn::Mul(hn::Sub(one, halfF), f), half), f);
      weight[1] =
          hn::Add(hn::Mul(hn::Mul(hn::Sub(hn::Mul(threeHalves, f), hn::Set(d, 2.5)), f), f), one);
      weight[2] =
          hn::Mul(hn::Add(hn::Mul(hn::Sub(hn::Set(d, 2.0), hn::Mul(threeHalves, f)), f), half), f);
      weight[3] = hn::Mul(hn::Mul(hn::Sub(halfF, half), f), f);
    }
  }
  Doubles weight[kTaps];
};

/// One kernel on one run of pixels.
template <typename S, class Layout>
class RunKernel {
 public:
  HWY_INLINE RunKernel(const KernelSource& source, const SampleRange& range, std::size_t count,
                       RunScratch& scratch, S* pixels, RunPixel* states)
      : source_(source),
        range_(range),
        count_(count),
        scratch_(scratch),
        pixels_(pixels),
        states_(states) {}

  HWY_INLINE void Run(const double* x, const double* y) {
    if (!Locate(x, y)) return;
    if (source_.mask != nullptr) LookAtMask();
    for (std::size_t c = 0; c < source_.channels; c += kChannels) {
      Fetch(c);
      Combine();
      Interleave(c);
    }
  }

 private:
  static constexpr std::size_t kTaps = Layout::kTaps;
  static constexpr std::size_t kChannels = Layout::kChannels;
  static constexpr std::size_t kWords = Layout::kWords;

  std::size_t PixelBytes() const { return source_.channels * sizeof(S); }
  std::size_t RowBytes() const { return static_cast<std::size_t>(source_.width) * PixelBytes(); }

  // Finds the first neighbour of each pixel, and whether all are there and whole words can be read
  // up to the last one.
  HWY_INLINE bool Locate(const double* x, const double* y) {
    const D d;
    const DU du;
    const hn::Rebind<std::uint8_t, D> d8;
    const std::size_t read = (kTaps - 1) * RowBytes() +
                             (kWords - 1) * Layout::WordStep(PixelBytes()) + 8 +
                             (source_.channels - kChannels) * sizeof(S);
    const std::size_t size = static_cast<std::size_t>(source_.height) * RowBytes();
    if (size < read) {
      std::fill_n(states_, count_, RunPixel::kLeft);
      return false;
    }
    const auto zero = hn::Zero(d);
    const auto half = hn::Set(d, 0.5);
    const auto before = hn::Set(d, kTaps / 2 - 1.0);
    const auto lastX = hn::Set(d, static_cast<double>(source_.width) - kTaps);
    const auto lastY = hn::Set(d, static_cast<double>(source_.height) - kTaps);
    const auto width = hn::Set(d, static_cast<double>(source_.width));
    const auto lastIndex =
        hn::Set(d, std::floor(static_cast<double>((size - read) / PixelBytes())));
    const auto units = hn::Set(d, kUnitsInLowBits);
    for (std::size_t i = 0; i < count_; i += hn::Lanes(d)) {
      const auto tx = hn::Sub(hn::LoadU(d, x + i), half);
      const auto ty = hn::Sub(hn::LoadU(d, y + i), half);
      const auto left = hn::Floor(tx);
      const auto top = hn::Floor(ty);
      const auto fx = hn::Sub(tx, left);
      const auto fy = hn::Sub(ty, top);
      const auto firstX = hn::Sub(left, before);
      const auto firstY = hn::Sub(top, before);
      const auto index = hn::Add(hn::Mul(firstY, width), firstX);
      auto inside = hn::And(hn::And(hn::Ge(firstX, zero), hn::Le(firstX, lastX)),
                            hn::And(hn::Ge(firstY, zero), hn::Le(firstY, lastY)));
      inside = hn::And(inside, hn::Le(index, lastIndex));
      // Floats on centres are copied: their sum would lose the sign of a zero.
      if constexpr (std::is_floating_point_v<S>) {
        inside = hn::And(inside, hn::Ne(hn::Add(fx, fy), zero));
      }
      hn::Store(fx, d, scratch_.fractionX.data() + i);
      hn::Store(fy, d, scratch_.fractionY.data() + i);
      const auto low = hn::Sub(hn::BitCast(du, hn::Add(index, units)), hn::BitCast(du, units));
      const auto chosen = hn::RebindMask(du, inside);
      hn::Store(hn::IfThenElseZero(chosen, low), du, scratch_.index.data() + i);
      hn::StoreU(hn::TruncateTo(d8, hn::IfThenElseZero(chosen, hn::Set(du, kDoneByte))), d8,
                 reinterpret_cast<std::uint8_t*>(states_) + i);
    }
    return true;
  }

  HWY_INLINE void LookAtMask() {
    using Row = std::conditional_t<kTaps == 2, std::uint16_t, std::uint32_t>;
    constexpr std::uint32_t kOnes = kTaps == 2 ? 0x0101U : 0x01010101U;
    constexpr std::uint32_t kTops = kTaps == 2 ? 0x8080U : 0x80808080U;
    const unsigned char* const mask = source_.mask;
    const std::ptrdiff_t width = source_.width;
    const std::uint64_t* const index = scratch_.index.data();
    RunPixel* const states = states_;
    const std::size_t count = count_;
    for (std::size_t i = 0; i < count; ++i) {
      const unsigned char* from = mask + index[i];
      std::uint32_t any = 0;
      std::uint32_t missing = 0;
      for (std::size_t r = 0; r < kTaps; ++r, from += width) {
        Row row;
        std::memcpy(&row, from, sizeof(row));
        any |= row;
        missing |= (std::uint32_t{row} - kOnes) & ~std::uint32_t{row} & kTops;
      }
      if (missing == 0 || states[i] != RunPixel::kDone) continue;
      states[i] = any != 0 ? RunPixel::kLeft : RunPixel::kUncovered;
    }
  }

  // Gathers the words pixel by pixel, which is as fast as the machine's own gathers where these
  // are good and much faster where they are not.
  HWY_INLINE void Fetch(std::size_t channel) {
    const std::byte* const first = source_.samples + channel * sizeof(S);
    const std::size_t pixelBytes = PixelBytes();
    const std::size_t rowBytes = RowBytes();
    const std::size_t step = Layout::WordStep(pixelBytes);
    const std::uint64_t* const index = scratch_.index.data();
    std::uint64_t* const words = scratch_.words.data();
    const std::size_t count = count_;
    const std::ptrdiff_t ahead = source_.ahead;
    const std::ptrdiff_t last = source_.width * source_.height - 1;
    for (std::size_t i = 0; i < count; ++i) {
      const std::byte* from = first + index[i] * pixelBytes;
      if (i % 4 == 0) {
        const auto soon =
            std::clamp<std::ptrdiff_t>(static_cast<std::ptrdiff_t>(index[i]) + ahead, 0, last);
        hwy::Prefetch(first + static_cast<std::size_t>(soon) * pixelBytes);
      }
      for (std::size_t r = 0; r < kTaps; ++r, from += rowBytes) {
        for (std::size_t k = 0; k < kWords; ++k) {
          std::memcpy(words + (r * kWords + k) * kResampleRun + i, from + k * step, 8);
        }
      }
    }
  }

  HWY_INLINE void Combine() {
    const D d;
    const DU du;
    const auto base = hn::Set(d, range_.base);
    const auto flipped = hn::Set(du, range_.flipped);
    for (std::size_t i = 0; i < count_; i += hn::Lanes(d)) {
      const TapWeights<kTaps> across(hn::Load(d, scratch_.fractionX.data() + i));
      const TapWeights<kTaps> down(hn::Load(d, scratch_.fractionY.data() + i));
      Doubles sums[kChannels];
      WithEach<kTaps>([&](auto r) ZARN_INLINED {
        hn::Vec<DU> words[kWords];
        WithEach<kWords>([&](auto k) ZARN_INLINED {
          words[k] = hn::Load(du, scratch_.words.data() + (r * kWords + k) * kResampleRun + i);
          if constexpr (std::is_integral_v<S>) words[k] = hn::Xor(words[k], flipped);
        });
        WithEach<kChannels>([&](auto c) ZARN_INLINED {
          Doubles row;
          WithEach<kTaps>([&](auto t) ZARN_INLINED {
            const auto product = hn::Mul(across.weight[t], SamplesOf<S, Layout::Shift(t, c)>(
                                                               words[Layout::Word(t, c)], base));
            row = t == 0 ? product : hn::Add(row, product);
          });
          const auto product = hn::Mul(down.weight[r], row);
          sums[c] = r == 0 ? product : hn::Add(sums[c], product);
        });
      });
      WithEach<kChannels>([&](auto c) ZARN_INLINED { Store(sums[c], i, c); });
    }
  }

  S* Plane(std::size_t c) const {
    return source_.channels == 1 ? pixels_
                                 : reinterpret_cast<S*>(scratch_.planes.data()) + c * kResampleRun;
  }

  HWY_INLINE void Store(Doubles v, std::size_t i, std::size_t c) {
    const D d;
    const hn::Rebind<S, D> ds;
    S* const to = Plane(c) + i;
    if constexpr (std::is_floating_point_v<S>) {
      LeaveNaN(v, i);
      // No sum that starts from zero is a negative zero.
      v = hn::Add(v, hn::Zero(d));
      if constexpr (std::is_same_v<S, double>) {
        hn::StoreU(v, ds, to);
      } else {
        hn::StoreU(hn::DemoteTo(ds, v), ds, to);
      }
    } else {
      v = hn::Min(hn::Max(v, hn::Set(d, range_.low)), hn::Set(d, range_.high));
      // The sum rounds to the nearest integer, ties to even, which its low bits then hold.
      v = hn::Add(v, hn::Set(d, kSignedUnitsInLowBits));
      hn::StoreU(hn::TruncateTo(ds, hn::BitCast(DU(), v)), ds, to);
    }
  }

  // Where something is not a number it may be a neighbour without weight.
  HWY_INLINE void LeaveNaN(Doubles v, std::size_t i) {
    const D d;
    if (HWY_LIKELY(hn::AllFalse(d, hn::IsNaN(v)))) return;
    alignas(64) double lanes[8];
    static_assert(hn::MaxLanes(D()) <= 8);
    hn::Store(v, d, lanes);
    for (std::size_t k = 0; k < hn::Lanes(d); ++k) {
      if (std::isnan(lanes[k])) states_[i + k] = RunPixel::kLeft;
    }
  }

  HWY_INLINE void Interleave(std::size_t channel) {
    if (source_.channels == 1) return;
    const hn::ScalableTag<S> d;
    if constexpr (kChannels == 3) {
      for (std::size_t i = 0; i < count_; i += hn::Lanes(d)) {
        hn::StoreInterleaved3(hn::LoadU(d, Plane(0) + i), hn::LoadU(d, Plane(1) + i),
                              hn::LoadU(d, Plane(2) + i), d, pixels_ + 3 * i);
      }
    } else {
      S* const to = pixels_ + channel;
      for (std::size_t i = 0; i < count_; ++i) to[i * source_.channels] = Plane(0)[i];
    }
  }

  static constexpr auto kDoneByte = static_cast<std::uint64_t>(RunPixel::kDone);

  const KernelSource& source_;
  const SampleRange& range_;
  std::size_t count_;
  RunScratch& scratch_;
  S* pixels_;
  RunPixel* states_;
};

/// A run of one sample size; integers are told apart by `range`.
template <typename S>
HWY_ATTR void Interpolate(const KernelSource& source, const SampleRange& range, bool cubic,
                          const double* x, const double* y, std::size_t count, RunScratch& scratch,
                          void* pixels, RunPixel* states) {
  const auto run = [&](auto layout) HWY_ATTR {
    RunKernel<S, decltype(layout)>(source, range, count, scratch, static_cast<S*>(pixels), states)
        .Run(x, y);
  };
  if (source.channels == 1) {
    cubic ? run(SideBySide<S, 4, 1>()) : run(SideBySide<S, 2, 1>());
  } else if (source.channels == 3) {
    cubic ? run(SideBySide<S, 4, 3>()) : run(SideBySide<S, 2, 3>());
  } else {
    cubic ? run(OneByOne<S, 4>()) : run(OneByOne<S, 2>());
  }
}

#define ZARN_SAMPLE_SIZES(macro)                                                               \
  macro(8, std::uint8_t) macro(16, std::uint16_t) macro(32, std::uint32_t) macro(Float, float) \
      macro(Double, double)
// The dispatch table holds plain functions: one entry per sample size.
#define ZARN_INTERPOLATE(name, S)                                                                  \
  void Interpolate##name(const KernelSource& source, const SampleRange& range, bool cubic,         \
                         const double* x, const double* y, std::size_t count, RunScratch& scratch, \
                         void* pixels, RunPixel* states) {                                         \
    Interpolate<S>(source, range, cubic, x, y, count, scratch, pixels, states);                    \
  }
ZARN_SAMPLE_SIZES(ZARN_INTERPOLATE)
#undef ZARN_INTERPOLATE
#undef ZARN_INLINED

}  // namespace zarn::utils::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::utils {

HWY_EXPORT(Vectors);
#define ZARN_EXPORT_SIZE(name, S) HWY_EXPORT(Interpolate##name);
ZARN_SAMPLE_SIZES(ZARN_EXPORT_SIZE)

bool HasResampleVectors() { return HWY_DYNAMIC_DISPATCH(Vectors)(); }

template <typename T>
void InterpolateRun(const KernelSource& source, bool cubic, const double* x, const double* y,
                    std::size_t count, RunScratch& scratch, T* pixels, RunPixel* states) {
  static constexpr SampleRange kRange = RangeOf<T>();
  const auto run = [&](auto interpolate) {
    interpolate(source, kRange, cubic, x, y, count, scratch, pixels, states);
  };
  if constexpr (std::is_same_v<T, double>) {
    run(HWY_DYNAMIC_DISPATCH(InterpolateDouble));
  } else if constexpr (std::is_same_v<T, float>) {
    run(HWY_DYNAMIC_DISPATCH(InterpolateFloat));
  } else if constexpr (sizeof(T) == 1) {
    run(HWY_DYNAMIC_DISPATCH(Interpolate8));
  } else if constexpr (sizeof(T) == 2) {
    run(HWY_DYNAMIC_DISPATCH(Interpolate16));
  } else {
    run(HWY_DYNAMIC_DISPATCH(Interpolate32));
  }
}

#define ZARN_INSTANTIATE(T)                                                             \
  template void InterpolateRun(const KernelSource&, bool, const double*, const double*, \
                               std::size_t, RunScratch&, T*, RunPixel*);
ZARN_INSTANTIATE(std::uint8_t)
ZARN_INSTANTIATE(std::int8_t)
ZARN_INSTANTIATE(std::uint16_t)
ZARN_INSTANTIATE(std::int16_t)
ZARN_INSTANTIATE(std::uint32_t)
ZARN_INSTANTIATE(std::int32_t)
ZARN_INSTANTIATE(float)
ZARN_INSTANTIATE(double)

}  // namespace zarn::utils

#endif  // HWY_ONCE
