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
using testsupport::Shape;
using testsupport::TestBlock;
using testsupport::TestedAverage;
using testsupport::WindowParameters;

constexpr Shape kOnePixel{.width = 1, .height = 1};
constexpr Shape kOnePixelWithMargins{.width = 1, .height = 1, .marginX = 1, .marginY = 1};

// A pixel and its eight neighbours, row by row, filtered with a window of 3x3; `before` is what the
// output holds.
template <typename T>
T FilterNine(WindowParameters parameters, const std::array<T, 9>& samples,
             const std::vector<std::uint8_t>& mask = {}, T before = 77) {
  TestBlock<T> input(kOnePixelWithMargins);
  std::copy(samples.begin(), samples.end(), input.Samples());
  TestBlock<T> output(kOnePixel);
  output.Fill(before);
  parameters.kernelSize = 3;
  const FilterResult result = FilterWindows<TestedAverage>(parameters, input, mask, output);
  EXPECT_EQ(result.code, 1);
  EXPECT_EQ(result.message, "");
  return output.At(0, 0);
}

TEST(AverageFilter, LeavesTheBackgroundOutOfTheMean) {
  const std::array<std::uint8_t, 9> samples = {0, 20, 30, 10, 10, 10, 10, 10, 10};
  EXPECT_EQ(FilterNine({.background = 0}, samples), 14);  // 110 / 8 = 13.75
  EXPECT_EQ(FilterNine({}, samples), 12);                 // 110 / 9 = 12.2
  // The background value is cut off and saturated to the type.
  EXPECT_EQ(FilterNine({.background = 30.99}, samples), 10);
  EXPECT_EQ(FilterNine({.background = -9999}, samples), 14);
  EXPECT_EQ(
      FilterNine({.background = 300}, std::array<std::uint8_t, 9>{255, 1, 1, 1, 4, 4, 7, 7, 7}), 4);
}

TEST(AverageFilter, CopiesBackgroundPixels) {
  EXPECT_EQ(FilterNine<std::int16_t>({.background = -5.7}, {9, 9, 9, 9, -5, 9, 9, 9, 9}), -5);
  EXPECT_EQ(FilterNine<float>({.background = 0.1}, {9, 9, 9, 9, 0.1F, 9, 9, 9, 9}), 0.1F);
  // Even as a masked neighbour's only companion, and even where it equals the output no-data value.
  EXPECT_EQ(
      FilterNine<std::uint8_t>({.background = 4, .outputNoData = {4}}, {9, 9, 9, 9, 4, 9, 9, 9, 9}),
      4);
}

TEST(AverageFilter, ReplacesNoDataPixelsAndKeepsTheirValueOutOfMeans) {
  const WindowParameters replaced{.inputNoData = {255}, .outputNoData = {0}};
  EXPECT_EQ(FilterNine<std::uint8_t>(replaced, {9, 9, 9, 9, 255, 9, 9, 9, 9}), 0);
  EXPECT_EQ(FilterNine<std::uint8_t>(replaced, {0, 0, 0, 1, 0, 1, 1, 255, 255}), 1);  // 3 / 7
  EXPECT_EQ(FilterNine<std::uint8_t>(replaced, {0, 0, 0, 2, 0, 0, 0, 0, 0}), 1);      // 2 / 9
  const WindowParameters kept{.inputNoData = {255}};
  EXPECT_EQ(FilterNine<std::uint8_t>(kept, {9, 9, 9, 9, 255, 9, 9, 9, 9}), 77);
  // The entry is rounded for the pixel that is written, cut off for the value that is avoided.
  const WindowParameters half{.inputNoData = {254.5}, .outputNoData = {10.5}};
  EXPECT_EQ(FilterNine<std::uint8_t>(half, {9, 9, 9, 9, 255, 9, 9, 9, 9}), 11);
  EXPECT_EQ(FilterNine<std::uint8_t>(half, {10, 10, 10, 10, 10, 10, 10, 10, 10}), 11);
  EXPECT_EQ(FilterNine<std::uint8_t>(half, {11, 11, 11, 11, 11, 11, 11, 11, 11}), 11);
  // An output value alone is still avoided.
  EXPECT_EQ(FilterNine<std::int8_t>({.outputNoData = {-128}},
                                    {-128, -128, -128, -128, -128, -128, -128, -128, -128}),
            -127);
}

