// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>

#include "processes/filters/framework/orderedkeys.h"
#include "processes/filters/neighbourhood/windowjob.h"

namespace zarn::processes::filters {

/// Side of the largest window: its samples fit a small buffer of each thread.
inline constexpr std::ptrdiff_t kMostMedianTaps = 7;

template <typename T>
using MedianJob = WindowJob<T>;

/// Median of channel `c` over the window around (x, y), the lower one of two. The centre must
/// count.
template <typename T>
T WindowMedian(const MedianJob<T>& job, std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t c) {
  T samples[kMostMedianTaps * kMostMedianTaps] = {};
  std::ptrdiff_t count = 0;
  job.ForEachCounted(
      x, y, [&](const T* pixel, std::ptrdiff_t, std::ptrdiff_t) { samples[count++] = pixel[c]; });
  T* const middle = samples + (count - 1) / 2;
  std::nth_element(samples, middle, samples + count, SortsBefore());
  return *middle;
}

/// The definition of the filter, for output rows `begin` .. `end` - 1.
template <typename T>
void MedianRows(const MedianJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end) {
  job.ForEachSample(begin, end, [&](std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t c) {
    return WindowMedian(job, x, y, c);
  });
}

}  // namespace zarn::processes::filters
