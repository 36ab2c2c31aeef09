// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <type_traits>
#include <vector>

#include "tests/support/averagefiltering.h"
#include "tests/support/randomnumbers.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesWithReference;
using testsupport::AverageParameters;
using testsupport::FilterAverage;
using testsupport::RandomNumbers;
using testsupport::SameBlocks;
using testsupport::Shape;
using testsupport::TestBlock;

template <typename T>
class AverageKernelsTest : public ::testing::Test {
 protected:
  // Samples whose exact mean lies next to a tie between two neighbouring values of the type, or
  // next to the value between two neighbours.
  static std::vector<T> SamplesNearTie(std::int64_t count, RandomNumbers& random) {
    std::vector<T> samples(static_cast<std::size_t>(count));
    if constexpr (std::is_floating_point_v<T>) {
      // The sum is a double as near to count * midpoint as possible, cut into pieces of 24 bits.
      const double value =
          std::ldexp(1.5 + random.Fraction() / 4, static_cast<int>(random.Below(9)));
      const double midpoint = static_cast<double>(static_cast<T>(value)) + value * 0x1p-25;
      double sum = midpoint * static_cast<double>(count);
      for (int steps = static_cast<int>(random.Below(7)); steps > 3; --steps) {
        sum = std::nextafter(sum, 0);
      }
      for (T& sample : samples) {
        sample = static_cast<T>(static_cast<float>(sum));
        sum -= static_cast<double>(sample);
      }
    } else {
      constexpr auto kLow = static_cast<std::int64_t>(std::numeric_limits<T>::min());
      constexpr auto kHigh = static_cast<std::int64_t>(std::numeric_limits<T>::max());
      const std::uint32_t span = random.Percent(50) ? 4 : 0;
      const std::int64_t below =
          span != 0 && random.Percent(50)
              ? kHigh - 1 - random.Below(span)
              : kLow + static_cast<std::int64_t>(random.Next() %
                                                 static_cast<std::uint64_t>(kHigh - kLow));
      const std::int64_t tie = ((2 * below + 1) * count) >> 1;
      const std::int64_t sum = std::clamp(tie - 1 + random.Below(4), kLow * count, kHigh * count);
      const std::int64_t base = (sum - kLow * count) / count + kLow;
      const std::int64_t more = sum - base * count;
      for (std::int64_t i = 0; i < count; ++i) {
        samples[static_cast<std::size_t>(i)] = static_cast<T>(base + (i < more ? 1 : 0));
      }
    }
    return samples;
  }

  static void FillRandom(TestBlock<T>& block, std::uint64_t seed) {
    RandomNumbers random(seed);
    for (std::size_t i = 0; i < block.SampleCount(); ++i) {
      if constexpr (std::is_floating_point_v<T>) {
        block.Samples()[i] = static_cast<T>(random.Fraction() * 3000);
      } else {
        block.Samples()[i] = static_cast<T>(random.Next());
      }
    }
  }
};
TYPED_TEST_SUITE(AverageKernelsTest, testsupport::HandledTypes, testsupport::TypeNames);

TYPED_TEST(AverageKernelsTest, AgreesWithTheReferenceOnRandomScenes) {
  for (std::uint64_t seed = 0; seed < 2500; ++seed) {
    ASSERT_TRUE(testsupport::AgreesOnScene<TypeParam>(seed));
  }
}

// Every width up to two vectors of bytes and a bit, clean and with specks.
TYPED_TEST(AverageKernelsTest, AgreesAtEveryWidth) {
  for (std::uint32_t width = 1; width <= 140; ++width) {
    for (const std::uint32_t channels : {1U, 3U}) {
      for (const int kernelSize : {3, 5, 9}) {
        SCOPED_TRACE(::testing::Message()
                     << width << " wide, " << channels << " channels, kernel " << kernelSize);
        const auto half = static_cast<std::uint32_t>(kernelSize / 2);
        const Shape shape{
            .width = width, .height = 2, .channels = channels, .marginX = half, .marginY = half};
        TestBlock<TypeParam> input(shape, width % 5);
        this->FillRandom(input, width);
        const TestBlock<TypeParam> output({.width = width, .height = 2, .channels = channels});
        const AverageParameters parameters{.kernelSize = kernelSize, .background = 11};
        ASSERT_TRUE(AgreesWithReference(parameters, input, {}, output));
        for (std::size_t i = width % 7; i < input.SampleCount() / channels; i += 13) {
          std::fill_n(input.Samples() + i * channels, channels, TypeParam{11});
        }
        ASSERT_TRUE(AgreesWithReference(parameters, input, {}, output));
      }
    }
  }
}

