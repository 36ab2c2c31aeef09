// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

namespace zarn::processes::filters {

/// Rows of yes and no, 64 to the word: bit x % 64 of word x / 64 is pixel x. The loops take whole
/// chunks of words, so rows are padded to such a number.
namespace bitrows {

using Word = std::uint64_t;
inline constexpr std::size_t kWordBits = 64;
inline constexpr std::size_t kChunk = 8;

/// Sets the bits of `count` pixels to whether they equal `value` (or, with `equal` false, do not),
/// and those after them in the last word to 0.
void Pack(const std::uint8_t* pixels, std::size_t count, std::uint8_t value, bool equal,
          Word* bits);

/// Writes `value` to those of `count` pixels whose bit equals `wanted`.
void WriteWhere(const Word* bits, std::size_t count, bool wanted, std::uint8_t value,
                std::uint8_t* pixels);

/// `to` |= `from`.
void Merge(const Word* from, std::size_t words, Word* to);

/// A row moved along: its pixel x is pixel x + `offset` of `from`.
struct Shifted {
  Shifted(const Word* from, std::ptrdiff_t offset)
      : words(from + (offset - InWord(offset)) / kBits), shift(InWord(offset)) {}

  // (In two steps, because no word may be shifted by all of its bits.)
  Word operator[](std::size_t i) const {
    return words[i] >> shift | words[i + 1] << 1 << (kBits - 1 - shift);
  }

  static constexpr int kBits = kWordBits;
  static int InWord(std::ptrdiff_t offset) { return static_cast<int>(offset & (kBits - 1)); }

  const Word* words;  ///< the one that holds the first pixel
  int shift;          ///< and where in it
};

/// Pixel x of `to` becomes pixel x + `a` or pixel x + `b` of `from`, whose words must reach as far
/// and one word further; offsets may be negative.
void MergeShifted(const Word* from, std::ptrdiff_t a, std::ptrdiff_t b, std::size_t words,
                  Word* to);

}  // namespace bitrows
}  // namespace zarn::processes::filters
