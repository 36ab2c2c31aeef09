// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "tests/support/attributefiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AttributeParameters;
using testsupport::MakeAttributeFilter;
using testsupport::Shape;
using testsupport::TestBlock;

constexpr auto kAverage = FILTERALGO::kAverage;
constexpr auto kMedian = FILTERALGO::kMedian;
constexpr auto kTrimmedMean = FILTERALGO::kTrimmedMean;

// The middle one of `samples`, a row of up to nine whose window covers them all; 77 if unwritten.
template <typename T, typename A>
T FilterRow(AttributeParameters parameters, const std::vector<T>& samples,
            const std::vector<A>& labels, const std::vector<std::uint8_t>& mask = {}) {
  const auto count = static_cast<std::uint32_t>(samples.size());
  TestBlock<T> input({.width = 1, .height = 1, .marginX = count / 2});
  TestBlock<A> attr({.width = 1, .height = 1, .marginX = count / 2});
  TestBlock<T> output({.width = 1, .height = 1});
  std::copy(samples.begin(), samples.end(), input.Samples());
  std::copy(labels.begin(), labels.end(), attr.Samples());
  output.Fill(77);
  parameters.size = static_cast<int>(count);
  parameters.useAttributes = !labels.empty();
  gobs::Raster out = output.Wrap();
  const FilterResult result =
      MakeAttributeFilter(parameters)
          ->ProcessWithAttributes(input.Wrap(), attr.Wrap(), out, 1,
                                  mask.empty() ? nullptr : mask.data(), nullptr);
  EXPECT_EQ(result.code, 1) << result.message;
  return output.At(0, 0);
}

template <typename T>
T FilterRow(FILTERALGO algo, const std::vector<T>& samples,
            const std::vector<std::uint8_t>& mask = {}) {
  return FilterRow<T, std::uint8_t>({.algo = algo}, samples, {}, mask);
}

TEST(AttributeFilter, ReducesPools) {
  using Bytes = std::vector<std::uint8_t>;
  EXPECT_EQ(FilterRow(kAverage, Bytes{1, 9, 2}, {1, 0, 1}), 1);  // 1.5
  EXPECT_EQ(FilterRow(kAverage, std::vector<std::int8_t>{-1, 9, -2}, {1, 0, 1}), -1);
  EXPECT_EQ(FilterRow(kAverage, std::vector<float>{1, 9, 2}, {1, 0, 1}), 1.5F);
  EXPECT_EQ(FilterRow(kMedian, Bytes{7, 1, 100, 5, 3}, {1, 1, 0, 1, 1}), 3);
  EXPECT_EQ(FilterRow(kTrimmedMean, Bytes{2, 77, 1}, {1, 0, 1}), 1);
  EXPECT_EQ(FilterRow(kTrimmedMean, Bytes{100, 0, 0, 20, 11}, {1, 1, 0, 1, 1}), 15);
  // Eight samples lose two at either end.
  EXPECT_EQ(FilterRow(kTrimmedMean, Bytes{200, 10, 0, 12, 0, 16, 14, 100, 1},
                      {1, 1, 1, 1, 0, 1, 1, 1, 1}),
            13);
  for (const FILTERALGO algo : {kAverage, kMedian, kTrimmedMean}) {
    EXPECT_EQ(FilterRow(algo, Bytes{1, 2, 3}, {0, 0, 0}), 77);
  }
}

TEST(AttributeFilter, SortsNaNLastAndNegativeZeroFirst) {
  const float nan = std::numeric_limits<float>::quiet_NaN();
  EXPECT_EQ(FilterRow(kMedian, std::vector<float>{-nan, 5, nan, 4, 3}), 5);
  EXPECT_TRUE(std::signbit(FilterRow(kMedian, std::vector<float>{0.0F, 9, -0.0F}, {1, 0, 1})));
  EXPECT_EQ(FilterRow(kTrimmedMean, std::vector<double>{-nan, 5, 77, 7, 1}, {1, 1, 0, 1, 1}), 6);
}

