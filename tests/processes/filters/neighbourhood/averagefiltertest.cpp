// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstdint>
#include <limits>
#include <memory>
#include <numeric>
#include <string>
#include <vector>

#include "host/core/exception.h"
#include "tests/support/averagefiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AverageParameters;
using testsupport::FilterAverage;
using testsupport::Shape;
using testsupport::TestBlock;

constexpr Shape kOnePixel{.width = 1, .height = 1};
constexpr Shape kOnePixelWithMargins{.width = 1, .height = 1, .marginX = 1, .marginY = 1};

// A pixel and its eight neighbours, row by row, filtered with a window of 3x3; `before` is what the
// output holds.
template <typename T>
T FilterNine(AverageParameters parameters, const std::array<T, 9>& samples,
             const std::vector<std::uint8_t>& mask = {}, T before = 77) {
  TestBlock<T> input(kOnePixelWithMargins);
  std::copy(samples.begin(), samples.end(), input.Samples());
  TestBlock<T> output(kOnePixel);
  output.Fill(before);
  parameters.kernelSize = 3;
  const FilterResult result = FilterAverage(parameters, input, mask, output);
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
  const AverageParameters replaced{.inputNoData = {255}, .outputNoData = {0}};
  EXPECT_EQ(FilterNine<std::uint8_t>(replaced, {9, 9, 9, 9, 255, 9, 9, 9, 9}), 0);
  EXPECT_EQ(FilterNine<std::uint8_t>(replaced, {0, 0, 0, 1, 0, 1, 1, 255, 255}), 1);  // 3 / 7
  EXPECT_EQ(FilterNine<std::uint8_t>(replaced, {0, 0, 0, 2, 0, 0, 0, 0, 0}), 1);      // 2 / 9
  const AverageParameters kept{.inputNoData = {255}};
  EXPECT_EQ(FilterNine<std::uint8_t>(kept, {9, 9, 9, 9, 255, 9, 9, 9, 9}), 77);
  // The entry is rounded for the pixel that is written, cut off for the value that is avoided.
  const AverageParameters half{.inputNoData = {254.5}, .outputNoData = {10.5}};
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
  const AverageParameters both{.background = 20, .inputNoData = {10}, .outputNoData = {3}};
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
  ASSERT_TRUE(
      FilterAverage({.inputNoData = {1, 2, 3}, .outputNoData = {9, 18, 0}}, input, {}, output)
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
    const AverageParameters parameters{.background = 0, .inputNoData = {7}, .outputNoData = {8}};
    const std::vector<std::uint8_t> mask(
        static_cast<std::size_t>(shape.FullWidth() * shape.FullHeight()), 0);
    EXPECT_EQ(FilterAverage(parameters, input, {}, output).message, "");
    EXPECT_EQ(FilterAverage(parameters, input, mask, output).message, "");
    EXPECT_TRUE(SameBlocks(output, before));
  }
}

// Failures.

using gobs::NativeDataTypeCode;
using gobs::Raster;
using gobs::RasterInfo;

const char* const kUnknownType = "Unknown raster block data type for average filter.";
const char* const kSizes = "Input and output rasters must be the same size (excluding margins).";
const char* const kMargins = "Raster Margins are too small.";
const char* const kTypes =
    "Input and output rasters must have the same data type and number of channels.";
const char* const kLists = "Fewer no-data values than channels.";
const char* const kInconsistent = "Raster block has no data or an inconsistent size.";
const char* const kOverlapping = "Input and output rasters overlap.";

struct Failure {
  const char* what;
  const char* message;
  // Each of these describes a sound call unless a case says otherwise.
  std::uint32_t inputCode = 2;
  std::uint32_t outputCode = 2;
  std::uint32_t inputWidth = 8;
  std::uint32_t inputHeight = 6;
  std::uint32_t outputChannels = 2;
  std::uint32_t marginX = 1;
  std::uint32_t marginY = 1;
  int kernelSize = 3;
  std::size_t noDataValues = 2;
  std::size_t inputMissingBytes = 0;
  std::size_t outputMissingBytes = 0;
  bool inputNull = false;
  bool outputNull = false;
  std::size_t outputOffset = 4096;
};

constexpr std::size_t kMemory = 8192;

FilterResult FilterWith(const Failure& f, std::vector<std::uint8_t>& memory) {
  const RasterInfo inputInfo(f.inputWidth, f.inputHeight, 2,
                             static_cast<NativeDataTypeCode>(f.inputCode),
                             {.marginX = f.marginX, .marginY = f.marginY});
  const RasterInfo outputInfo(8, 6, f.outputChannels,
                              static_cast<NativeDataTypeCode>(f.outputCode));
  const Raster input(inputInfo, f.inputNull ? nullptr : memory.data(),
                     inputInfo.DescribedSize() - f.inputMissingBytes);
  Raster output(outputInfo, f.outputNull ? nullptr : memory.data() + f.outputOffset,
                outputInfo.DescribedSize() - f.outputMissingBytes);
  const std::vector<double> noData(f.noDataValues, 3);
  return testsupport::MakeAverageFilter(
             {.kernelSize = f.kernelSize, .inputNoData = noData, .outputNoData = noData})
      ->Process(input, output, 0, 0, nullptr);
}

