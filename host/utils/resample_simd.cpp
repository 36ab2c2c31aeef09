// SPDX-License-Identifier: Apache-2.0
#include "host/utils/resample_simd.h"

#include <hwy/cache_control.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <type_traits>
#include <utility>

#include "host/utils/realof.h"

// Targets that share their kernels with another one, and those whose vectors may be longer than a
// run or of unknown length.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "host/utils/resample_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#ifndef ZARN_HOST_UTILS_RESAMPLE_SIMD_CPP
#define ZARN_HOST_UTILS_RESAMPLE_SIMD_CPP

namespace zarn::utils {

/// What tells integers of one size apart.
struct SampleRange {
  std::uint64_t flipped = 0;  ///< in each sample of a word: the sign bit of signed ones
  double low = 0.0;
  double high = 0.0;
};

/// Integers become floating-point numbers by way of the low bits of this one, whose unit in the
/// last place is 1.
template <typename Real>
inline constexpr Real kUnitsInLowBits = sizeof(Real) == 8 ? Real(0x1p52) : Real(0x1p23);
// Half as much again keeps the unit at 1 for negative numbers too.
inline constexpr double kSignedUnitsInLowBits = 0x1.8p52;

template <typename T>
constexpr SampleRange RangeOf() {
  if constexpr (std::is_floating_point_v<T>) {
    return {};
  } else {
    using Limits = std::numeric_limits<T>;
    SampleRange range{0, static_cast<double>(Limits::min()), static_cast<double>(Limits::max())};
    if (std::is_signed_v<T>) {
      for (std::size_t bit = 8 * sizeof(T) - 1; bit < 64; bit += 8 * sizeof(T)) {
        range.flipped |= std::uint64_t{1} << bit;
      }
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

/// What sums are computed in, and words of its size.
template <typename Real>
using RealTag = hn::ScalableTag<Real>;
template <typename Real>
using Reals = hn::Vec<RealTag<Real>>;
template <typename Real>
using WordTag = hn::RebindToUnsigned<RealTag<Real>>;
template <typename Real>
using Words = hn::Vec<WordTag<Real>>;

#define ZARN_INLINED HWY_ATTR __attribute__((always_inline))

// Vectors of four doubles and more find all neighbours of their pixels in two vectors of a row.
#undef ZARN_HAS_WINDOWS
#define ZARN_HAS_WINDOWS (HWY_TARGET == HWY_AVX2 || HWY_TARGET == HWY_AVX3)

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

#if ZARN_HAS_WINDOWS
/// Looks up what two vectors hold, one after the other.
template <typename Real>
class Lookup {
 public:
  Lookup() = default;
  /// Of `index` only the low bits count.
#if HWY_TARGET == HWY_AVX3
  explicit HWY_INLINE Lookup(Words<Real> index) : index_(index) {}
  HWY_INLINE Reals<Real> operator()(Reals<Real> low, Reals<Real> high) const {
    if constexpr (sizeof(Real) == 4) {
      return Reals<Real>{_mm512_permutex2var_ps(low.raw, index_.raw, high.raw)};
    } else {
      return Reals<Real>{_mm512_permutex2var_pd(low.raw, index_.raw, high.raw)};
    }
  }

 private:
  Words<Real> index_;
#else
  explicit HWY_INLINE Lookup(Words<Real> index) {
    const RealTag<Real> d;
    const WordTag<Real> du;
    const auto lanes = hn::Set(du, static_cast<hn::TFromD<WordTag<Real>>>(hn::Lanes(du)));
    index_ = hn::IndicesFromVec(d, hn::And(index, hn::Sub(lanes, hn::Set(du, 1))));
    isHigh_ = hn::RebindMask(d, hn::Eq(hn::And(index, lanes), lanes));
  }
  HWY_INLINE Reals<Real> operator()(Reals<Real> low, Reals<Real> high) const {
    return hn::IfThenElse(isHigh_, hn::TableLookupLanes(high, index_),
                          hn::TableLookupLanes(low, index_));
  }

 private:
  decltype(hn::IndicesFromVec(RealTag<Real>(), hn::Zero(WordTag<Real>()))) index_;
  hn::Mask<RealTag<Real>> isHigh_;
#endif
};
#endif

/// How the neighbours in one row of a kernel come in words of the size of what
/// they are computed in: side by side with all their channels, or one sample to a word, for one
/// channel after the other.
template <typename S, std::size_t kTapCount, std::size_t kChannelCount>
struct SideBySide {
  static constexpr bool kSideBySide = true;
  static constexpr std::size_t kTaps = kTapCount;
  static constexpr std::size_t kChannels = kChannelCount;
  static constexpr std::size_t kWordBytes = sizeof(RealOf<S>);
  static constexpr std::size_t kPerWord = kWordBytes / sizeof(S);
  static constexpr std::size_t kWords = (kTaps * kChannels + kPerWord - 1) / kPerWord;
  static constexpr std::size_t Word(std::size_t tap, std::size_t channel) {
    return (tap * kChannels + channel) / kPerWord;
  }
  static constexpr std::size_t Shift(std::size_t tap, std::size_t channel) {
    return (tap * kChannels + channel) % kPerWord * 8 * sizeof(S);
  }
  static std::size_t WordStep(std::size_t) { return kWordBytes; }
};
template <typename S, std::size_t kTapCount>
struct OneByOne {
  static constexpr bool kSideBySide = false;
  static constexpr std::size_t kTaps = kTapCount;
  static constexpr std::size_t kChannels = 1;
  static constexpr std::size_t kWords = kTaps;
  static constexpr std::size_t Word(std::size_t tap, std::size_t) { return tap; }
  static constexpr std::size_t Shift(std::size_t, std::size_t) { return 0; }
  static std::size_t WordStep(std::size_t pixelBytes) { return pixelBytes; }
};

/// The sample at bit `kShift` of each word; `base` is what the words stand for that hold the least.
template <typename S, std::size_t kShift, typename Real = RealOf<S>>
HWY_INLINE Reals<Real> SamplesOf(Words<Real> words, [[maybe_unused]] Reals<Real> base) {
  const RealTag<Real> d;
  const WordTag<Real> du;
  if constexpr (kShift != 0) words = hn::ShiftRight<static_cast<int>(kShift)>(words);
  if constexpr (std::is_same_v<S, double>) {
    return hn::BitCast(d, words);
  } else if constexpr (std::is_same_v<S, float>) {
    const hn::Rebind<std::uint32_t, D> d32;
    return hn::PromoteTo(d, hn::BitCast(hn::Rebind<float, D>(), hn::TruncateTo(d32, words)));
  } else {
    if constexpr (kShift + 8 * sizeof(S) < 8 * sizeof(Real)) {
      words = hn::And(words, hn::Set(du, std::numeric_limits<S>::max()));
    }
    const auto units = hn::BitCast(du, hn::Set(d, kUnitsInLowBits<Real>));
    return hn::Sub(hn::BitCast(d, hn::Or(words, units)), base);
  }
}

/// The weights of the neighbours along one axis, as the definition has them.
template <std::size_t kTaps, typename Real>
struct TapWeights {
  explicit HWY_INLINE TapWeights(Reals<Real> f) {
    const RealTag<Real> d;
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
  Reals<Real> weight[kTaps];
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
#if ZARN_HAS_WINDOWS
    if constexpr (Layout::kSideBySide) {
      for (std::size_t i = 0; i < count_; i += kGroup) {
        const std::size_t end = std::min(i + kGroup, count_);
        const Window window = WindowAround(i);
        if (source_.mask != nullptr && !IsAllValid(window)) LookAtMask(i, end);
        if (window.rows != 0) {
          CombineWindow(window, i);
        } else {
          Fetch(0, i, end);
          Combine(i);
        }
      }
      Interleave(0);
      return;
    }
#endif
    if (source_.mask != nullptr) LookAtMask(0, count_);
    for (std::size_t c = 0; c < source_.channels; c += kChannels) {
      Fetch(c, 0, count_);
      for (std::size_t i = 0; i < count_; i += kGroup) Combine(i);
      Interleave(c);
    }
  }

 private:
  static constexpr std::size_t kTaps = Layout::kTaps;
  static constexpr std::size_t kChannels = Layout::kChannels;
  static constexpr std::size_t kWords = Layout::kWords;
  using Real = RealOf<S>;
  using DR = RealTag<Real>;
  using Word = hn::TFromD<WordTag<Real>>;
  static constexpr std::size_t kGroup = hn::MaxLanes(DR());  ///< pixels combined together

  std::size_t PixelBytes() const {
    return (Layout::kSideBySide ? kChannels : source_.channels) * sizeof(S);
  }
  std::size_t RowBytes() const { return static_cast<std::size_t>(source_.width) * PixelBytes(); }

  Real* FractionX() const { return reinterpret_cast<Real*>(scratch_.fractionX.data()); }
  Real* FractionY() const { return reinterpret_cast<Real*>(scratch_.fractionY.data()); }
  Word* WordsAt(std::size_t row, std::size_t word) const {
    return reinterpret_cast<Word*>(scratch_.words.data()) + (row * kWords + word) * kResampleRun;
  }

  HWY_INLINE void StoreReal(Doubles value, Real* to) const {
    const hn::Rebind<Real, D> d;
    if constexpr (sizeof(Real) == sizeof(double)) {
      hn::StoreU(value, d, to);
    } else {
      hn::StoreU(hn::DemoteTo(d, value), d, to);
    }
  }

  // Finds the first neighbour of each pixel, and whether all are there and whole words can be read
  // up to the last one.
  HWY_INLINE bool Locate(const double* x, const double* y) {
    const D d;
    const DU du;
    const hn::Rebind<std::uint8_t, D> d8;
    const std::size_t read = (kTaps - 1) * RowBytes() +
                             (kWords - 1) * Layout::WordStep(PixelBytes()) + sizeof(Word) +
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
    const auto units = hn::Set(d, kUnitsInLowBits<double>);
    const auto nowhere = hn::Set(d, -1.0);
    const hn::Rebind<std::int32_t, D> d32;
    const std::size_t end = (count_ + kGroup - 1) / kGroup * kGroup;
    for (std::size_t i = 0; i < end; i += hn::Lanes(d)) {
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
      hn::StoreU(hn::DemoteTo(d32, hn::IfThenElse(inside, firstX, nowhere)), d32,
                 scratch_.column.data() + i);
      hn::StoreU(hn::DemoteTo(d32, hn::IfThenElse(inside, firstY, nowhere)), d32,
                 scratch_.row.data() + i);
      StoreReal(fx, FractionX() + i);
      StoreReal(fy, FractionY() + i);
      const auto low = hn::Sub(hn::BitCast(du, hn::Add(index, units)), hn::BitCast(du, units));
      const auto chosen = hn::RebindMask(du, inside);
      hn::Store(hn::IfThenElseZero(chosen, low), du, scratch_.index.data() + i);
      hn::StoreU(hn::TruncateTo(d8, hn::IfThenElseZero(chosen, hn::Set(du, kDoneByte))), d8,
                 reinterpret_cast<std::uint8_t*>(states_) + i);
    }
    return true;
  }

  // Asks for what rows to come will draw on first around `count` pixels, given their first
  // neighbour.
  HWY_INLINE void AskAhead(std::ptrdiff_t index, std::size_t count) const {
    constexpr std::size_t kLine = 64;
    const std::ptrdiff_t last = source_.width * source_.height - 1;
    const std::ptrdiff_t below =
        source_.ahead > 0 ? static_cast<std::ptrdiff_t>(kTaps - 1) * source_.width : 0;
    const std::ptrdiff_t soon = std::clamp<std::ptrdiff_t>(index + source_.ahead + below, 0, last);
    const std::byte* const from = source_.samples + static_cast<std::size_t>(soon) * PixelBytes();
    for (std::size_t byte = 0; byte < count * PixelBytes(); byte += kLine)
      hwy::Prefetch(from + byte);
  }

  HWY_INLINE void LookAtMask(std::size_t begin, std::size_t end) {
    using Row = std::conditional_t<kTaps == 2, std::uint16_t, std::uint32_t>;
    constexpr std::uint32_t kOnes = kTaps == 2 ? 0x0101U : 0x01010101U;
    constexpr std::uint32_t kTops = kTaps == 2 ? 0x8080U : 0x80808080U;
    const unsigned char* const mask = source_.mask;
    const std::ptrdiff_t width = source_.width;
    const std::uint64_t* const index = scratch_.index.data();
    RunPixel* const states = states_;
    for (std::size_t i = begin; i < end; ++i) {
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
  HWY_INLINE void Fetch(std::size_t channel, std::size_t begin, std::size_t end) {
    const std::byte* const first = source_.samples + channel * sizeof(S);
    const std::size_t pixelBytes = PixelBytes();
    const std::size_t rowBytes = RowBytes();
    const std::size_t step = Layout::WordStep(pixelBytes);
    const std::uint64_t* const index = scratch_.index.data();
    for (std::size_t i = begin; i < end; ++i) {
      const std::byte* from = first + index[i] * pixelBytes;
      if (i % 4 == 0) AskAhead(static_cast<std::ptrdiff_t>(index[i]), 1);
      for (std::size_t r = 0; r < kTaps; ++r, from += rowBytes) {
        for (std::size_t k = 0; k < kWords; ++k) {
          std::memcpy(WordsAt(r, k) + i, from + k * step, sizeof(Word));
        }
      }
    }
  }

  HWY_INLINE void Combine(std::size_t i) {
    const DR d;
    const WordTag<Real> du;
    const auto base = hn::Set(d, kUnitsInLowBits<Real> - static_cast<Real>(range_.low));
    const auto flipped = hn::Set(du, static_cast<Word>(range_.flipped));
    const TapWeights<kTaps, Real> across(hn::Load(d, FractionX() + i));
    const TapWeights<kTaps, Real> down(hn::Load(d, FractionY() + i));
    Reals<Real> sums[kChannels];
    WithEach<kTaps>([&](auto r) ZARN_INLINED {
      Words<Real> words[kWords];
      WithEach<kWords>([&](auto k) ZARN_INLINED {
        words[k] = hn::Load(du, WordsAt(r, k) + i);
        if constexpr (std::is_integral_v<S>) words[k] = hn::Xor(words[k], flipped);
      });
      WithEach<kChannels>([&](auto c) ZARN_INLINED {
        Reals<Real> row;
        WithEach<kTaps>([&](auto t) ZARN_INLINED {
          const auto product = hn::Mul(
              across.weight[t], SamplesOf<S, Layout::Shift(t, c)>(words[Layout::Word(t, c)], base));
          row = t == 0 ? product : hn::Add(row, product);
        });
        const auto product = hn::Mul(down.weight[r], row);
        sums[c] = r == 0 ? product : hn::Add(sums[c], product);
      });
    });
    WithEach<kChannels>([&](auto c) ZARN_INLINED { Store(sums[c], i, c); });
  }

#if ZARN_HAS_WINDOWS
  /// Pixels of the source that hold all neighbours of a group: as wide as two vectors, and one row
  /// more than one of the group draws on where some begin a row lower.
  struct Window {
    std::int32_t left = 0;
    std::int32_t top = 0;
    std::ptrdiff_t rows = 0;  ///< 0: there is none
  };

  std::ptrdiff_t IndexOf(const Window& window) const {
    return window.top * source_.width + window.left;
  }

  // Pixels of an output mostly follow each other in the source, too.
  HWY_INLINE Window WindowAround(std::size_t i) const {
    const hn::Rebind<std::int32_t, DR> d;
    const std::int32_t* const columns = scratch_.column.data() + i;
    const std::int32_t* const rows = scratch_.row.data() + i;
    Window window{std::min(columns[0], columns[kGroup - 1]), std::min(rows[0], rows[kGroup - 1])};
    if (window.top < 0) return window;
    const auto right = hn::Sub(hn::LoadU(d, columns), hn::Set(d, window.left));
    const auto down = hn::Sub(hn::LoadU(d, rows), hn::Set(d, window.top));
    const auto zero = hn::Zero(d);
    constexpr auto kMostRight = static_cast<std::int32_t>(2 * kGroup - kTaps);
    const auto beyond =
        hn::Max(hn::Sub(right, hn::Set(d, kMostRight)), hn::Sub(down, hn::Set(d, 1)));
    const auto before = hn::Min(right, down);
    if (!hn::AllTrue(d, hn::And(hn::Gt(before, hn::Set(d, -1)), hn::Lt(beyond, hn::Set(d, 1)))))
      return window;
    // A row of two neighbours costs less than a branch that is hard to foresee.
    const bool isLevel = kChannels * kTaps > 2 && hn::AllTrue(d, hn::Eq(down, zero));
    const auto rowCount = static_cast<std::ptrdiff_t>(kTaps) + (isLevel ? 0 : 1);
    const std::ptrdiff_t end =
        IndexOf(window) + (rowCount - 1) * source_.width + static_cast<std::ptrdiff_t>(2 * kGroup);
    if (end <= source_.width * source_.height) window.rows = rowCount;
    return window;
  }

  HWY_INLINE bool IsAllValid(const Window& window) const {
    const hn::Twice<hn::Rebind<std::uint8_t, DR>> d;
    if (window.rows == 0) return false;
    const unsigned char* row = source_.mask + IndexOf(window);
    auto least = hn::LoadU(d, row);
    for (std::ptrdiff_t r = 1; r < window.rows; ++r) {
      row += source_.width;
      least = hn::Min(least, hn::LoadU(d, row));
    }
    return hn::AllFalse(d, hn::Eq(least, hn::Zero(d)));
  }

  // How far a group's columns or rows are from the first.
  HWY_INLINE Words<Real> Offsets(const std::int32_t* from, std::int32_t first) const {
    const hn::Rebind<std::int32_t, DR> d32;
    const auto offset = hn::Sub(hn::LoadU(d32, from), hn::Set(d32, first));
    if constexpr (sizeof(Real) == 4) {
      return hn::BitCast(WordTag<Real>(), offset);
    } else {
      return hn::BitCast(DU(), hn::PromoteTo(hn::RebindToSigned<DU>(), offset));
    }
  }

  // The same sums as one by one. A pixel that begins a row lower takes the first row of the window
  // with weight 0; so do the others with the last.
  HWY_INLINE void CombineWindow(const Window& window, std::size_t i) {
    const DR d;
    const WordTag<Real> du;
    const auto zero = hn::Zero(d);
    const TapWeights<kTaps, Real> across(hn::Load(d, FractionX() + i));
    const TapWeights<kTaps, Real> down(hn::Load(d, FractionY() + i));
    const auto lower =
        hn::RebindMask(d, hn::Ne(Offsets(scratch_.row.data() + i, window.top), hn::Zero(du)));
    Reals<Real> weights[kTaps + 1];
    WithEach<kTaps>([&](auto r) ZARN_INLINED {
      const auto fromAbove = r == 0 ? zero : down.weight[r == 0 ? 0 : r - 1];
      weights[r] = hn::IfThenElse(lower, fromAbove, down.weight[r]);
    });
    weights[kTaps] = hn::IfThenElseZero(lower, down.weight[kTaps - 1]);
    const auto index = Offsets(scratch_.column.data() + i, window.left);
    Lookup<Real> taps[kTaps];
    WithEach<kTaps>([&](auto t) ZARN_INLINED {
      taps[t] = Lookup<Real>(hn::Add(index, hn::Set(du, static_cast<Word>(t))));
    });

    const std::ptrdiff_t first = IndexOf(window);
    AskAhead(first, kGroup);
    const std::ptrdiff_t rowSamples = source_.width * static_cast<std::ptrdiff_t>(kChannels);
    const S* row = reinterpret_cast<const S*>(source_.samples) +
                   first * static_cast<std::ptrdiff_t>(kChannels);
    Reals<Real> sums[kChannels];
    WithEach<kChannels>([&](auto c) ZARN_INLINED { sums[c] = zero; });
#if HWY_TARGET == HWY_AVX3
    // By way of memory, because samples that are loaded from there are widened on the way.
    if constexpr (kUnzips) {
      for (std::ptrdiff_t r = 0; r < window.rows; ++r, row += rowSamples) Unzip(row, UnzippedAt(r));
    }
#endif
    const auto addRow = [&](std::size_t r) ZARN_INLINED {
      Reals<Real> low[kChannels];
      Reals<Real> high[kChannels];
#if HWY_TARGET == HWY_AVX3
      if constexpr (kUnzips) row = UnzippedAt(static_cast<std::ptrdiff_t>(r));
#endif
      LoadTwice(row, low, high);
      WithEach<kChannels>([&](auto c) ZARN_INLINED {
        Reals<Real> sum;
        WithEach<kTaps>([&](auto t) ZARN_INLINED {
          const auto product = hn::Mul(across.weight[t], taps[t](low[c], high[c]));
          sum = t == 0 ? product : hn::Add(sum, product);
        });
        sums[c] = hn::Add(sums[c], hn::Mul(weights[r], sum));
      });
      row += rowSamples;
    };
    if constexpr (kChannels == 1) {
      WithEach<kTaps>(addRow);
      if (kTaps == 2 || window.rows > static_cast<std::ptrdiff_t>(kTaps)) addRow(kTaps);
    } else {
      for (std::ptrdiff_t r = 0; r < window.rows; ++r) addRow(static_cast<std::size_t>(r));
    }
    WithEach<kChannels>([&](auto c) ZARN_INLINED { Store(sums[c], i, c); });
  }

#if HWY_TARGET == HWY_AVX3
  /// Where the samples of a channel lie in three vectors of pixels, as they are looked up in the
  /// first two and then in what came of them and the third.
  struct ChannelLanes {
    explicit constexpr ChannelLanes(std::uint32_t channel) {
      for (std::uint32_t i = 0; i < 16; ++i) {
        const std::uint32_t lane = 3 * i + channel;
        firstTwo[i] = lane < 32 ? lane : 0;
        third[i] = lane < 32 ? i : lane - 16;
      }
    }
    alignas(64) std::uint32_t firstTwo[16] = {};
    alignas(64) std::uint32_t third[16] = {};
  };

  static constexpr bool kUnzips = kChannels == 3 && sizeof(S) == 4;
  S* UnzippedAt(std::ptrdiff_t r) const {
    return reinterpret_cast<S*>(scratch_.words.data()) + 48 * r;
  }
  static HWY_INLINE void Unzip(const S* from, S* to) {
    WithEach<3>([&](auto c) ZARN_INLINED {
      hn::Store(LoadChannel<c>(from), hn::ScalableTag<S>(), to + 16 * c);
    });
  }

  // One channel of 16 pixels of three samples of 4 bytes, in half the steps that all three take
  // together.
  template <std::size_t kChannel>
  static HWY_INLINE auto LoadChannel(const S* from) {
    static constexpr ChannelLanes kLanes(kChannel);
    const hn::ScalableTag<S> d;
    const hn::ScalableTag<float> df;
    const hn::ScalableTag<std::uint32_t> du;
    const auto at = [&](std::size_t i)
                        ZARN_INLINED { return hn::BitCast(df, hn::LoadU(d, from + 16 * i)); };
    const auto found = Lookup<float>(hn::Load(du, kLanes.firstTwo))(at(0), at(1));
    return hn::BitCast(d, Lookup<float>(hn::Load(du, kLanes.third))(found, at(2)));
  }
#endif

  // The pixels of two vectors, channel by channel.
  HWY_INLINE void LoadTwice(const S* from, Reals<Real> (&low)[kChannels],
                            Reals<Real> (&high)[kChannels]) const {
    const hn::Rebind<S, DR> ds;
    if constexpr (kChannels == 1) {
      low[0] = ToReals(hn::LoadU(ds, from));
      high[0] = ToReals(hn::LoadU(ds, from + hn::Lanes(ds)));
#if HWY_TARGET == HWY_AVX3
    } else if constexpr (kUnzips) {
      WithEach<3>([&](auto c) ZARN_INLINED {
        low[c] = ToReals(hn::Load(ds, from + 16 * c));
        high[c] = ToReals(hn::Load(ds, from + 16 * c + 8));
      });
#endif
    } else if constexpr (sizeof(S) == sizeof(Real)) {
      hn::LoadInterleaved3(ds, from, low[0], low[1], low[2]);
      hn::LoadInterleaved3(ds, from + 3 * hn::Lanes(ds), high[0], high[1], high[2]);
    } else {
      const hn::Twice<decltype(ds)> both;
      hn::Vec<decltype(both)> channels[3];
      hn::LoadInterleaved3(both, from, channels[0], channels[1], channels[2]);
      WithEach<3>([&](auto c) ZARN_INLINED {
        low[c] = ToReals(hn::LowerHalf(ds, channels[c]));
        high[c] = ToReals(hn::UpperHalf(ds, channels[c]));
      });
    }
  }

  HWY_INLINE Reals<Real> ToReals(hn::Vec<hn::Rebind<S, DR>> samples) const {
    const DR d;
    if constexpr (std::is_same_v<S, double>) {
      return samples;
    } else if constexpr (std::is_same_v<S, float>) {
      return hn::PromoteTo(d, samples);
    } else {
      const hn::Rebind<S, DR> ds;
      const hn::Rebind<std::int32_t, DR> d32;
      samples = hn::Xor(samples, hn::Set(ds, static_cast<S>(range_.flipped)));
      if constexpr (sizeof(S) == 4) {
        const auto units = hn::BitCast(DU(), hn::Set(d, kUnitsInLowBits<Real>));
        return hn::Sub(hn::BitCast(d, hn::Or(hn::PromoteTo(DU(), samples), units)),
                       hn::Set(d, kUnitsInLowBits<Real> - range_.low));
      } else {
        const auto low = hn::Set(d, static_cast<Real>(range_.low));
        const auto whole = hn::PromoteTo(d32, samples);
        if constexpr (sizeof(S) == 1) {
          return hn::Add(hn::ConvertTo(d, whole), low);
        } else {
          return hn::Add(hn::PromoteTo(d, whole), low);
        }
      }
    }
  }
#endif

  S* Plane(std::size_t c) const {
    return source_.channels == 1 ? pixels_
                                 : reinterpret_cast<S*>(scratch_.planes.data()) + c * kResampleRun;
  }

  HWY_INLINE void Store(Reals<Real> v, std::size_t i, std::size_t c) {
    const DR d;
    const hn::Rebind<S, DR> ds;
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
      v = hn::Min(hn::Max(v, hn::Set(d, static_cast<Real>(range_.low))),
                  hn::Set(d, static_cast<Real>(range_.high)));
      // Both round to the nearest integer, ties to even.
      if constexpr (sizeof(Real) == 4) {
        hn::StoreU(hn::TruncateTo(ds, hn::BitCast(WordTag<Real>(), hn::NearestInt(v))), ds, to);
      } else {
        v = hn::Add(v, hn::Set(d, kSignedUnitsInLowBits));
        hn::StoreU(hn::TruncateTo(ds, hn::BitCast(DU(), v)), ds, to);
      }
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
