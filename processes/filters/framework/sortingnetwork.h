// SPDX-License-Identifier: Apache-2.0
#pragma once

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

/// A network that brings the values of ranks `lowestRank` .. `highestRank` of `count` values, at
/// most `kMostSorted`, to the places of these numbers; the other places end up with anything. The
/// same steps serve whatever the values are, so that vectors of values can take them at once.
std::vector<Exchange> SelectionNetwork(std::size_t count, std::size_t lowestRank,
                                       std::size_t highestRank);

}  // namespace zarn::processes::filters
