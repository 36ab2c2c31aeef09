// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

#include "processes/filters/framework/blockview.h"
#include "processes/filters/neighbourhood/windowrules.h"

namespace zarn::processes::filters {

/// Everything that one call of a square-window filter shares between its threads.
template <typename T>
struct WindowJob {
  BlockView<const T> input;
  BlockView<T> output;
  BlockView<const std::uint8_t> mask;  ///< over the input block; holds null when there is no mask
  WindowRules<T> rules;
  std::ptrdiff_t half;

  /// The blocks must have passed the filter's checks; `inputMask` may be null.
  WindowJob(const gobs::Raster& inputBlock, gobs::Raster& outputBlock,
            const std::vector<double>& inputNoData, const std::vector<double>& outputNoData,
            std::optional<double> background, const std::uint8_t* inputMask, int kernelSize)
      : input(inputBlock),
        output(outputBlock),
        mask(BlockView<const std::uint8_t>::Beside(inputBlock, inputMask, 1)),
        rules(inputBlock, inputNoData, outputNoData, background, inputMask),
        half(HalfWindow(kernelSize)) {}

  const std::uint8_t* MaskByte(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return rules.mask() == nullptr ? nullptr : mask.Pixel(x, y);
  }
  Exclusion Classify(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return rules.Classify(input.Pixel(x, y), MaskByte(x, y));
  }

  /// Calls `use(pixel, dx, dy)` for the neighbours of the window around (x, y) that count, row by
  /// row, each row from the left.
  template <class Use>
  void ForEachCounted(std::ptrdiff_t x, std::ptrdiff_t y, const Use& use) const {
    for (std::ptrdiff_t dy = -half; dy <= half; ++dy) {
      for (std::ptrdiff_t dx = -half; dx <= half; ++dx) {
        if (Classify(x + dx, y + dy) != Exclusion::kNone) continue;
        use(input.Pixel(x + dx, y + dy), dx, dy);
      }
    }
  }

  /// The rule that the filters have in common, for output rows `begin` .. `end` - 1: excluded
  /// pixels become what `WindowRules` says, samples of all others `compute(x, y, channel)`.
  template <class Compute>
  void ForEachSample(std::ptrdiff_t begin, std::ptrdiff_t end, const Compute& compute) const {
    for (std::ptrdiff_t y = begin; y < end; ++y) {
      for (std::ptrdiff_t x = 0; x < output.Width(); ++x) {
        T* const out = output.Pixel(x, y);
        const Exclusion exclusion = Classify(x, y);
        if (exclusion != Exclusion::kNone) {
          rules.WriteExcluded(exclusion, out);
          continue;
        }
        for (std::ptrdiff_t c = 0; c < output.Channels(); ++c) out[c] = compute(x, y, c);
      }
    }
  }
};

}  // namespace zarn::processes::filters
