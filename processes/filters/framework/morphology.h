// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <vector>

#include "processes/filters/filtersexport.h"

namespace zarn::processes::filters {

// Both functions look at images of `width` * `height` bytes, row by row, without margins, and write
// only the pixels that pass their test: the caller prepares the output, for instance as a copy of
// the input. Input and output must not overlap.
//
// `offsets` holds pairs of a column and a row offset (see `SetupKernelSE`); an odd last entry is
// ignored. With no pair, or a size that is not positive, nothing happens. The results do not depend
// on the number of threads; distinct outputs may be written by several threads at once. Exceptions
// come only from allocation, before the first write.

/// Grows the region of `matchValue`: writes `setValue` to every pixel that has the value or whose
/// neighbour at one of the offsets has it. Neighbours outside the image do not exist.
ZARN_FILTERS_EXPORT void MorphDilation(const std::uint8_t* input, std::uint8_t* output, int width,
                                       int height, std::uint8_t matchValue, std::uint8_t setValue,
                                       const std::vector<int>& offsets);
/// The same with `value` to match and to set.
ZARN_FILTERS_EXPORT void MorphDilation(const std::uint8_t* input, std::uint8_t* output, int width,
                                       int height, std::uint8_t value,
                                       const std::vector<int>& offsets);

/// Shrinks the region of `matchValue`: writes `setValue` to every pixel that has the value together
/// with all its neighbours at the offsets. Neighbours outside the image count as having it, so the
/// region is not eaten from the image border.
ZARN_FILTERS_EXPORT void MorphErosion(const std::uint8_t* input, std::uint8_t* output, int width,
                                      int height, std::uint8_t matchValue, std::uint8_t setValue,
                                      const std::vector<int>& offsets);
/// The same with `value` to match and to set.
ZARN_FILTERS_EXPORT void MorphErosion(const std::uint8_t* input, std::uint8_t* output, int width,
                                      int height, std::uint8_t value,
                                      const std::vector<int>& offsets);

}  // namespace zarn::processes::filters