TEST(AttributeFilter, PoolsByLabel) {
  struct Case {
    const char* what;
    AttributeParameters parameters;
    double left;
    double centre;
    double right;
    // The mean of the pool; the samples are 10 to the left, 1000 in the centre, 100 to the right.
    int asUnsigned;
    int asSigned;
    int asFloat;
  };
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const std::vector<Case> cases = {
      {"equal", {}, 5, 5, 6, 505, 505, 505},
      {"unlabelled neighbour", {}, 0, 5, 6, 505, 505, 505},
      {"unlabelled centre", {}, 5, 0, 6, 370, 370, 370},
      {"one-sided for unsigned", {.attrTolerance = 2}, 3, 5, 7, 550, 370, 370},
      {"beyond the tolerance", {.attrTolerance = 2}, 2, 5, 8, 1000, 1000, 1000},
      {"truncated", {.attrNoDataValue = 7.9, .attrTolerance = 0.9}, 5.5, 6, 7.2, 550, 550, 505},
      {"saturated", {.attrNoDataValue = -9, .attrTolerance = 1e9}, 0, 5, 127, 370, 370, 370},
      {"negative", {.attrTolerance = -1}, 5, 5, 0, 370, 100, 100},
  };
  const std::vector<int> samples = {10, 1000, 100};
  const auto mean = [&]<typename A>(const Case& c, A) {
    return FilterRow<int, A>(
        c.parameters, samples,
        {static_cast<A>(c.left), static_cast<A>(c.centre), static_cast<A>(c.right)});
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    EXPECT_EQ(mean(c, std::uint8_t{}), c.asUnsigned);
    EXPECT_EQ(mean(c, std::uint32_t{}), c.asUnsigned);
    EXPECT_EQ(mean(c, std::int16_t{}), c.asSigned);
    EXPECT_EQ(mean(c, float{}), c.asFloat);
  }
  // Differences wrap around in the type: from 127 to -128 is one step up.
  EXPECT_EQ((FilterRow<int, std::int8_t>({.attrTolerance = 1}, samples, {-128, 127, 3})), 505);
  EXPECT_EQ((FilterRow<int, std::uint8_t>({.attrTolerance = 1}, samples, {255, 254, 1})), 505);
  // A label that is not a number is near everything.
  EXPECT_EQ((FilterRow<int, double>({}, samples, {nan, 5, 6})), 505);
  EXPECT_EQ((FilterRow<int, float>({}, samples, {4, static_cast<float>(nan), 6})), 370);
}

// Filters a block of `shape` and gives what a caller sees: the message, or the changed samples.
struct Call {
  AttributeParameters parameters = {.size = 3, .useAttributes = true};
  Shape in = {.width = 6, .height = 4, .marginX = 1, .marginY = 1};
  Shape attr = {.width = 6, .height = 4, .marginX = 1, .marginY = 1};
  Shape out = {.width = 6, .height = 4};

  std::string Message() const {
    TestBlock<std::uint16_t> output(out);
    output.Fill(1000);
    const TestBlock<std::uint16_t> before = output;
    gobs::Raster target = output.Wrap();
    const FilterResult result =
        MakeAttributeFilter(parameters)
            ->ProcessWithAttributes(TestBlock<std::uint16_t>(in).Wrap(),
                                    TestBlock<std::int16_t>(attr).Wrap(), target, parameters.scale,
                                    nullptr, nullptr);
    EXPECT_EQ(result.Ok(), result.message.empty());
    EXPECT_EQ(static_cast<bool>(testsupport::SameBlocks(output, before)), !result.Ok());
    return result.message;
  }
};

