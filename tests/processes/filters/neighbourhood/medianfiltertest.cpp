// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstdint>
#include <limits>
#include <vector>

#include "tests/support/windowfiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::FilterWindows;
using testsupport::TestBlock;
using testsupport::TestedMedian;
using testsupport::WindowParameters;

// A pixel and its eight neighbours, row by row, filtered with a window of 3x3; the output held 77.
template <typename T>
T MedianOfNine(const WindowParameters& parameters, const std::array<T, 9>& samples,
               const std::vector<std::uint8_t>& mask = {}) {
  TestBlock<T> input({.width = 1, .height = 1, .marginX = 1, .marginY = 1});
  std::copy(samples.begin(), samples.end(), input.Samples());
  TestBlock<T> output({.width = 1, .height = 1});
  output.Fill(77);
  EXPECT_EQ(FilterWindows<TestedMedian>(parameters, input, mask, output).message, "");
  return output.At(0, 0);
}

TEST(MedianFilter, TakesTheLowerMiddleOfTheSamplesThatCount) {
  const std::array<std::uint8_t, 9> samples = {0, 0, 1, 0, 9, 3, 0, 7, 0};
  EXPECT_EQ(MedianOfNine({.background = 0}, samples), 3);  // of 1, 3, 7, 9
  EXPECT_EQ(MedianOfNine({}, samples), 0);
  EXPECT_EQ(MedianOfNine({.inputNoData = {0}}, samples, {1, 1, 0, 1, 1, 1, 1, 1, 1}), 7);
  EXPECT_EQ(MedianOfNine({.background = 7, .inputNoData = {0}}, samples), 3);  // of 1, 3, 9
  EXPECT_EQ(MedianOfNine({}, samples, {0, 0, 0, 0, 1, 0, 0, 0, 0}), 9);
}

TEST(MedianFilter, WritesTheSampleAsItIs) {
  // Nothing keeps a median off the output no-data value.
  const WindowParameters parameters{.inputNoData = {255}, .outputNoData = {0}};
  EXPECT_EQ(MedianOfNine<std::uint8_t>(parameters, {0, 0, 0, 0, 5, 0, 9, 9, 9}), 0);
  EXPECT_EQ(MedianOfNine<std::uint8_t>(parameters, {0, 0, 0, 0, 255, 0, 9, 9, 9}), 0);
  EXPECT_EQ(MedianOfNine<std::uint8_t>({.inputNoData = {255}}, {0, 0, 0, 0, 255, 0, 9, 9, 9}), 77);
  EXPECT_EQ(MedianOfNine<std::uint8_t>({.background = 3}, {0, 0, 0, 0, 3, 0, 9, 9, 9}), 3);
}

TEST(MedianFilter, OrdersWhatComparisonsDoNot) {
  const float nan = std::numeric_limits<float>::quiet_NaN();
  const float inf = std::numeric_limits<float>::infinity();
  EXPECT_EQ(MedianOfNine<float>({}, {nan, 1, -nan, 2, nan, 3, nan, 4, -inf}), 4);
  EXPECT_TRUE(std::isnan(MedianOfNine<float>({}, {nan, 1, -nan, 2, nan, 3, nan, inf, -nan})));
  EXPECT_TRUE(std::signbit(MedianOfNine<float>({}, {0, -0.F, 0, -0.F, 0, -0.F, 0, -0.F, -1})));
  EXPECT_FALSE(std::signbit(MedianOfNine<float>({}, {0, -0.F, 0, -0.F, 0, -0.F, 0, -0.F, 1})));
  // The sign and the digits of the chosen NaN stay as well.
  EXPECT_TRUE(
      std::signbit(MedianOfNine<double>({}, {-std::nan(""), 1, 1, 1, -std::nan(""), 1,
                                             -std::nan(""), -std::nan(""), -std::nan("")})));
}

}  // namespace
}  // namespace zarn::processes::filters
