// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

#include "processes/filters/framework/outputconverter.h"

namespace zarn::processes::filters {

/// Gains, offsets and converters of neighbouring interleaved samples.
template <typename T>
class GainOffsetPattern {
 public:
  /// One entry per channel each.
  GainOffsetPattern(const double* gains, const double* offsets,
                    const std::vector<OutputConverter<T>>& converters);

  /// `sample * gain + offset`, converted, for `count` samples from the first one of a pixel on: the
  /// same bits as one by one. The results may take the place of the samples.
  void Apply(const T* samples, std::size_t count, T* results) const;

  // One double for each sample, from any channel on for at least a vector.
  std::vector<double> gain;
  std::vector<double> offset;
  std::vector<double> low;
  std::vector<double> high;
  std::vector<double> noData;
  std::vector<double> replacement;
  std::size_t channels;
  bool avoids = false;
  bool oneConverter = true;  ///< all channels have the same
};

}  // namespace zarn::processes::filters
