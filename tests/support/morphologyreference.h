// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace zarn::testsupport {

/// A byte image and what is done to it.
struct MorphologyCase {
  int width = 0;
  int height = 0;
  std::uint8_t matchValue = 0;
  std::uint8_t setValue = 0;
  std::vector<int> offsets;
};

/// Dilation and erosion pixel by pixel: the first pixel looked at, itself or a neighbour within the
/// image, that matches (dilation) or does not (erosion) decides.
inline void ReferenceMorphology(const MorphologyCase& c, bool erode, const std::uint8_t* input,
                                std::uint8_t* output) {
  if (c.offsets.size() < 2) return;
  const std::ptrdiff_t width = c.width;
  const auto matches = [&](std::ptrdiff_t x, std::ptrdiff_t y) {
    return input[y * width + x] == c.matchValue;
  };
  for (std::ptrdiff_t y = 0; y < c.height; ++y) {
    for (std::ptrdiff_t x = 0; x < width; ++x) {
      bool passes = matches(x, y);
      for (std::size_t k = 0; k + 1 < c.offsets.size() && passes == erode; k += 2) {
        const std::ptrdiff_t atX = x + c.offsets[k];
        const std::ptrdiff_t atY = y + c.offsets[k + 1];
        if (atX < 0 || atX >= width || atY < 0 || atY >= c.height) continue;
        passes = matches(atX, atY);
      }
      if (passes) output[y * width + x] = c.setValue;
    }
  }
}

}  // namespace zarn::testsupport
