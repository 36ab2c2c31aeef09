// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/bitrows.h"

#include <algorithm>

#if ZARN_SIMD
#include "processes/filters/framework/bitrows_simd.h"
#endif

namespace zarn::processes::filters::bitrows {
void Pack(const std::uint8_t* pixels, std::size_t count, std::uint8_t value, bool equal,
          Word* bits) {
  std::size_t done = 0;
#if ZARN_SIMD
  done = PackWords(pixels, count / kWordBits, value, equal, bits) * kWordBits;
#endif
  for (; done < count; done += kWordBits) {
    Word word = 0;
    const std::size_t size = std::min(kWordBits, count - done);
    for (std::size_t k = 0; k < size; ++k) {
      word |= Word{(pixels[done + k] == value) == equal} << k;
    }
    bits[done / kWordBits] = word;
  }
}

void WriteWhere(const Word* bits, std::size_t count, bool wanted, std::uint8_t value,
                std::uint8_t* pixels) {
  std::size_t done = 0;
#if ZARN_SIMD
  done = WriteWords(bits, count / kWordBits, wanted, value, pixels) * kWordBits;
#endif
  for (; done < count; ++done) {
    const bool bit = (bits[done / kWordBits] >> (done % kWordBits) & 1) != 0;
    if (bit == wanted) pixels[done] = value;
  }
}

void Merge(const Word* from, std::size_t words, Word* to) {
#if ZARN_SIMD
  if (MergeWords(from, words, to)) return;
#endif
  for (std::size_t i = 0; i < words; ++i) to[i] |= from[i];
}

void MergeShifted(const Word* from, std::ptrdiff_t a, std::ptrdiff_t b, std::size_t words,
                  Word* to) {
  const Shifted first(from, a);
  const Shifted second(from, b);
#if ZARN_SIMD
  if (MergeShiftedWords(first, second, words, to)) return;
#endif
  for (std::size_t i = 0; i < words; ++i) to[i] = first[i] | second[i];
}

}  // namespace zarn::processes::filters::bitrows