TEST(AttributeFilter, RefusesBlocksThatDoNotFit) {
  const std::string sizes = "Input and output rasters must be the same size (excluding margins).";
  const std::string margins = "Attribute raster margins are too small.";
  const std::string types =
      "Input and output rasters must have the same data type and number of channels.";
  struct Case {
    const char* what;
    std::string message;
    Call call;
  };
  const Shape bare = {.width = 6, .height = 4};
  const AttributeParameters plain = {.useAttributes = false, .scale = 0};
  const std::vector<Case> cases = {
      {"fits", "", {}},
      {"taller input", "", {.in = {.width = 6, .height = 9, .marginX = 1, .marginY = 1}}},
      {"wider input", sizes, {.in = {.width = 7, .height = 4, .marginX = 1, .marginY = 1}}},
      {"lower input", sizes, {.in = {.width = 6, .height = 3, .marginX = 1, .marginY = 1}}},
      {"narrow labels", sizes, {.attr = {.width = 5, .height = 4, .marginX = 9, .marginY = 9}}},
      {"low labels", sizes, {.attr = {.width = 6, .height = 3, .marginX = 9, .marginY = 9}}},
      {"scale 0", sizes, {.parameters = {.scale = 0}}},
      {"scale -1", sizes, {.parameters = {.scale = -1}}},
      {"without labels", "", {.parameters = plain, .attr = {.width = 1, .height = 1}}},
      {"coarse labels", "", {.parameters = {.scale = 2}, .attr = {.width = 4, .height = 3}}},
      {"coarse labels short by one",
       margins,
       {.parameters = {.scale = 2}, .attr = {.width = 3, .height = 3}}},
      {"huge scale", "", {.parameters = {.scale = 2147483647}, .attr = {.width = 1, .height = 1}}},
      {"no label margins", margins, {.attr = bare}},
      {"no label margins, but no input margins", "", {.in = bare, .attr = bare}},
      {"no label margins, but none reached", "", {.parameters = {.size = 1}, .attr = bare}},
      {"label margin in x only", margins, {.attr = {.width = 6, .height = 4, .marginX = 1}}},
      {"label margin in y only", margins, {.attr = {.width = 6, .height = 4, .marginY = 1}}},
      {"more label channels",
       types,
       {.attr = {.width = 6, .height = 4, .channels = 2, .marginX = 1, .marginY = 1}}},
      {"more channels", types, {.out = {.width = 6, .height = 4, .channels = 2}}},
      {"sizes before margins",
       sizes,
       {.attr = {.width = 6, .height = 4}, .out = {.width = 5, .height = 4}}},
      {"margins before channels", margins, {.attr = {.width = 6, .height = 4, .channels = 2}}},
  };
  for (const Case& c : cases) {
    for (const FILTERALGO algo : {kAverage, kMedian, kTrimmedMean}) {
      SCOPED_TRACE(c.what);
      Call call = c.call;
      call.parameters.algo = algo;
      EXPECT_EQ(call.Message(), c.message);
    }
  }
}

TEST(AttributeFilter, RefusesSharedAndMissingMemory) {
  TestBlock<std::uint16_t> block({.width = 4, .height = 4});
  TestBlock<std::uint16_t> other({.width = 4, .height = 4});
  const auto message = [](const gobs::Raster& in, const gobs::Raster& attr, gobs::Raster out) {
    return MakeAttributeFilter({})
        ->ProcessWithAttributes(in, attr, out, 1, nullptr, nullptr)
        .message;
  };
  const std::string overlap = "Input and output rasters overlap.";
  const std::string inconsistent = "Raster block has no data or an inconsistent size.";
  EXPECT_EQ(message(block.Wrap(), other.Wrap(), block.Wrap()), overlap);
  EXPECT_EQ(message(block.Wrap(), other.Wrap(), other.Wrap()), overlap);
  EXPECT_EQ(message(block.Wrap(), block.Wrap(), other.Wrap()), "");
  EXPECT_EQ(message(block.Wrap(), {block.Info(), block.Samples(), 31}, other.Wrap()), inconsistent);
  EXPECT_EQ(message({block.Info(), nullptr, 32}, block.Wrap(), other.Wrap()), inconsistent);
}

