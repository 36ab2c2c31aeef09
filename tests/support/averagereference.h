// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <vector>

#include "tests/support/conversionreference.h"
#include "tests/support/testblock.h"

namespace zarn::testsupport {

struct AverageParameters {
  int kernelSize = 3;
  std::optional<double> background = {};
  std::vector<double> inputNoData = {};
  std::vector<double> outputNoData = {};
};

/// The average filter in plain loops. `mask` is empty or has a byte for each pixel of the full
/// input block; `output` keeps what it holds where the filter does not write.
template <typename T>
void ReferenceAverage(const AverageParameters& parameters, const TestBlock<T>& input,
                      const std::vector<std::uint8_t>& mask, TestBlock<T>& output) {
  const auto half = static_cast<std::ptrdiff_t>(parameters.kernelSize / 2);
  const std::size_t channels = input.shape().channels;

  std::vector<T> noData;
  for (const double value : parameters.inputNoData) noData.push_back(ReferenceListEntry<T>(value));
  std::vector<T> written;
  for (const double value : parameters.outputNoData) {
    written.push_back(ReferenceListEntry<T>(value));
  }
  const T background = ReferenceBackground<T>(parameters.background.value_or(0));

  const auto isMasked = [&](std::ptrdiff_t x, std::ptrdiff_t y) {
    return !mask.empty() && mask[static_cast<std::size_t>(input.shape().PixelIndex(x, y))] == 0;
  };
  const auto isNoData = [&](std::ptrdiff_t x, std::ptrdiff_t y) {
    if (noData.empty()) return false;
    std::size_t equal = 0;
    for (std::size_t c = 0; c < channels; ++c) {
      if (input.Pixel(x, y)[c] == noData[c]) ++equal;
    }
    return equal == channels;
  };
  const auto isBackground = [&](std::ptrdiff_t x, std::ptrdiff_t y) {
    if (!parameters.background) return false;
    std::size_t equal = 0;
    for (std::size_t c = 0; c < channels; ++c) {
      if (input.Pixel(x, y)[c] == background) ++equal;
    }
    return equal == channels;
  };

  const auto width = static_cast<std::ptrdiff_t>(output.shape().width);
  const auto height = static_cast<std::ptrdiff_t>(output.shape().height);
  const std::ptrdiff_t windowedWidth = width + 2 * half;
  std::vector<char> counts(static_cast<std::size_t>(windowedWidth * (height + 2 * half)));
  const auto countsAt = [&](std::ptrdiff_t x, std::ptrdiff_t y) -> char& {
    return counts[static_cast<std::size_t>((y + half) * windowedWidth + x + half)];
  };
  for (std::ptrdiff_t y = -half; y < height + half; ++y) {
    for (std::ptrdiff_t x = -half; x < width + half; ++x) {
      countsAt(x, y) = !isMasked(x, y) && !isNoData(x, y) && !isBackground(x, y);
    }
  }

  for (std::ptrdiff_t y = 0; y < height; ++y) {
    for (std::ptrdiff_t x = 0; x < width; ++x) {
      if (isMasked(x, y)) continue;
      if (isNoData(x, y)) {
        for (std::size_t c = 0; c < channels && !written.empty(); ++c) {
          output.Pixel(x, y)[c] = written[c];
        }
        continue;
      }
      if (isBackground(x, y)) {
        for (std::size_t c = 0; c < channels; ++c) output.Pixel(x, y)[c] = background;
        continue;
      }
      for (std::size_t c = 0; c < channels; ++c) {
        double sum = 0;
        unsigned count = 0;
        for (std::ptrdiff_t dy = -half; dy <= half; ++dy) {
          for (std::ptrdiff_t dx = -half; dx <= half; ++dx) {
            if (!countsAt(x + dx, y + dy)) continue;
            sum += static_cast<double>(input.Pixel(x + dx, y + dy)[c]);
            ++count;
          }
        }
        std::optional<double> avoided;
        if (!parameters.outputNoData.empty()) avoided = parameters.outputNoData[c];
        output.Pixel(x, y)[c] =
            ReferenceResult<T>(sum / count, static_cast<double>(std::numeric_limits<T>::lowest()),
                               static_cast<double>(std::numeric_limits<T>::max()), avoided);
      }
    }
  }
}

}  // namespace zarn::testsupport