// Rows so long that a kernel may take them in pieces.
TYPED_TEST(AverageKernelsTest, AgreesOnLongRows) {
  for (const std::uint32_t channels : {1U, 2U, 3U, 5U}) {
    for (const std::uint32_t samples : {2048U, 4096U, 5000U}) {
      for (const std::uint32_t more : {0U, 1U, 2U, 67U}) {
        for (const int kernelSize : {3, 15}) {
          const std::uint32_t width = samples / channels + more;
          SCOPED_TRACE(::testing::Message()
                       << width << " wide, " << channels << " channels, kernel " << kernelSize);
          const auto half = static_cast<std::uint32_t>(kernelSize / 2);
          const Shape shape{
              .width = width, .height = 2, .channels = channels, .marginX = half, .marginY = half};
          TestBlock<TypeParam> input(shape);
          this->FillRandom(input, width);
          for (std::size_t i = more; i < input.SampleCount() / channels; i += 101) {
            std::fill_n(input.Samples() + i * channels, channels, TypeParam{11});
          }
          // The output has margins beside its rows that must stay as they are.
          const TestBlock<TypeParam> output(
              {.width = width, .height = 2, .channels = channels, .marginX = 3, .marginY = 1});
          const AverageParameters parameters{.kernelSize = kernelSize, .background = 11};
          ASSERT_TRUE(AgreesWithReference(parameters, input, {}, output));
        }
      }
    }
  }
}

// One run of excluded pixels of every length at every place of a row.
TYPED_TEST(AverageKernelsTest, AgreesAroundEveryRunOfExcludedPixels) {
  constexpr std::ptrdiff_t kWidth = 37;
  constexpr std::ptrdiff_t kHalf = 2;
  const Shape shape{.width = kWidth, .height = 1, .marginX = kHalf, .marginY = kHalf};
  TestBlock<TypeParam> clean(shape);
  this->FillRandom(clean, 5);
  const TestBlock<TypeParam> output({.width = kWidth, .height = 1});
  const AverageParameters parameters{.kernelSize = 5, .inputNoData = {99}, .outputNoData = {99}};
  for (std::ptrdiff_t begin = -kHalf; begin < kWidth + kHalf; ++begin) {
    for (std::ptrdiff_t end = begin + 1; end <= kWidth + kHalf; ++end) {
      SCOPED_TRACE(::testing::Message() << "columns " << begin << " to " << end);
      TestBlock<TypeParam> input = clean;
      // In the centre row alone, or in all rows so that whole windows are empty.
      const std::ptrdiff_t rows = (begin + end) % 2 == 0 ? 0 : kHalf;
      for (std::ptrdiff_t y = -rows; y <= rows; ++y) {
        std::fill(input.Pixel(begin, y), input.Pixel(end, y), TypeParam{99});
      }
      ASSERT_TRUE(AgreesWithReference(parameters, input, {}, output));
    }
  }
}

// Sums at the ends of the type and counts of more than 8 and 16 bits: what overflows narrow lanes.
TYPED_TEST(AverageKernelsTest, HoldsTheSumsAndCountsOfLargeWindows) {
  constexpr auto kLow = std::numeric_limits<TypeParam>::lowest();
  constexpr auto kHigh = std::numeric_limits<TypeParam>::max();
  for (const int kernelSize : {15, 17, 31, 33, 63, 255, 257}) {
    const auto half = static_cast<std::uint32_t>(kernelSize / 2);
    for (const std::uint32_t width : {1U, 19U, 67U}) {
      if (kernelSize > 63 && width > 19) continue;
      const std::uint32_t channels = kernelSize == 31 ? 3 : 1;
      const Shape shape{
          .width = width, .height = 2, .channels = channels, .marginX = half, .marginY = half};
      const TestBlock<TypeParam> output({.width = width, .height = 2, .channels = channels});
      TestBlock<TypeParam> input(shape);
      for (const int pattern : {0, 1, 2, 3, 4, 5}) {
        SCOPED_TRACE(::testing::Message()
                     << "kernel " << kernelSize << ", width " << width << ", pattern " << pattern);
        this->FillRandom(input, 17);
        if (pattern < 2) input.Fill(pattern == 0 ? kLow : kHigh);
        if (pattern == 2) {
          for (std::size_t i = 0; i < input.SampleCount(); i += 2) input.Samples()[i] = kHigh;
        }
        AverageParameters parameters{.kernelSize = kernelSize};
        if (pattern >= 4) parameters.background = 3;
        if (pattern == 4) {
          for (std::size_t i = 0; i < input.SampleCount() / channels; i += 1 + i % 11) {
            std::fill_n(input.Samples() + i * channels, channels, TypeParam{3});
          }
        }
        if (pattern == 5) {
          // Hardly a pixel counts.
          input.Fill(3);
          for (std::ptrdiff_t x = 0; x < static_cast<std::ptrdiff_t>(width); x += 2) {
            input.At(x, 0) = static_cast<TypeParam>(100 + x);
          }
        }
        ASSERT_TRUE(AgreesWithReference(parameters, input, {}, output));
      }
    }
  }
}

