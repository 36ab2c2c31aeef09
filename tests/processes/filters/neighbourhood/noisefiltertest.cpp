// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <limits>
#include <utility>
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
using testsupport::Shape;
using testsupport::TestBlock;
using testsupport::TestedNoise;
using testsupport::WindowParameters;

constexpr testsupport::Shape kBlock{.width = 5, .height = 5, .marginX = 2, .marginY = 2};

// What becomes of the pixel in the middle.
template <typename T>
T FilterMiddle(const TestBlock<T>& input, const WindowParameters& parameters,
               const std::vector<std::uint8_t>& mask = {}) {
  TestBlock<T> output({.width = 5, .height = 5});
  EXPECT_EQ(FilterWindows<TestedNoise>(parameters, input, mask, output).message, "");
  return output.At(2, 2);
}

TEST(NoiseFilter, RemovesWhatIsBrightAndKeepsWhatIsDark) {
  TestBlock<std::uint8_t> input(kBlock);
  input.Fill(100);
  const WindowParameters parameters{.kernelSize = 5, .background = 7.9};
  EXPECT_EQ(FilterMiddle(input, parameters), 100);
  for (const auto& [sample, result] :
       std::vector<std::pair<int, int>>{{200, 7}, {101, 7}, {99, 99}, {0, 0}}) {
    input.At(2, 2) = static_cast<std::uint8_t>(sample);
    EXPECT_EQ(FilterMiddle(input, parameters), result) << sample;
  }
  // It is the magnitude that stands out: -200 among -100 has a mean of -104 and a bound of -74.
  TestBlock<std::int16_t> dark(kBlock);
  dark.Fill(-100);
  EXPECT_EQ(FilterMiddle(dark, parameters), -100);
  dark.At(2, 2) = -200;
  EXPECT_EQ(FilterMiddle(dark, parameters), 7);
  dark.At(2, 2) = -50;
  EXPECT_EQ(FilterMiddle(dark, parameters), -50);
}

TEST(NoiseFilter, RemovesWhatHasTooFewNeighbours) {
  TestBlock<std::uint8_t> input(kBlock);
  const WindowParameters parameters{.kernelSize = 5, .background = 0};
  const auto withNeighbours = [&](const std::vector<std::pair<int, int>>& offsets) {
    input.Fill(0);
    input.At(2, 2) = 50;
    for (const auto& [dx, dy] : offsets) input.At(2 + dx, 2 + dy) = 50;
    return FilterMiddle(input, parameters);
  };
  EXPECT_EQ(withNeighbours({}), 0);
  EXPECT_EQ(withNeighbours({{1, 1}}), 0);
  EXPECT_EQ(withNeighbours({{1, 1}, {-1, 0}}), 50);
  // Neighbours two pixels away count, but not as near ones.
  EXPECT_EQ(withNeighbours({{1, 1}, {2, 0}, {0, 2}, {-2, -2}, {2, 2}}), 0);
  // A window of one pixel has none.
  input.Fill(50);
  EXPECT_EQ(FilterMiddle(input, {.kernelSize = 1, .background = 3}), 3);
}

TEST(NoiseFilter, JudgesEachChannelOfThePixelsThatCount) {
  TestBlock<std::uint16_t> input(
      {.width = 1, .height = 1, .channels = 2, .marginX = 1, .marginY = 1});
  TestBlock<std::uint16_t> output({.width = 1, .height = 1, .channels = 2});
  for (std::ptrdiff_t i = 0; i < 9; ++i) {
    input.Samples()[2 * i] = 1000;
    input.Samples()[2 * i + 1] = 2000;
  }
  input.At(0, 0, 1) = 2500;
  ASSERT_TRUE(FilterWindows<TestedNoise>({.background = 1}, input, {}, output).Ok());
  EXPECT_EQ(output.At(0, 0, 0), 1000);
  EXPECT_EQ(output.At(0, 0, 1), 1);
  // No-data that is ten times as bright raises the bound unless it is left out.
  input.At(1, 0, 0) = input.At(1, 0, 1) = 25000;
  ASSERT_TRUE(FilterWindows<TestedNoise>({.background = 1}, input, {}, output).Ok());
  EXPECT_EQ(output.At(0, 0, 1), 2500);
  ASSERT_TRUE(FilterWindows<TestedNoise>({.background = 1, .inputNoData = {25000, 25000}}, input,
                                         {}, output)
                  .Ok());
  EXPECT_EQ(output.At(0, 0, 1), 1);
}

// Few neighbouring values, at either end of the type: many samples lie exactly on the bound, or so
// near that the rounding of the formula decides.
template <typename T>
void CompareOnTheBound() {
  RandomNumbers random(11);
  for (const int size : {3, 5, 13, 15, 63}) {
    const auto half = static_cast<std::uint32_t>(size / 2);
    const Shape shape{
        .width = size > 15 ? 20U : 200U, .height = 6, .marginX = half, .marginY = half};
    TestBlock<T> input(shape);
    const TestBlock<T> output({.width = shape.width, .height = shape.height});
    for (const std::uint32_t base : {1U, std::uint32_t{std::numeric_limits<T>::max()} - 7}) {
      for (const std::uint32_t values : {2U, 3U, 7U}) {
        for (const std::uint32_t rare : {3U, 50U}) {
          for (std::size_t i = 0; i < input.SampleCount(); ++i) {
            input.Samples()[i] =
                static_cast<T>(base + (random.Percent(rare) ? random.Below(values) : 0));
          }
          ForEachVectorTarget([&] {
            ASSERT_TRUE(AgreesWithReference<TestedNoise>({.kernelSize = size, .background = 0},
                                                         input, {}, output))
                << "size " << size << ", base " << base << ", values " << values;
          });
        }
      }
    }
  }
}

TEST(NoiseFilter, DecidesOnTheBoundAsTheFormulaDoes) {
  CompareOnTheBound<std::uint8_t>();
  CompareOnTheBound<std::uint16_t>();
}

}  // namespace
}  // namespace zarn::processes::filters
