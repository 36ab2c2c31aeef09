// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cmath>
#include <cstddef>
#include <cstdint>

#include "processes/filters/neighbourhood/windowjob.h"

namespace zarn::processes::filters {

template <typename T>
struct NoiseJob : WindowJob<T> {
  T removed;  ///< what samples become that are taken for noise
};

/// Neighbours that a sample must have, itself included, to be judged at all.
inline constexpr std::uint64_t kLeastInWindow = 2;
inline constexpr std::uint64_t kLeastInCore = 3;  ///< within a pixel of the centre

/// Whether a sample of this magnitude stands out among `count` samples with these sums. A variance
/// below zero has no root, and nothing stands out.
inline bool StandsOut(double magnitude, double count, double sum, double squares) {
  const double mean = sum / count;
  const double deviation = std::sqrt((squares - count * mean * mean) / (count - 1));
  return magnitude > std::abs(1.5 * deviation + mean);
}

/// Whether sample `c` of the pixel at (x, y) is noise: sums in double over the neighbours that
/// count, row by row. The pixel must count.
template <typename T>
bool IsNoise(const NoiseJob<T>& job, std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t c) {
  std::uint64_t count = 0;
  std::uint64_t core = 0;
  double sum = 0;
  double squares = 0;
  job.ForEachCounted(x, y, [&](const T* pixel, std::ptrdiff_t dx, std::ptrdiff_t dy) {
    const auto value = static_cast<double>(pixel[c]);
    count += 1;
    core += std::abs(dx) <= 1 && std::abs(dy) <= 1 ? 1 : 0;
    sum += value;
    squares += value * value;
  });
  if (count < kLeastInWindow || core < kLeastInCore) return true;
  const double magnitude = std::abs(static_cast<double>(job.input.Pixel(x, y)[c]));
  return StandsOut(magnitude, static_cast<double>(count), sum, squares);
}

/// The definition of the filter, for output rows `begin` .. `end` - 1.
template <typename T>
void NoiseRows(const NoiseJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end) {
  job.ForEachSample(begin, end, [&](std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t c) {
    return IsNoise(job, x, y, c) ? job.removed : job.input.Pixel(x, y)[c];
  });
}

}  // namespace zarn::processes::filters
