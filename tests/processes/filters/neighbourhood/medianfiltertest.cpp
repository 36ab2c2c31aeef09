// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <limits>
#include <vector>

#include "tests/support/randomnumbers.h"
#include "tests/support/vectortargets.h"
#include "tests/support/windowfiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesWithReference;
using testsupport::FilterWindows;
using testsupport::ForEachVectorTarget;
using testsupport::RandomNumbers;
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

// Rows without anything negative go another way than windows that hold some.
template <typename T>
void CompareRowsOfEitherSign(T strange) {
  RandomNumbers random(6);
  for (const int size : {3, 5, 7}) {
    const auto half = static_cast<std::uint32_t>(size / 2);
    TestBlock<T> input({.width = 70, .height = 40, .marginX = half, .marginY = half});
    for (std::ptrdiff_t y = -std::ptrdiff_t{half}; y < 40 + std::ptrdiff_t{half}; ++y) {
      const bool plain = y % 20 < 12;
      for (std::ptrdiff_t x = -std::ptrdiff_t{half}; x < 70 + std::ptrdiff_t{half}; ++x) {
        const auto sample = static_cast<T>(random.Below(50));
        input.At(x, y) = plain || random.Percent(60) ? sample : static_cast<T>(-sample);
        if (!plain && random.Percent(20)) input.At(x, y) = strange;
      }
    }
    const TestBlock<T> output({.width = 70, .height = 40});
    std::vector<std::uint8_t> mask(input.SampleCount(), 1);
    for (std::uint8_t& byte : mask) byte = random.Percent(10) ? 0 : 1;
    ForEachVectorTarget([&] {
      for (const std::vector<std::uint8_t>& used : {std::vector<std::uint8_t>(), mask}) {
        EXPECT_TRUE(AgreesWithReference<TestedMedian>({.kernelSize = size}, input, used, output));
      }
    });
  }
}

TEST(MedianFilter, SortsRowsOfEitherSign) {
  CompareRowsOfEitherSign<float>(std::numeric_limits<float>::quiet_NaN());
  CompareRowsOfEitherSign<double>(-0.0);
  CompareRowsOfEitherSign<std::int16_t>(std::numeric_limits<std::int16_t>::min());
}

// Exchanges that find the median of zeros and ones find that of all numbers. A window whose columns
// hold 0 to all ones stands for all that differ in the order of its samples alone.
TEST(MedianFilter, FindsTheMedianOfEveryPatternOfZerosAndOnes) {
  RandomNumbers random(5);
  for (const std::uint32_t side : {3U, 5U, 7U}) {
    std::vector<std::uint32_t> ones(side, 0);
    std::vector<std::vector<std::uint32_t>> windows;
    // All lists of numbers up to `side` that do not fall.
    for (bool more = true; more;) {
      windows.push_back(ones);
      more = false;
      for (std::size_t place = side; place-- > 0 && !more;) {
        if (ones[place] == side) continue;
        std::fill(ones.begin() + static_cast<std::ptrdiff_t>(place), ones.end(), ones[place] + 1);
        more = true;
      }
    }
    const std::uint32_t half = side / 2;
    const auto width = static_cast<std::uint32_t>(windows.size()) * side;
    TestBlock<std::uint8_t> input({.width = width, .height = 1, .marginX = half, .marginY = half});
    input.Fill(0);
    for (std::uint32_t x = 0; x < width; ++x) {
      for (std::uint32_t i = 0; i < windows[x / side][x % side]; ++i) {
        input.At(static_cast<std::ptrdiff_t>(x),
                 static_cast<std::ptrdiff_t>(i) - static_cast<std::ptrdiff_t>(half)) = 1;
      }
    }
    const TestBlock<std::uint8_t> output({.width = width, .height = 1});
    const WindowParameters parameters{.kernelSize = static_cast<int>(side)};
    std::vector<std::uint8_t> mask(input.SampleCount(), 1);
    ForEachVectorTarget([&] {
      EXPECT_TRUE(AgreesWithReference<TestedMedian>(parameters, input, {}, output));
      for (const std::uint32_t chance : {5U, 20U, 60U}) {
        for (std::uint8_t& byte : mask) byte = random.Percent(chance) ? 0 : 1;
        EXPECT_TRUE(AgreesWithReference<TestedMedian>(parameters, input, mask, output));
      }
    });
  }
}

}  // namespace
}  // namespace zarn::processes::filters
