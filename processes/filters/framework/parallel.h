// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <omp.h>

#include <algorithm>
#include <cstddef>

#include "host/sys/openmp.h"

namespace zarn::processes::filters::parallel {

/// Lets the run-time use fewer threads on a loaded machine, unless the caller is inside a region of
/// its own, whose settings then stand. The results never depend on it; only the time does.
inline void AllowDynamicThreads() {
  if (omp_in_parallel() == 0) omp_set_dynamic(1);
}

/// How many bands `ForEachRowBand` will cut `rows` rows into: what a caller sizes its scratch by.
inline std::ptrdiff_t BandCount(std::ptrdiff_t rows) {
  return std::clamp<std::ptrdiff_t>(sys::OMPGetMaxThreads(), 1, std::max<std::ptrdiff_t>(rows, 1));
}

/// Runs `work(band, firstRow, endRow)` for `bands` contiguous runs of rows, shared out statically.
/// `work` must not throw, allocate or lock; it owns the scratch of its band.
template <typename Work>
void ForEachRowBand(std::ptrdiff_t rows, std::ptrdiff_t bands, const Work& work) {
#pragma omp parallel for schedule(static)
  for (std::ptrdiff_t band = 0; band < bands; ++band) {
    work(band, rows * band / bands, rows * (band + 1) / bands);
  }
}

}  // namespace zarn::processes::filters::parallel
