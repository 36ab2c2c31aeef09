// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

namespace zarn::processes::filters {

/// Neighbours of one row side by side: the column offsets `first` .. `last`, in all rows whose
/// offsets are `rows`.
struct KernelRun {
  std::ptrdiff_t first = 0;
  std::ptrdiff_t last = 0;
  std::vector<std::ptrdiff_t> rows;
};

/// The cells of an offset list, and the centre, as runs.
struct KernelRuns {
  std::vector<KernelRun> runs;
  std::ptrdiff_t top = 0;     ///< smallest row offset, not above 0
  std::ptrdiff_t bottom = 0;  ///< largest row offset, not below 0

  /// Leaves out the cells that lie outside of an image of `width` x `height` pixels wherever the
  /// centre is. Equal cells become one; an odd last entry of `offsets` is ignored.
  KernelRuns(const std::vector<int>& offsets, std::ptrdiff_t width, std::ptrdiff_t height);
};

}  // namespace zarn::processes::filters