TEST(AttributeFilter, RefusesUnknownTypes) {
  struct Case {
    FILTERALGO algo;
    std::string samples;
    std::string labels;
  };
  const std::vector<Case> cases = {
      {kAverage, "Unknown raster block data type for average filter.",
       "Unknown attribute raster data type for average filter."},
      {kMedian, "Unknown raster block data type for median filter.",
       "Unknown attribute raster data type for median filter."},
      {kTrimmedMean, "Unknown raster block data type for trimmed mean filter.",
       "Unknown attribute raster data type for trimmed median filter."},
  };
  using enum gobs::NativeDataTypeCode;
  const gobs::Raster good(gobs::RasterInfo(2, 2, 1, kInt16));
  for (const Case& c : cases) {
    for (const auto code : {kInt64, kUInt64, kComplexInt16, kComplexFloat64}) {
      const gobs::Raster bad(gobs::RasterInfo(2, 2, 1, code));
      // Types are looked at before sizes, and those of labels even where these are not used.
      gobs::Raster out(gobs::RasterInfo(3, 3, 1, kInt16));
      for (const bool useAttributes : {false, true}) {
        const auto filter = MakeAttributeFilter({.algo = c.algo, .useAttributes = useAttributes});
        EXPECT_EQ(filter->ProcessBlocks(bad, bad, out, 1, nullptr, nullptr).message, c.samples);
        EXPECT_EQ(filter->ProcessBlocks(good, bad, out, 1, nullptr, nullptr).message, c.labels);
      }
    }
  }
}

TEST(AttributeFilter, NeedsNoLabelsWhenTheyAreNotUsed) {
  const TestBlock<std::uint8_t> input({.width = 3, .height = 1});
  TestBlock<std::uint8_t> output({.width = 3, .height = 1});
  gobs::Raster out = output.Wrap();
  const auto filter = MakeAttributeFilter({.useAttributes = false});
  EXPECT_TRUE(filter->Process(input.Wrap(), out, nullptr, nullptr).Ok());
  EXPECT_EQ(output.At(1, 0), (input.At(0, 0) + input.At(1, 0) + input.At(2, 0)) / 3);
  filter->useAttributes = true;
  EXPECT_EQ(filter->Process(input.Wrap(), out, nullptr, nullptr).message,
            "Input and output rasters must be the same size (excluding margins).");
}

TEST(AttributeFilter, WritesNothingWithoutAKernel) {
  for (const int size : {0, -3}) {
    const TestBlock<float> input({.width = 3, .height = 2});
    TestBlock<float> output({.width = 3, .height = 2});
    output.Fill(5);
    const TestBlock<float> before = output;
    gobs::Raster out = output.Wrap();
    const auto filter = MakeAttributeFilter({.size = size, .useAttributes = false});
    EXPECT_TRUE(filter->Process(input.Wrap(), out, nullptr, nullptr).Ok());
    EXPECT_TRUE(testsupport::SameBlocks(output, before));
  }
}

// Labels coarser by a factor are the labels repeated.
TEST(AttributeFilter, RepeatsCoarseLabels) {
  const Shape shape = {.width = 23, .height = 13, .marginX = 3, .marginY = 3};
  const TestBlock<std::uint8_t> input(shape);
  for (const int scale : {2, 4}) {
    TestBlock<std::uint8_t> coarse({.width = 12, .height = 7, .marginX = 2, .marginY = 2});
    for (std::size_t i = 0; i < coarse.SampleCount(); ++i) {
      coarse.Samples()[i] = static_cast<std::uint8_t>(1 + i * 7 / 5 % 3);
    }
    TestBlock<std::uint8_t> repeated(shape);
    for (int y = -3; y < 16; ++y) {
      for (int x = -3; x < 26; ++x) repeated.At(x, y) = coarse.At(x / scale, y / scale);
    }
    for (const FILTERALGO algo : {kAverage, kMedian, kTrimmedMean}) {
      const auto filter = MakeAttributeFilter({.algo = algo, .size = 7});
      TestBlock<std::uint8_t> a({.width = 23, .height = 13});
      TestBlock<std::uint8_t> b = a;
      gobs::Raster outA = a.Wrap();
      gobs::Raster outB = b.Wrap();
      ASSERT_TRUE(
          filter->ProcessWithAttributes(input.Wrap(), coarse.Wrap(), outA, scale, nullptr, nullptr)
              .Ok());
      ASSERT_TRUE(
          filter->ProcessWithAttributes(input.Wrap(), repeated.Wrap(), outB, 1, nullptr, nullptr)
              .Ok());
      EXPECT_TRUE(testsupport::SameBlocks(a, b));
    }
  }
}

}  // namespace
}  // namespace zarn::processes::filters
