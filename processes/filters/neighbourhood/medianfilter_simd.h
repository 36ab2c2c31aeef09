// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

#include "processes/filters/neighbourhood/medianrows.h"

namespace zarn::processes::filters {

/// Bytes of scratch that one band of `MedianRowsSimd` needs.
template <typename T>
std::size_t MedianScratchBytes(const MedianJob<T>& job);

/// The vector twin of `MedianRows`: the same bits, many times faster. `scratch` is aligned to 64
/// bytes; its content does not matter.
template <typename T>
void MedianRowsSimd(const MedianJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end,
                    std::byte* scratch);

}  // namespace zarn::processes::filters