TEST(AverageFilter, TakesNoDataBeforeBackground) {
  const std::array<std::uint8_t, 9> samples = {9, 9, 9, 9, 5, 9, 9, 9, 9};
  EXPECT_EQ(FilterNine({.background = 5, .inputNoData = {5}, .outputNoData = {200}}, samples), 200);
  EXPECT_EQ(FilterNine({.background = 5, .inputNoData = {5}}, samples), 77);
}

TEST(AverageFilter, SkipsMaskedPixelsAndLeavesThemUnwritten) {
  const std::array<std::uint8_t, 9> samples = {100, 20, 30, 10, 10, 10, 10, 10, 10};
  EXPECT_EQ(FilterNine({}, samples, {0, 1, 255, 1, 1, 1, 1, 1, 1}), 14);
  EXPECT_EQ(FilterNine({}, samples, {1, 1, 1, 1, 0, 1, 1, 1, 1}), 77);
  EXPECT_EQ(FilterNine({}, samples, {0, 0, 0, 0, 128, 0, 0, 0, 0}), 10);
  // The mask comes first: neither no-data nor background is written.
  const WindowParameters both{.background = 20, .inputNoData = {10}, .outputNoData = {3}};
  EXPECT_EQ(FilterNine(both, samples, {1, 1, 1, 1, 0, 1, 1, 1, 1}), 77);
}

TEST(AverageFilter, ExcludesWholePixelsOnly) {
  const Shape shape{.width = 1, .height = 1, .channels = 3, .marginX = 1, .marginY = 1};
  TestBlock<std::uint8_t> input(shape);
  TestBlock<std::uint8_t> output({.width = 1, .height = 1, .channels = 3});
  for (std::ptrdiff_t i = 0; i < 9; ++i) {
    const std::array<std::uint8_t, 3> pixel = {10, 20, 40};
    std::copy(pixel.begin(), pixel.end(), input.Samples() + 3 * i);
  }
  const std::array<std::uint8_t, 3> excluded = {1, 2, 3};
  const std::array<std::uint8_t, 3> almost = {1, 2, 4};
  std::copy(excluded.begin(), excluded.end(), input.Pixel(-1, -1));
  std::copy(almost.begin(), almost.end(), input.Pixel(1, 1));
  ASSERT_TRUE(FilterWindows<TestedAverage>({.inputNoData = {1, 2, 3}, .outputNoData = {9, 18, 0}},
                                           input, {}, output)
                  .Ok());
  EXPECT_EQ(output.At(0, 0, 0), 10);  // (7 * 10 + 1) / 8 = 8.9 rounds to 9, which is avoided
  EXPECT_EQ(output.At(0, 0, 1), 19);  // (7 * 20 + 2) / 8 = 17.75 rounds to 18
  EXPECT_EQ(output.At(0, 0, 2), 36);  // (7 * 40 + 4) / 8 = 35.5
}

TEST(AverageFilter, RoundsTiesToEven) {
  const std::vector<std::uint8_t> two = {1, 0, 0, 0, 1, 0, 0, 0, 0};
  EXPECT_EQ(FilterNine<std::uint8_t>({}, {2, 0, 0, 0, 3, 0, 0, 0, 0}, two), 2);
  EXPECT_EQ(FilterNine<std::uint8_t>({}, {3, 0, 0, 0, 4, 0, 0, 0, 0}, two), 4);
  EXPECT_EQ(FilterNine<std::int32_t>({}, {-2, 0, 0, 0, -3, 0, 0, 0, 0}, two), -2);
  EXPECT_EQ(FilterNine<std::uint32_t>({}, {4294967295U, 0, 0, 0, 4294967294U, 0, 0, 0, 0}, two),
            4294967294U);
}

