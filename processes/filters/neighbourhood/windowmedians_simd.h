// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace zarn::processes::filters {

/// A row of windows of ordered keys. All rows of input are padded by kRowPadding elements.
template <typename Key>
struct KeyWindows {
  const Key* const* rows;      ///< of the windows, from the top, starting at their left column
  const Key* const* excluded;  ///< beside them: all bits set where a key does not count, else 0;
                               ///< null where all count
  const Key* next;    ///< the row that enters them next, or null: it is asked for meanwhile
  std::size_t taps;   ///< side of the windows: 3, 5 or 7
  std::size_t step;   ///< from one column to the next
  std::size_t count;  ///< windows
  Key* scratch;       ///< `MedianScratchKeys` elements
  Key* medians;       ///< the `count` results, without padding; where nothing counts, anything
};

/// Windows that share a pass over the scratch: so many bytes of keys stay in the nearest cache with
/// all that is derived from them.
inline constexpr std::size_t kMedianBlockBytes = 1024;

/// Length of a row of scratch: whole cache lines, and room for a vector past the end.
template <typename Key>
constexpr std::size_t MedianPitch(std::size_t taps, std::size_t step) {
  constexpr std::size_t kLine = 64 / sizeof(Key);
  const std::size_t length = kMedianBlockBytes / sizeof(Key) + (taps - 1) * step;
  return (length + kLine - 1) / kLine * kLine + kLine;
}

/// Elements of scratch for these windows.
template <typename Key>
constexpr std::size_t MedianScratchKeys(std::size_t taps, std::size_t step) {
  return (3 * taps + 1) * MedianPitch<Key>(taps, step);
}

/// Finds the medians, the lower one of two.
template <typename Key>
void FindMedians(const KeyWindows<Key>& windows);

}  // namespace zarn::processes::filters
