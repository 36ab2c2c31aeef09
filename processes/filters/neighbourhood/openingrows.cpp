// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/openingrows.h"

#include <algorithm>
#include <bit>

namespace zarn::processes::filters {
namespace {

std::size_t WordsFor(std::size_t pixels) {
  constexpr std::size_t kChunkBits = bitrows::kWordBits * bitrows::kChunk;
  return (pixels + kChunkBits - 1) / kChunkBits * bitrows::kChunk;
}

}  // namespace

BitRowLayout::BitRowLayout(std::size_t rowWidth, std::size_t half)
    : width(rowWidth),
      taps(2 * half + 1),
      words(WordsFor(rowWidth)),
      padding(WordsFor(taps)),
      levels(static_cast<std::size_t>(std::bit_width(taps))) {}

std::size_t SquareUnion::Words(const BitRowLayout& layout) {
  return layout.levels * layout.PaddedWords() + (layout.taps + 2) * layout.words;
}

SquareUnion::SquareUnion(const BitRowLayout& layout, bool outside, Word* scratch)
    : layout_(layout),
      outside_(outside ? ~Word{0} : 0),
      levels_(scratch),
      slots_(levels_ + layout.levels * layout.PaddedWords()),
      soFar_(slots_ + layout.taps * layout.words),
      united_(soFar_ + layout.words) {
  std::fill_n(levels_, layout.levels * layout.PaddedWords(), outside_);
  std::fill_n(slots_, (layout.taps + 2) * layout.words, Word{0});
}

const bitrows::Word* SquareUnion::Push() {
  const BitRowLayout& layout = layout_;
  for (std::size_t n = 1; n < layout.levels; ++n) {
    // Before the row as well: runs that begin there reach into it.
    bitrows::MergeShifted(Level(n - 1) - layout.padding, 0, std::ptrdiff_t{1} << (n - 1),
                          layout.padding + layout.words, Level(n) - layout.padding);
  }
  // A run is two, perhaps overlapping, of the power of two below its length.
  const auto half = static_cast<std::ptrdiff_t>(layout.taps / 2);
  const std::ptrdiff_t longest = std::ptrdiff_t{1} << (layout.levels - 1);
  bitrows::MergeShifted(Level(layout.levels - 1), -half, half + 1 - longest, layout.words,
                        Slot(next_));
  return UniteRows();
}

const bitrows::Word* SquareUnion::PushOutside() {
  std::fill_n(Slot(next_), layout_.words, outside_);
  return UniteRows();
}

const bitrows::Word* SquareUnion::UniteRows() {
  const std::size_t words = layout_.words;
  bitrows::Merge(Slot(next_), words, soFar_);
  std::copy_n(soFar_, words, united_);
  if (next_ + 1 < layout_.taps) {
    bitrows::Merge(Slot(next_ + 1), words, united_);
    ++next_;
    return united_;
  }
  for (std::size_t slot = next_; slot > 0; --slot) {
    bitrows::Merge(Slot(slot), words, Slot(slot - 1));
  }
  std::fill_n(soFar_, words, Word{0});
  next_ = 0;
  return united_;
}

}  // namespace zarn::processes::filters
