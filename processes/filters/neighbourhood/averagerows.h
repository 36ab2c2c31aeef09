// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "processes/filters/framework/blockview.h"
#include "processes/filters/framework/outputconverter.h"
#include "processes/filters/neighbourhood/windowrules.h"

namespace zarn::processes::filters {

/// Everything that one call of the average filter shares between its threads.
template <typename T>
struct AverageJob {
  BlockView<const T> input;
  BlockView<T> output;
  BlockView<const std::uint8_t> mask;  ///< over the input block; holds null when there is no mask
  WindowRules<T> rules;
  std::vector<OutputConverter<T>> converters;  ///< one per channel
  std::ptrdiff_t half;

  const std::uint8_t* MaskByte(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return rules.mask() == nullptr ? nullptr : mask.Pixel(x, y);
  }
  Exclusion Classify(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return rules.Classify(input.Pixel(x, y), MaskByte(x, y));
  }
};

/// Mean of channel `c` over the window around (x, y): the sum in double over the neighbours that
/// count, row by row, divided by their number. The centre must count.
template <typename T>
double WindowMean(const AverageJob<T>& job, std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t c) {
  double sum = 0.0;
  std::uint64_t count = 0;
  for (std::ptrdiff_t dy = -job.half; dy <= job.half; ++dy) {
    for (std::ptrdiff_t dx = -job.half; dx <= job.half; ++dx) {
      if (job.Classify(x + dx, y + dy) != Exclusion::kNone) continue;
      sum += static_cast<double>(job.input.Pixel(x + dx, y + dy)[c]);
      count += 1;
    }
  }
  return sum / static_cast<double>(count);
}

/// The definition of the filter, for output rows `begin` .. `end` - 1.
template <typename T>
void AverageRows(const AverageJob<T>& job, std::ptrdiff_t begin, std::ptrdiff_t end) {
  for (std::ptrdiff_t y = begin; y < end; ++y) {
    for (std::ptrdiff_t x = 0; x < job.output.Width(); ++x) {
      T* const out = job.output.Pixel(x, y);
      const Exclusion exclusion = job.Classify(x, y);
      if (exclusion != Exclusion::kNone) {
        job.rules.WriteExcluded(exclusion, out);
        continue;
      }
      for (std::ptrdiff_t c = 0; c < job.output.Channels(); ++c) {
        out[c] = job.converters[static_cast<std::size_t>(c)](WindowMean(job, x, y, c));
      }
    }
  }
}

}  // namespace zarn::processes::filters