// Windows side by side whose means lie on, or as near as can be to, the point where the rounding to
// the sample type turns: what an approximate division gets wrong first.
TYPED_TEST(AverageKernelsTest, RoundsMeansNearTiesExactly) {
  constexpr std::int64_t kWindows = 150;
  RandomNumbers random(31);
  for (const int kernelSize : {3, 5, 7, 9, 11, 13, 15, 31, 63}) {
    const std::int64_t whole = std::int64_t{kernelSize} * kernelSize;
    for (const bool masked : {false, true}) {
      const auto half = static_cast<std::uint32_t>(kernelSize / 2);
      const Shape shape{.width = static_cast<std::uint32_t>(kWindows * kernelSize),
                        .height = 1,
                        .marginX = half,
                        .marginY = half};
      TestBlock<TypeParam> input(shape);
      // Only the centres of the windows are asked for, and the rest would take the reference long.
      std::vector<std::uint8_t> mask;
      if (masked) mask.assign(input.SampleCount(), 0);
      std::vector<TypeParam> expected;
      for (std::int64_t w = 0; w < kWindows; ++w) {
        const std::int64_t count =
            masked ? 1 + random.Below(static_cast<std::uint32_t>(whole)) : whole;
        const std::vector<TypeParam> samples = this->SamplesNearTie(count, random);
        double sum = 0;
        // From the centre on, so that it always counts, and around to the beginning; the order does
        // not matter, because these sums are exact.
        for (std::int64_t i = 0; i < count; ++i) {
          const std::int64_t place = (whole / 2 + i) % whole;
          const std::ptrdiff_t x = w * kernelSize + place % kernelSize;
          const std::ptrdiff_t y = place / kernelSize - half;
          input.At(x, y) = samples[static_cast<std::size_t>(i)];
          if (masked) mask[static_cast<std::size_t>(shape.PixelIndex(x, y))] = 1;
          sum += static_cast<double>(samples[static_cast<std::size_t>(i)]);
        }
        expected.push_back(testsupport::ReferenceResult<TypeParam>(
            sum / static_cast<double>(count),
            static_cast<double>(std::numeric_limits<TypeParam>::lowest()),
            static_cast<double>(std::numeric_limits<TypeParam>::max()), std::nullopt));
      }
      TestBlock<TypeParam> output({.width = shape.width, .height = 1});
      ASSERT_TRUE(FilterAverage({.kernelSize = kernelSize}, input, mask, output).Ok());
      for (std::int64_t w = 0; w < kWindows; ++w) {
        ASSERT_EQ(output.At(w * kernelSize + half, 0), expected[static_cast<std::size_t>(w)])
            << "kernel " << kernelSize << (masked ? ", masked" : "") << ", window " << w;
      }
    }
  }
}

