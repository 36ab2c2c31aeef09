// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

#include "processes/filters/neighbourhood/averagerows.h"

namespace zarn::processes::filters {

/// Bytes of scratch that one band of `AverageRowsSimd` needs.
template <typename T>
std::size_t AverageScratchBytes(const AverageJob<T>& job);

/// The vector twin of `AverageRows`: the same bits, many times faster, in time that hardly depends
/// on the size of the window. `scratch` is aligned to 64 bytes; its content does not matter.
template <typename T>
void AverageRowsSimd(const AverageJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end,
                     std::byte* scratch);

}  // namespace zarn::processes::filters
