// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "processes/filters/framework/nodata.h"

namespace zarn::processes::filters {

/// What colour balancers and normalisation decide for each pixel before any formula: which pixels
/// are no-data, and what these become.
template <typename T>
class BalanceRules {
 public:
  /// The lists are empty or have an entry for each channel. `mask` is null or has a byte for each
  /// pixel.
  BalanceRules(std::size_t channels, const std::vector<double>& inputNoData,
               const std::vector<double>& outputNoData, const std::uint8_t* mask)
      : channels_(channels),
        mask_(mask),
        inputNoData_(ConvertNoData<T>(inputNoData)),
        outputNoData_(ConvertNoData<T>(outputNoData)) {}

  /// Whether pixel `index`, whose samples are at `pixel`, is masked or no-data.
  bool Excludes(const T* pixel, std::size_t index) const {
    if (mask_ != nullptr && mask_[index] == 0) return true;
    return !inputNoData_.empty() && PixelNearlyEquals(pixel, inputNoData_.data(), channels_);
  }

  /// Writes what an excluded pixel becomes: the output no-data pixel, or what the output holds.
  void WriteExcluded(T* output) const {
    if (!outputNoData_.empty()) std::copy_n(outputNoData_.begin(), channels_, output);
  }

  /// Null where there is none.
  const T* inputNoData() const { return inputNoData_.empty() ? nullptr : inputNoData_.data(); }
  const T* outputNoData() const { return outputNoData_.empty() ? nullptr : outputNoData_.data(); }
  const std::uint8_t* mask() const { return mask_; }

 private:
  std::size_t channels_;
  const std::uint8_t* mask_;
  std::vector<T> inputNoData_;
  std::vector<T> outputNoData_;
};

}  // namespace zarn::processes::filters
