// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

namespace zarn::processes::filters {

/// A row of windows of ordered keys. All rows are padded by kRowPadding elements.
template <typename Key>
struct KeyWindows {
  const Key* const* rows;      ///< of the windows, from the top, starting at their left column
  const Key* const* excluded;  ///< beside them: all bits set where a key does not count, else 0;
                               ///< null where all count
  std::size_t taps;            ///< side of the windows: 3, 5 or 7
  std::size_t step;            ///< from one column to the next
  std::size_t count;           ///< windows
  Key* columns;                ///< scratch: `taps` + 1 rows of `pitch` elements
  std::size_t pitch;           ///< count + (taps - 1) * step, padded
  Key* medians;                ///< the results; where nothing counts, anything
};

/// Finds the medians, the lower one of two.
template <typename Key>
void FindMedians(const KeyWindows<Key>& windows);

}  // namespace zarn::processes::filters
