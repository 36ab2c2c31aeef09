// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/sortingnetwork.h"

#include <algorithm>
#include <bit>

namespace zarn::processes::filters {
namespace {

// Batcher's merge exchange, which sorts any number of values.
std::vector<Exchange> SortingNetwork(std::size_t count) {
  std::vector<Exchange> steps;
  const std::size_t top = count < 2 ? 0 : std::bit_floor(count - 1);
  for (std::size_t p = top; p > 0; p /= 2) {
    std::size_t phase = 0;
    std::size_t distance = p;
    for (std::size_t q = top;; q /= 2) {
      for (std::size_t i = 0; i + distance < count; ++i) {
        if ((i & p) != phase) continue;
        steps.push_back({static_cast<std::uint16_t>(i), static_cast<std::uint16_t>(i + distance),
                         Exchange::Keep::kBoth});
      }
      if (q == p) break;
      distance = q - p;
      phase = p;
    }
  }
  return steps;
}

}  // namespace

std::vector<Exchange> SelectionNetwork(std::size_t count, std::size_t lowestRank,
                                       std::size_t highestRank) {
  std::vector<Exchange> steps = SortingNetwork(count);
  // From the end: a step whose results nobody looks at is left out.
  std::vector<bool> needed(count, false);
  for (std::size_t rank = lowestRank; rank <= highestRank; ++rank) needed[rank] = true;
  std::vector<Exchange> kept;
  for (auto step = steps.rbegin(); step != steps.rend(); ++step) {
    const bool lesser = needed[step->first];
    const bool greater = needed[step->second];
    if (!lesser && !greater) continue;
    if (lesser != greater) {
      step->keep = lesser ? Exchange::Keep::kLesser : Exchange::Keep::kGreater;
    }
    needed[step->first] = needed[step->second] = true;
    kept.push_back(*step);
  }
  std::reverse(kept.begin(), kept.end());
  return kept;
}

}  // namespace zarn::processes::filters