TYPED_TEST(AverageKernelsTest, DoesNotDependOnTheTiling) {
  constexpr std::ptrdiff_t kMargin = 3;
  const Shape whole{
      .width = 61, .height = 38, .channels = 2, .marginX = kMargin, .marginY = kMargin};
  TestBlock<TypeParam> input(whole);
  this->FillRandom(input, 8);
  std::vector<std::uint8_t> mask(static_cast<std::size_t>(whole.FullWidth() * whole.FullHeight()),
                                 1);
  RandomNumbers random(9);
  for (std::size_t i = 0; i < mask.size(); ++i) {
    if (random.Percent(8)) mask[i] = 0;
    if (random.Percent(8)) std::fill_n(input.Samples() + 2 * i, 2, TypeParam{5});
    // Cancelling outliers, so that a sum carried over from a neighbouring pixel would show.
    if (std::is_floating_point_v<TypeParam> && random.Percent(5)) {
      input.Samples()[2 * i] = static_cast<TypeParam>(random.Percent(50) ? 1e20 : -1e20);
    }
  }
  const AverageParameters parameters{.kernelSize = 7, .background = 5, .outputNoData = {6, 7}};
  TestBlock<TypeParam> expected({.width = 61, .height = 38, .channels = 2});
  ASSERT_TRUE(FilterAverage(parameters, input, mask, expected).Ok());

  const struct {
    std::uint32_t width, height;
  } kTiles[] = {{61, 1}, {1, 38}, {7, 5}, {33, 17}, {16, 16}};
  for (const auto& tile : kTiles) {
    SCOPED_TRACE(::testing::Message() << tile.width << "x" << tile.height);
    TestBlock<TypeParam> actual({.width = 61, .height = 38, .channels = 2});
    for (std::uint32_t top = 0; top < whole.height; top += tile.height) {
      for (std::uint32_t left = 0; left < whole.width; left += tile.width) {
        const Shape shape{.width = std::min(tile.width, whole.width - left),
                          .height = std::min(tile.height, whole.height - top),
                          .channels = 2,
                          .marginX = kMargin,
                          .marginY = kMargin};
        TestBlock<TypeParam> piece(shape);
        std::vector<std::uint8_t> pieceMask(
            static_cast<std::size_t>(shape.FullWidth() * shape.FullHeight()));
        for (std::ptrdiff_t y = -kMargin; y < shape.FullHeight() - kMargin; ++y) {
          for (std::ptrdiff_t x = -kMargin; x < shape.FullWidth() - kMargin; ++x) {
            std::copy_n(input.Pixel(left + x, top + y), 2, piece.Pixel(x, y));
            pieceMask[static_cast<std::size_t>(shape.PixelIndex(x, y))] =
                mask[static_cast<std::size_t>(whole.PixelIndex(left + x, top + y))];
          }
        }
        TestBlock<TypeParam> result({.width = shape.width, .height = shape.height, .channels = 2});
        for (std::ptrdiff_t y = 0; y < static_cast<std::ptrdiff_t>(shape.height); ++y) {
          std::copy_n(actual.Pixel(left, top + y), 2 * shape.width, result.Pixel(0, y));
        }
        ASSERT_TRUE(FilterAverage(parameters, piece, pieceMask, result).Ok());
        for (std::ptrdiff_t y = 0; y < static_cast<std::ptrdiff_t>(shape.height); ++y) {
          std::copy_n(result.Pixel(0, y), 2 * shape.width, actual.Pixel(left, top + y));
        }
      }
    }
    EXPECT_TRUE(SameBlocks(actual, expected));
  }
}

// Every quotient of a sum and a count that a window of bytes can have: proves whatever replaces the
// division. Bytes are counted from `kLowest`, so that signed ones go through the same pattern.
template <typename T>
class ByteMeansTest : public ::testing::Test {
 protected:
  static constexpr int kLowest = std::numeric_limits<T>::min();

  // The mean of `count` bytes with the sum `sum`, counted from the lowest byte.
  static T Expected(std::int64_t sum, std::int64_t count) {
    const std::int64_t total = sum + kLowest * count;
    return testsupport::ReferenceResult<T>(static_cast<double>(total) / static_cast<double>(count),
                                           kLowest, kLowest + 255, std::nullopt);
  }

  // A block one pixel high whose columns are filled from the centre row outwards.
  struct Columns {
    explicit Columns(int kernelSize, std::uint32_t width)
        : half(static_cast<std::ptrdiff_t>(kernelSize / 2)),
          input({.width = width,
                 .height = 1,
                 .marginX = static_cast<std::uint32_t>(half),
                 .marginY = static_cast<std::uint32_t>(half)}),
          mask(input.SampleCount(), 0) {}

    // Gives column `x` `count` pixels with the sum `sum`.
    void Fill(std::ptrdiff_t x, std::ptrdiff_t count, std::ptrdiff_t sum) {
      for (std::ptrdiff_t i = 0; i < count; ++i) {
        const std::ptrdiff_t y = i % 2 == 0 ? i / 2 : -(i + 1) / 2;
        const std::ptrdiff_t value = std::min<std::ptrdiff_t>(sum, 255);
        sum -= value;
        input.At(x, y) = static_cast<T>(value + kLowest);
        mask[static_cast<std::size_t>(input.shape().PixelIndex(x, y))] = 1;
      }
    }

