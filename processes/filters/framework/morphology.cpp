// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/morphology.h"

#include <cstddef>

#include "processes/filters/framework/parallel.h"

namespace zarn::processes::filters {
namespace {

// Writes `setValue` to the pixels that `passes(x, y)` accepts.
template <typename Passes>
void WritePassing(std::uint8_t* output, int width, int height, std::uint8_t setValue,
                  const std::vector<int>& offsets, const Passes& passes) {
  if (width <= 0 || height <= 0 || offsets.size() < 2) return;
  parallel::ForEachRowBand(height, parallel::BandCount(height),
                           [&](std::ptrdiff_t, std::ptrdiff_t firstRow, std::ptrdiff_t endRow) {
                             for (std::ptrdiff_t y = firstRow; y < endRow; ++y) {
                               for (std::ptrdiff_t x = 0; x < width; ++x) {
                                 if (passes(x, y)) output[y * width + x] = setValue;
                               }
                             }
                           });
}

// Whether `wanted(neighbour)` holds for a neighbour of (x, y) inside the image.
template <typename Wanted>
bool AnyNeighbour(const std::uint8_t* input, std::ptrdiff_t width, std::ptrdiff_t height,
                  std::ptrdiff_t x, std::ptrdiff_t y, const std::vector<int>& offsets,
                  const Wanted& wanted) {
  for (std::size_t k = 0; k + 1 < offsets.size(); k += 2) {
    const std::ptrdiff_t nx = x + offsets[k];
    const std::ptrdiff_t ny = y + offsets[k + 1];
    if (nx < 0 || nx >= width || ny < 0 || ny >= height) continue;
    if (wanted(input[ny * width + nx])) return true;
  }
  return false;
}

}  // namespace

void MorphDilation(const std::uint8_t* input, std::uint8_t* output, int width, int height,
                   std::uint8_t matchValue, std::uint8_t setValue,
                   const std::vector<int>& offsets) {
  WritePassing(output, width, height, setValue, offsets, [&](std::ptrdiff_t x, std::ptrdiff_t y) {
    const auto matches = [&](std::uint8_t value) { return value == matchValue; };
    return matches(input[y * width + x]) ||
           AnyNeighbour(input, width, height, x, y, offsets, matches);
  });
}

void MorphDilation(const std::uint8_t* input, std::uint8_t* output, int width, int height,
                   std::uint8_t value, const std::vector<int>& offsets) {
  MorphDilation(input, output, width, height, value, value, offsets);
}

void MorphErosion(const std::uint8_t* input, std::uint8_t* output, int width, int height,
                  std::uint8_t matchValue, std::uint8_t setValue, const std::vector<int>& offsets) {
  WritePassing(output, width, height, setValue, offsets, [&](std::ptrdiff_t x, std::ptrdiff_t y) {
    const auto differs = [&](std::uint8_t value) { return value != matchValue; };
    return !differs(input[y * width + x]) &&
           !AnyNeighbour(input, width, height, x, y, offsets, differs);
  });
}

void MorphErosion(const std::uint8_t* input, std::uint8_t* output, int width, int height,
                  std::uint8_t value, const std::vector<int>& offsets) {
  MorphErosion(input, output, width, height, value, value, offsets);
}

}  // namespace zarn::processes::filters
