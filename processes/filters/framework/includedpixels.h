// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>

namespace zarn::processes::filters {

/// Calls `use(first, last)` for the pixels `first` .. `last` - 1 between excluded ones, from left
/// to right.
template <class Use>
void ForEachIncluded(const std::uint8_t* excluded, std::size_t count, const Use& use) {
  const std::uint8_t* const end = excluded + count;
  for (const std::uint8_t* at = excluded; at != end;) {
    const std::uint8_t* const first = std::find(at, end, 0);
    at = std::find_if(first, end, [](std::uint8_t flag) { return flag != 0; });
    if (first != at) {
      use(static_cast<std::size_t>(first - excluded), static_cast<std::size_t>(at - excluded));
    }
  }
}

}  // namespace zarn::processes::filters
