// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/sortingnetwork.h"

#include <algorithm>

namespace zarn::processes::filters {
namespace {

std::vector<Exchange> SortingNetwork(std::size_t count) {
  std::vector<Exchange> steps;
  ForEachSortingStep(count, [&](std::size_t first, std::size_t second) {
    steps.push_back({static_cast<std::uint16_t>(first), static_cast<std::uint16_t>(second),
                     Exchange::Keep::kBoth});
  });
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