    std::ptrdiff_t half;
    TestBlock<T> input;
    std::vector<std::uint8_t> mask;
  };

  // Windows side by side, for counts that leave columns empty.
  static void CheckSeparateWindows(int kernelSize, std::ptrdiff_t count) {
    const std::ptrdiff_t sums = 255 * count + 1;
    Columns columns(kernelSize, static_cast<std::uint32_t>(sums * kernelSize));
    for (std::ptrdiff_t sum = 0; sum < sums; ++sum) {
      std::ptrdiff_t left = sum;
      for (std::ptrdiff_t i = 0; i < count; ++i) {
        const std::ptrdiff_t value = std::min<std::ptrdiff_t>(left, 255);
        left -= value;
        const std::ptrdiff_t column = i % 2 == 0 ? i / 2 : -(i + 1) / 2;
        columns.Fill(sum * kernelSize + columns.half + column, 1, value);
      }
    }
    TestBlock<T> output({.width = columns.input.shape().width, .height = 1});
    ASSERT_TRUE(
        FilterAverage({.kernelSize = kernelSize}, columns.input, columns.mask, output).Ok());
    for (std::ptrdiff_t sum = 0; sum < sums; ++sum) {
      ASSERT_EQ(output.At(sum * kernelSize + columns.half, 0), Expected(sum, count))
          << sum << " / " << count << ", kernel " << kernelSize;
    }
  }

  // Windows that slide: each column repeats the one a window's width before it with a sum greater
  // by one, so the sum of the window grows by one with each step at a constant count.
  static void CheckSlidingWindows(int kernelSize, std::ptrdiff_t count) {
    const std::ptrdiff_t low = count / kernelSize;
    const std::ptrdiff_t fuller = count % kernelSize;
    const std::ptrdiff_t width = kernelSize * (255 * (low + (fuller > 0 ? 1 : 0)) + 1);
    Columns columns(kernelSize, static_cast<std::uint32_t>(width));
    std::vector<std::ptrdiff_t> columnSums;
    for (std::ptrdiff_t i = 0; i < width + 2 * columns.half; ++i) {
      const std::ptrdiff_t samples = low + (i % kernelSize < fuller ? 1 : 0);
      columnSums.push_back(std::min(i / kernelSize, 255 * samples));
      columns.Fill(i - columns.half, samples, columnSums.back());
    }
    TestBlock<T> output({.width = static_cast<std::uint32_t>(width), .height = 1});
    ASSERT_TRUE(
        FilterAverage({.kernelSize = kernelSize}, columns.input, columns.mask, output).Ok());
    std::ptrdiff_t sum = 0;
    for (std::ptrdiff_t i = 0; i < kernelSize; ++i) sum += columnSums[static_cast<std::size_t>(i)];
    ASSERT_EQ(sum, 0);
    for (std::ptrdiff_t x = 0;; ++x) {
      ASSERT_EQ(output.At(x, 0), Expected(sum, count))
          << sum << " / " << count << ", kernel " << kernelSize;
      if (x + 1 == width) break;
      sum += columnSums[static_cast<std::size_t>(x + kernelSize)] -
             columnSums[static_cast<std::size_t>(x)];
    }
    ASSERT_EQ(sum, 255 * count);
  }
};
using ByteTypes = ::testing::Types<std::uint8_t, std::int8_t>;
TYPED_TEST_SUITE(ByteMeansTest, ByteTypes, testsupport::TypeNames);

TYPED_TEST(ByteMeansTest, EverySumOverEveryCountIsRoundedExactly) {
  for (const int kernelSize : {3, 5, 7, 9, 11, 13, 15}) {
    const std::ptrdiff_t whole = kernelSize * kernelSize;
    // Size 15 has the counts of those between, which differ in their whole windows only.
    const bool every = kernelSize <= 7 || kernelSize == 15;
    for (std::ptrdiff_t count = every ? 1 : whole; count <= whole; ++count) {
      if (count < kernelSize) {
        this->CheckSeparateWindows(kernelSize, count);
      } else {
        this->CheckSlidingWindows(kernelSize, count);
      }
      ASSERT_FALSE(this->HasFatalFailure());
    }
  }
}

}  // namespace
}  // namespace zarn::processes::filters
