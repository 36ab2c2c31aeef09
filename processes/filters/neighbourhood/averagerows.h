// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "processes/filters/framework/outputconverter.h"
#include "processes/filters/neighbourhood/windowjob.h"

namespace zarn::processes::filters {

template <typename T>
struct AverageJob : WindowJob<T> {
  std::vector<OutputConverter<T>> converters;  ///< one per channel
};

/// Mean of channel `c` over the window around (x, y): the sum in double over the neighbours that
/// count, row by row, divided by their number. The centre must count.
template <typename T>
double WindowMean(const AverageJob<T>& job, std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t c) {
  double sum = 0.0;
  std::uint64_t count = 0;
  job.ForEachCounted(x, y, [&](const T* pixel, std::ptrdiff_t, std::ptrdiff_t) {
    sum += static_cast<double>(pixel[c]);
    count += 1;
  });
  return sum / static_cast<double>(count);
}

/// The definition of the filter, for output rows `begin` .. `end` - 1.
template <typename T>
void AverageRows(const AverageJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end) {
  job.ForEachSample(begin, end, [&](std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t c) {
    return job.converters[static_cast<std::size_t>(c)](WindowMean(job, x, y, c));
  });
}

}  // namespace zarn::processes::filters
