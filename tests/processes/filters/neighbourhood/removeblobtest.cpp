// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "tests/support/randomnumbers.h"
#include "tests/support/windowfiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesWithReference;
using testsupport::FilterWindows;
using testsupport::RandomNumbers;
using testsupport::Shape;
using testsupport::TestBlock;
using testsupport::TestedBlobs;
using testsupport::WindowParameters;

using Picture = std::vector<std::string>;

// Filters a picture: '.' is background (0), 'n' no-data (9), 'x' masked (7), any other data (5).
// Margins are data, which must not matter.
Picture Filter(const Picture& picture, WindowParameters parameters) {
  const auto width = static_cast<std::uint32_t>(picture.front().size());
  const auto height = static_cast<std::uint32_t>(picture.size());
  const Shape shape{.width = width, .height = height, .marginX = 3, .marginY = 3};
  TestBlock<std::uint8_t> input(shape);
  input.Fill(5);
  std::vector<std::uint8_t> mask(input.SampleCount(), 1);
  for (std::ptrdiff_t y = 0; y < static_cast<std::ptrdiff_t>(height); ++y) {
    for (std::ptrdiff_t x = 0; x < static_cast<std::ptrdiff_t>(width); ++x) {
      const char c = picture[static_cast<std::size_t>(y)][static_cast<std::size_t>(x)];
      input.At(x, y) = c == '.' ? 0 : c == 'n' ? 9 : c == 'x' ? 7 : 5;
      mask[static_cast<std::size_t>(shape.PixelIndex(x, y))] = c == 'x' ? 0 : 1;
    }
  }
  parameters.background = 0;
  TestBlock<std::uint8_t> output({.width = width, .height = height});
  EXPECT_EQ(FilterWindows<TestedBlobs>(parameters, input, mask, output).message, "");
  Picture result = picture;
  for (std::size_t y = 0; y < height; ++y) {
    for (std::size_t x = 0; x < width; ++x) {
      const std::uint8_t v = output.Samples()[y * width + x];
      result[y][x] = v == 0 ? '.' : v == 9 ? 'n' : v == 7 ? 'x' : '#';
    }
  }
  return result;
}

TEST(RemoveBlob, KeepsWhatTheSquareFitsInto) {
  const Picture picture = {"#.......##", "....###.##", ".##.###.##", ".##.####..", ".##......#"};
  const Picture opened = {"..........", "....###...", "....###...", "....###...", ".........."};
  EXPECT_EQ(Filter(picture, {.kernelSize = 3}), opened);
  EXPECT_EQ(Filter(picture, {.kernelSize = 2}), opened);
  EXPECT_EQ(Filter(picture, {.kernelSize = 1}), picture);
  EXPECT_EQ(Filter(picture, {.kernelSize = 7}), Picture(5, std::string(10, '.')));
  // Data up to the edge of the block stays only where the square fits into the block.
  const Picture full(4, "#######");
  EXPECT_EQ(Filter(full, {.kernelSize = 3}), full);
  EXPECT_EQ(Filter(full, {.kernelSize = 5}), Picture(4, "......."));
}

TEST(RemoveBlob, CopiesNoDataAndMaskedPixels) {
  const Picture picture = {"#nn###", "nnn##x", "nnn###"};
  // Masked pixels are no data; no-data pixels are where an output value for them exists.
  EXPECT_EQ(Filter(picture, {.inputNoData = {9}}), (Picture{".nn...", "nnn..x", "nnn..."}));
  EXPECT_EQ(Filter(picture, {.inputNoData = {9}, .outputNoData = {1}}),
            (Picture{"#nn##.", "nnn##x", "nnn##."}));
  // A no-data value that is the background value as well.
  EXPECT_EQ(Filter({"#..", "...", "..."}, {.inputNoData = {0}, .outputNoData = {0}}),
            (Picture{"#..", "...", "..."}));
}

// Rectangles about as large as the square, at all places within words of bits, and bands of rows.
TEST(RemoveBlob, AgreesWithTheReferenceOnWideBlocks) {
  RandomNumbers random(3);
  for (const int size : {3, 5, 15, 63, 65, 129}) {
    for (const std::uint32_t width : {63U, 64U, 65U, 130U, 511U, 513U, 700U}) {
      const auto half = static_cast<std::uint32_t>(size / 2);
      const auto side = static_cast<std::uint32_t>(size);
      const std::uint32_t height = size > 15 ? side + 8 : 40;
      const Shape shape{.width = width, .height = height, .marginX = half, .marginY = half};
      TestBlock<std::uint8_t> input(shape);
      input.Fill(0);
      for (std::uint32_t i = 0; i < 4 + width / side; ++i) {
        const std::uint32_t x0 = random.Below(width);
        const std::uint32_t y0 = random.Below(height);
        const std::uint32_t x1 = std::min(width, x0 + side - 1 + random.Below(4));
        const std::uint32_t y1 = std::min(height, y0 + side - 1 + random.Below(4));
        for (std::uint32_t y = size > 15 ? y0 % 4 : y0; y < y1; ++y) {
          for (std::uint32_t x = x0; x < x1; ++x) {
            input.At(static_cast<std::ptrdiff_t>(x), static_cast<std::ptrdiff_t>(y)) = 1;
          }
        }
      }
      const TestBlock<std::uint8_t> output({.width = width, .height = height, .marginX = 2});
      ASSERT_TRUE(AgreesWithReference<TestedBlobs>({.kernelSize = size, .background = 0}, input, {},
                                                   output))
          << "size " << size << ", width " << width;
    }
  }
}

}  // namespace
}  // namespace zarn::processes::filters
