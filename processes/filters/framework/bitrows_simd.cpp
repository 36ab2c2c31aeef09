// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/bitrows_simd.h"

#include <hwy/cache_control.h>

#include <bit>

// Targets that share their kernels with another one, and those whose vectors may be wider than a
// word has bits.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/framework/bitrows_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::bitrows::HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

// Bits of vectors are stored byte by byte, which makes a word only where the low byte comes first.
constexpr bool kHasVectors = HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128 &&
                             std::endian::native == std::endian::little;
// How far ahead to ask for memory.
constexpr std::size_t kBytesAhead = 2048;

HWY_ATTR std::size_t PackRow(const std::uint8_t* pixels, std::size_t words, std::uint8_t value,
                             bool equal, Word* bits) {
  if constexpr (!kHasVectors) return 0;
  const hn::CappedTag<std::uint8_t, kWordBits> d;
  const std::size_t lanes = hn::Lanes(d);
  const auto wanted = hn::Set(d, value);
  const Word flip = equal ? 0 : ~Word{0};
  for (std::size_t i = 0; i < words; ++i) {
    hwy::Prefetch(pixels + i * kWordBits + kBytesAhead);
    Word word = 0;
    for (std::size_t k = 0; k < kWordBits; k += lanes) {
      const auto matches = hn::Eq(hn::LoadU(d, pixels + i * kWordBits + k), wanted);
      hn::StoreMaskBits(d, matches, reinterpret_cast<std::uint8_t*>(&word) + k / 8);
    }
    bits[i] = word ^ flip;
  }
  return words;
}

HWY_ATTR std::size_t WriteRow(const Word* bits, std::size_t words, bool wanted, std::uint8_t value,
                              std::uint8_t* pixels) {
  if constexpr (!kHasVectors) return 0;
  const hn::CappedTag<std::uint8_t, kWordBits> d;
  const std::size_t lanes = hn::Lanes(d);
  const auto written = hn::Set(d, value);
  const Word flip = wanted ? 0 : ~Word{0};
  for (std::size_t i = 0; i < words; ++i) {
    std::uint8_t* const to = pixels + i * kWordBits;
    hwy::Prefetch(to + kBytesAhead);
    const Word word = bits[i] ^ flip;
    if (word == 0) continue;
    if (word == ~Word{0}) {
      for (std::size_t k = 0; k < kWordBits; k += lanes) hn::StoreU(written, d, to + k);
      continue;
    }
    for (std::size_t k = 0; k < kWordBits; k += lanes) {
      // (A mask is read through eight bytes.)
      const Word part[2] = {word >> k, 0};
      const auto mask = hn::LoadMaskBits(d, reinterpret_cast<const std::uint8_t*>(part));
      hn::BlendedStore(written, mask, d, to + k);
    }
  }
  return words;
}

HWY_ATTR bool MergeRow(const Word* from, std::size_t words, Word* to) {
  if constexpr (!kHasVectors) return false;
  const hn::CappedTag<Word, kChunk> d;
  for (std::size_t i = 0; i < words; i += hn::Lanes(d)) {
    hn::StoreU(hn::Or(hn::LoadU(d, from + i), hn::LoadU(d, to + i)), d, to + i);
  }
  return true;
}

template <class D>
HWY_INLINE hn::Vec<D> LoadShifted(D d, const Shifted& row, std::size_t i) {
  const auto low = hn::ShiftRightSame(hn::LoadU(d, row.words + i), row.shift);
  const auto high = hn::ShiftLeft<1>(hn::LoadU(d, row.words + i + 1));
  return hn::Or(low, hn::ShiftLeftSame(high, Shifted::kBits - 1 - row.shift));
}

HWY_ATTR bool MergeShiftedRow(const Shifted& a, const Shifted& b, std::size_t words, Word* to) {
  if constexpr (!kHasVectors) return false;
  const hn::CappedTag<Word, kChunk> d;
  const Shifted first = a;
  const Shifted second = b;
  for (std::size_t i = 0; i < words; i += hn::Lanes(d)) {
    hn::StoreU(hn::Or(LoadShifted(d, first, i), LoadShifted(d, second, i)), d, to + i);
  }
  return true;
}

}  // namespace zarn::processes::filters::bitrows::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters::bitrows {

HWY_EXPORT(PackRow);
HWY_EXPORT(WriteRow);
HWY_EXPORT(MergeRow);
HWY_EXPORT(MergeShiftedRow);

std::size_t PackWords(const std::uint8_t* pixels, std::size_t words, std::uint8_t value, bool equal,
                      Word* bits) {
  return HWY_DYNAMIC_DISPATCH(PackRow)(pixels, words, value, equal, bits);
}

std::size_t WriteWords(const Word* bits, std::size_t words, bool wanted, std::uint8_t value,
                       std::uint8_t* pixels) {
  return HWY_DYNAMIC_DISPATCH(WriteRow)(bits, words, wanted, value, pixels);
}

bool MergeWords(const Word* from, std::size_t words, Word* to) {
  return HWY_DYNAMIC_DISPATCH(MergeRow)(from, words, to);
}

bool MergeShiftedWords(const Shifted& a, const Shifted& b, std::size_t words, Word* to) {
  return HWY_DYNAMIC_DISPATCH(MergeShiftedRow)(a, b, words, to);
}

}  // namespace zarn::processes::filters::bitrows

#endif  // HWY_ONCE
