// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/sourcetally.h"

#include <algorithm>
#include <cmath>

namespace zarn::app {
namespace {

// The pixels in the middles of `count` equal parts, which are also those that GDAL picks as nearest
// when it reads at a reduced size.
std::vector<std::int64_t> Middles(int pixels, int count) {
  std::vector<std::int64_t> middles(static_cast<std::size_t>(count));
  const double step = static_cast<double>(pixels) / count;
  for (int i = 0; i < count; ++i) {
    const auto pixel = static_cast<std::int64_t>((i + 0.5) * step);
    middles[static_cast<std::size_t>(i)] = std::min<std::int64_t>(pixel, pixels - 1);
  }
  return middles;
}

}  // namespace

PictureGrid::PictureGrid(const OutputGrid& mosaic)
    : mosaicWidth_(mosaic.width), mosaicHeight_(mosaic.height) {
  const int longer = std::max(mosaic.width, mosaic.height);
  const double scale = longer > kMostPixels ? static_cast<double>(kMostPixels) / longer : 1;
  const auto scaled = [&](int pixels) {
    return std::max(1, static_cast<int>(std::lround(pixels * scale)));
  };
  columns_ = Middles(mosaic.width, scaled(mosaic.width));
  rows_ = Middles(mosaic.height, scaled(mosaic.height));
}

SourceTally::SourceTally(const OutputGrid& mosaic, std::size_t scenes)
    : grid_(mosaic), counts_(scenes + 1), picture_(grid_.Pixels()) {}

void SourceTally::Take(const Window& window, const Plane& map) {
  switch (map.PixelBytes()) {
    case 1:
      return Take(window, reinterpret_cast<const std::uint8_t*>(map.Data()));
    case 2:
      return Take(window, reinterpret_cast<const std::uint16_t*>(map.Data()));
    default:
      return Take(window, reinterpret_cast<const std::uint32_t*>(map.Data()));
  }
}

template <typename Number>
void SourceTally::Take(const Window& window, const Number* numbers) {
  const Number* const end = numbers + window.width * window.height;
  // Neighbours mostly come from the same scene.
  for (const Number* run = numbers; run != end;) {
    const Number* const next = std::find_if(run, end, [&](Number n) { return n != *run; });
    counts_[*run] += next - run;
    run = next;
  }
  const auto within = [](const std::vector<std::int64_t>& pixels, std::int64_t from,
                         std::int64_t count) {
    const auto first = std::lower_bound(pixels.begin(), pixels.end(), from);
    const auto last = std::lower_bound(first, pixels.end(), from + count);
    return std::pair{static_cast<std::size_t>(first - pixels.begin()),
                     static_cast<std::size_t>(last - pixels.begin())};
  };
  const auto [left, right] = within(grid_.Columns(), window.x, window.width);
  const auto [top, bottom] = within(grid_.Rows(), window.y, window.height);
  for (std::size_t row = top; row < bottom; ++row) {
    const Number* const line = numbers + (grid_.Rows()[row] - window.y) * window.width - window.x;
    for (std::size_t column = left; column < right; ++column) {
      picture_[row * grid_.Columns().size() + column] = line[grid_.Columns()[column]];
    }
  }
}

}  // namespace zarn::app
