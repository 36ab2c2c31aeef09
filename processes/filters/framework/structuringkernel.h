// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "processes/filters/filtersexport.h"

namespace zarn::processes::filters {

/// Shape of a structuring kernel. Values without a name are allowed and give the square.
enum class KernelShape : int { kSquare = 0, kDisc = 1 };

/// Largest size of a structuring kernel.
inline constexpr float kMaxKernelSize = 16384;

/// Fills `offsets` with the cells of a kernel, replacing what it holds: pairs of the column offset
/// dx and the row offset dy, column by column from the left, each from the top.
///
/// With half = ceil(size) / 2, rounded down, both offsets run from -half to half, so an even size
/// gives the square of the next odd one. The disc keeps the cells whose distance from the centre is
/// at most size / 2. A size that is not above 0 (or is not a number) gives an empty list. Throws
/// `std::length_error`, with `offsets` untouched, for a size above `kMaxKernelSize`.
ZARN_FILTERS_EXPORT void SetupKernelSE(float size, std::vector<int>& offsets, KernelShape shape);

/// Copies `offsets` into a new array, which the caller releases with `delete[]`, and sets `count`
/// to its length; an array is allocated even for length 0. Throws `std::length_error`, with both
/// results untouched, for a list whose length is no int.
ZARN_FILTERS_EXPORT void Vec2ArrSE(const std::vector<int>& offsets, int*& array, int& count);

}  // namespace zarn::processes::filters