TEST(AverageFilter, SumsInRowOrder) {
  // 1e20 swallows the ones before it and leaves those after it.
  EXPECT_EQ(FilterNine<double>({}, {1, 1, 1e20, -1e20, 1, 1, 1, 1, 1}), 5.0 / 9);
  EXPECT_EQ(FilterNine<double>({}, {1e20, 1, 1, 1, 1, 1, 1, 1, -1e20}), 0.0);
  EXPECT_EQ(FilterNine<float>({}, {1e20F, -1e20F, 1, 1, 1, 1, 1, 1, 1}), 7.0F / 9);
  EXPECT_EQ(FilterNine<float>({}, {1, 1, 1, 1e20F, 1, 1, -1e20F, 1, 1}), 2.0F / 9);
}

TEST(AverageFilter, FollowsTheFloatingRules) {
  constexpr float kInfinity = std::numeric_limits<float>::infinity();
  constexpr float kMax = std::numeric_limits<float>::max();
  const float nan = std::numeric_limits<float>::quiet_NaN();
  EXPECT_EQ(FilterNine<float>({}, {1, 1, 1, 1, kInfinity, 1, 1, 1, 1}), kMax);
  EXPECT_EQ(FilterNine<float>({}, {1, 1, 1, 1, 1, 1, 1, 1, -kInfinity}), -kMax);
  EXPECT_TRUE(std::isnan(FilterNine<float>({}, {1, 1, nan, 1, 1, 1, 1, 1, 1})));
  EXPECT_TRUE(std::isnan(FilterNine<float>({}, {kInfinity, 1, 1, 1, 1, 1, 1, 1, -kInfinity})));
  // NaN equals nothing, not even a no-data value or background of NaN.
  EXPECT_TRUE(std::isnan(
      FilterNine<float>({.background = nan, .inputNoData = {nan}}, {1, 1, 1, 1, nan, 1, 1, 1, 1})));
  EXPECT_EQ(FilterNine<float>({.inputNoData = {-9999}, .outputNoData = {-9999}},
                              {1, 2, -9999, 3, 4, -9999, 5, 6, 7}),
            4);
  std::array<float, 9> flat{};
  flat.fill(0.5F);
  EXPECT_EQ(FilterNine<float>({.outputNoData = {0.5}}, flat), 0.5F + 1e-5F);
  // A sum that starts from zero has no negative zero.
  flat.fill(-0.0F);
  EXPECT_FALSE(std::signbit(FilterNine<float>({}, flat)));
}

TEST(AverageFilter, AcceptsEmptyBlocks) {
  for (const Shape shape :
       {Shape{.width = 0, .height = 5, .marginX = 1, .marginY = 1},
        Shape{.width = 5, .height = 0, .marginX = 1, .marginY = 1},
        Shape{.width = 5, .height = 5, .channels = 0, .marginX = 1, .marginY = 1}}) {
    const TestBlock<std::uint8_t> input(shape);
    TestBlock<std::uint8_t> output(shape);
    const TestBlock<std::uint8_t> before = output;
    // A pixel without channels equals any no-data pixel.
    const WindowParameters parameters{.background = 0, .inputNoData = {7}, .outputNoData = {8}};
    const std::vector<std::uint8_t> mask(
        static_cast<std::size_t>(shape.FullWidth() * shape.FullHeight()), 0);
    EXPECT_EQ(FilterWindows<TestedAverage>(parameters, input, {}, output).message, "");
    EXPECT_EQ(FilterWindows<TestedAverage>(parameters, input, mask, output).message, "");
    EXPECT_TRUE(SameBlocks(output, before));
  }
}

}  // namespace
}  // namespace zarn::processes::filters
