// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace zarn::processes::filters {

/// One step of a sorting network: the lesser of the values in two places goes to the first place,
/// the greater one to the second.
struct Exchange {
  /// Which results anything still looks at.
  enum class Keep : std::uint8_t { kBoth, kLesser, kGreater };

  std::uint16_t first;
  std::uint16_t second;
  Keep keep;
};

/// Largest number of values that a network sorts: long before that there are faster ways.
inline constexpr std::size_t kMostSorted = 4096;

/// Calls `use(first, second)` for the steps of a network that sorts `count` values: Batcher's merge
/// exchange.
template <class Use>
constexpr void ForEachSortingStep(std::size_t count, const Use& use) {
  const std::size_t top = count < 2 ? 0 : std::bit_floor(count - 1);
  for (std::size_t p = top; p > 0; p /= 2) {
    std::size_t phase = 0;
    std::size_t distance = p;
    for (std::size_t q = top;; q /= 2) {
      for (std::size_t i = 0; i + distance < count; ++i) {
        if ((i & p) == phase) use(i, i + distance);
      }
      if (q == p) break;
      distance = q - p;
      phase = p;
    }
  }
}

/// A network that brings the values of ranks `lowestRank` .. `highestRank` of `count` values, at
/// most `kMostSorted`, to the places of these numbers; the other places end up with anything. The
/// same steps serve whatever the values are, so that vectors of values can take them at once.
std::vector<Exchange> SelectionNetwork(std::size_t count, std::size_t lowestRank,
                                       std::size_t highestRank);

}  // namespace zarn::processes::filters