TEST(AverageFilterFailure, ReportsTheFirstFaultAndTouchesNothing) {
  const Failure kFailures[] = {
      {.what = "signed 64 bits", .message = kUnknownType, .inputCode = 7, .outputCode = 7},
      {.what = "unsigned 64 bits", .message = kUnknownType, .inputCode = 8, .outputCode = 8},
      {.what = "complex short", .message = kUnknownType, .inputCode = 11, .outputCode = 11},
      {.what = "complex double", .message = kUnknownType, .inputCode = 14, .outputCode = 14},
      {.what = "type before size",
       .message = kUnknownType,
       .inputCode = 7,
       .inputWidth = 9,
       .marginX = 0},
      {.what = "narrower input", .message = kSizes, .inputWidth = 7},
      {.what = "wider input", .message = kSizes, .inputWidth = 9},
      {.what = "lower input", .message = kSizes, .inputHeight = 5},
      {.what = "size before margins", .message = kSizes, .inputWidth = 9, .kernelSize = 5},
      {.what = "margins in x", .message = kMargins, .marginX = 0},
      {.what = "margins in y", .message = kMargins, .marginY = 0},
      {.what = "even kernel", .message = kMargins, .kernelSize = 4},
      {.what = "negative kernel", .message = kMargins, .kernelSize = -2},
      {.what = "smallest kernel",
       .message = kMargins,
       .kernelSize = std::numeric_limits<int>::min()},
      {.what = "largest kernel",
       .message = kMargins,
       .kernelSize = std::numeric_limits<int>::max()},
      {.what = "margins before types", .message = kMargins, .outputCode = 3, .kernelSize = 5},
      {.what = "signedness", .message = kTypes, .outputCode = 3},
      {.what = "sample size", .message = kTypes, .outputCode = 0},
      {.what = "channels", .message = kTypes, .outputChannels = 3},
      {.what = "types before lists", .message = kTypes, .outputCode = 6, .noDataValues = 1},
      {.what = "short lists", .message = kLists, .noDataValues = 1},
      {.what = "lists before data", .message = kLists, .noDataValues = 1, .inputNull = true},
      {.what = "no input", .message = kInconsistent, .inputNull = true},
      {.what = "no output", .message = kInconsistent, .outputNull = true},
      {.what = "short input", .message = kInconsistent, .inputMissingBytes = 1},
      {.what = "short output", .message = kInconsistent, .outputMissingBytes = 1},
      {.what = "data before overlap",
       .message = kInconsistent,
       .inputMissingBytes = 1,
       .outputOffset = 0},
      {.what = "in place", .message = kOverlapping, .outputOffset = 0},
      {.what = "last sample", .message = kOverlapping, .outputOffset = 10 * 8 * 2 * 2 - 2},
  };
  std::vector<std::uint8_t> memory(kMemory);
  std::iota(memory.begin(), memory.end(), std::uint8_t{1});
  const std::vector<std::uint8_t> before = memory;
  for (const Failure& failure : kFailures) {
    SCOPED_TRACE(failure.what);
    const FilterResult result = FilterWith(failure, memory);
    EXPECT_EQ(result.code, 0);
    EXPECT_EQ(result.message, failure.message);
    EXPECT_EQ(memory, before);
  }
}

TEST(AverageFilterFailure, AcceptsTheCallsBesideTheFailures) {
  const Failure kSound[] = {
      {.what = "as it is", .message = ""},
      {.what = "taller input", .message = "", .inputHeight = 7},
      {.what = "longer lists", .message = "", .noDataValues = 3},
      {.what = "no lists", .message = "", .noDataValues = 0},
      {.what = "side by side", .message = "", .outputOffset = 10 * 8 * 2 * 2},
  };
  for (const Failure& sound : kSound) {
    SCOPED_TRACE(sound.what);
    std::vector<std::uint8_t> memory(kMemory, 7);
    const FilterResult result = FilterWith(sound, memory);
    EXPECT_EQ(result.code, 1);
    EXPECT_EQ(result.message, "");
  }
}

TEST(AverageFilterFailure, BlocksWithoutATypeEndInTheExceptionOfTheLimits) {
  // No code has these descriptions; the sizes differ, too, but the limits come first.
  for (const gobs::DataType type : {gobs::DataType{}, gobs::DataType{12, 0, 0, 12, 0, 0}}) {
    const Raster input(RasterInfo(4, 4, 1, type));
    Raster output(RasterInfo(5, 5, 1, NativeDataTypeCode::kUInt8));
    try {
      testsupport::MakeAverageFilter({})->Process(input, output, 0, 0, nullptr);
      ADD_FAILURE() << "nothing thrown";
    } catch (const ParameterException& e) {
      EXPECT_EQ(e.Message(), "Cannot evaluate MinValue() for the provided datatype");
      EXPECT_EQ(e.ParameterName(), "eDataType");
    }
  }
}

}  // namespace
}  // namespace zarn::processes::filters
