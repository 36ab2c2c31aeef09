// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

#include "processes/filters/framework/bitrows.h"

namespace zarn::processes::filters {

/// Rows of bits with words around them, as far as a square reaches, that stand for what lies
/// outside of the image.
struct BitRowLayout {
  using Word = bitrows::Word;

  /// For rows of `width` pixels and squares of 2 * `half` + 1 pixels a side.
  BitRowLayout(std::size_t width, std::size_t half);

  std::size_t width;
  std::size_t taps;     ///< side of the square
  std::size_t words;    ///< of a row
  std::size_t padding;  ///< words before it, and as many after it
  std::size_t levels;   ///< runs whose lengths are powers of two, up to the side

  std::size_t PaddedWords() const { return words + 2 * padding; }
};

/// Takes rows of an image from top to bottom and tells which pixels have a set bit in the square
/// around them.
class SquareUnion {
 public:
  using Word = bitrows::Word;

  static std::size_t Words(const BitRowLayout& layout);

  /// Outside of the image all bits are `outside`. `scratch` holds `Words(layout)`.
  SquareUnion(const BitRowLayout& layout, bool outside, Word* scratch);

  /// Where the next row goes, bits past the width included: those are outside.
  Word* Row() { return Level(0); }
  /// Takes the row that has been put there, and turns it into the union of the squares whose last
  /// row it is.
  const Word* Push();
  /// Takes a row outside of the image.
  const Word* PushOutside();

 private:
  // Pixel x of level n is the union of the pixels x .. x + 2^n - 1 of the row.
  Word* Level(std::size_t n) { return levels_ + n * layout_.PaddedWords() + layout_.padding; }
  Word* Slot(std::size_t n) { return slots_ + n * layout_.words; }
  const Word* UniteRows();

  const BitRowLayout& layout_;
  Word outside_;
  Word* levels_;
  // The rows come in groups as high as the square. The union over a square is that of the group's
  // rows so far and of the last rows of the group before, whose unions were made when it ended.
  Word* slots_;
  Word* soFar_;
  Word* united_;
  std::size_t next_ = 0;  // slot
};

}  // namespace zarn::processes::filters
