// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <omp.h>

#include <algorithm>
#include <cstddef>
#include <exception>
#include <mutex>

#include "host/sys/openmp.h"

namespace zarn::sys::parallel {

/// Lets the run-time use fewer threads on a loaded machine, unless the caller is inside a region of
/// its own, whose settings then stand. The results never depend on it; only the time does.
inline void AllowDynamicThreads() {
  if (omp_in_parallel() == 0) omp_set_dynamic(1);
}

/// Whether a loop of the calling thread would get more than one thread: there are more, and a
/// region that is already active lets others start inside it.
inline bool MayShareOut() {
  return OMPGetMaxThreads() > 1 &&
         (omp_in_parallel() == 0 || omp_get_max_active_levels() > omp_get_active_level());
}

/// How many bands `ForEachRowBand` will cut `rows` rows into: what a caller sizes its scratch by.
inline std::ptrdiff_t BandCount(std::ptrdiff_t rows) {
  return std::clamp<std::ptrdiff_t>(OMPGetMaxThreads(), 1, std::max<std::ptrdiff_t>(rows, 1));
}

/// Runs `work(band, firstRow, endRow)` for `bands` contiguous runs of rows (or of pixels), shared
/// out statically; one band runs in the calling thread. `work` must not throw, allocate or lock; it
/// owns the scratch of its band.
template <typename Work>
void ForEachRowBand(std::ptrdiff_t rows, std::ptrdiff_t bands, const Work& work) {
#pragma omp parallel for schedule(static) if (bands > 1)
  for (std::ptrdiff_t band = 0; band < bands; ++band) {
    work(band, rows * band / bands, rows * (band + 1) / bands);
  }
}

/// The same for work that calls the host, which may throw: the first exception is rethrown when all
/// bands are done.
template <typename Work>
void ForEachRowBandRethrowing(std::ptrdiff_t rows, std::ptrdiff_t bands, const Work& work) {
  std::exception_ptr failure;
  std::mutex mutex;
  ForEachRowBand(rows, bands, [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
    try {
      work(band, begin, end);
    } catch (...) {
      const std::lock_guard lock(mutex);
      if (!failure) failure = std::current_exception();
    }
  });
  if (failure) std::rethrow_exception(failure);
}

}  // namespace zarn::sys::parallel
