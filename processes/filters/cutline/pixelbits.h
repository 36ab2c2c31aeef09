// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace zarn::processes::filters {

/// One bit for each column of a row, 64 in a word, the lowest first. Bits past the width are 0.
using PixelBits = std::vector<std::uint64_t>;

inline constexpr std::size_t kWordColumns = 64;

inline std::size_t WordsFor(std::size_t columns) {
  return (columns + kWordColumns - 1) / kWordColumns;
}

/// Calls `use(first, end)` for the runs of set bits, from left to right.
template <typename Use>
void ForEachRun(const PixelBits& bits, const Use& use) {
  std::size_t first = 0;
  bool open = false;
  for (std::size_t w = 0; w < bits.size(); ++w) {
    // The columns where a run begins or ends.
    std::uint64_t changes = bits[w] ^ (bits[w] << 1 | (open ? 1U : 0U));
    for (; changes != 0; changes &= changes - 1) {
      const std::size_t column =
          w * kWordColumns + static_cast<std::size_t>(std::countr_zero(changes));
      if (open) use(first, column);
      first = column;
      open = !open;
    }
  }
  if (open) use(first, bits.size() * kWordColumns);
}

/// Sets the lowest `columns` bits and clears all others.
inline void SetFirst(PixelBits& bits, std::size_t columns) {
  for (std::size_t w = 0; w < bits.size(); ++w) {
    const std::size_t begin = w * kWordColumns;
    if (columns <= begin) {
      bits[w] = 0;
    } else if (columns >= begin + kWordColumns) {
      bits[w] = ~std::uint64_t{0};
    } else {
      bits[w] = (std::uint64_t{1} << (columns - begin)) - 1;
    }
  }
}

}  // namespace zarn::processes::filters
