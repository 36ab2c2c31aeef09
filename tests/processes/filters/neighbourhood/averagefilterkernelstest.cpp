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

#include "processes/filters/neighbourhood/averagescratch.h"
#include "tests/support/randomnumbers.h"
#include "tests/support/windowfiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesWithReference;
using testsupport::FilterWindows;
using testsupport::RandomNumbers;
using testsupport::Shape;
using testsupport::TestBlock;
using testsupport::TestedAverage;
using testsupport::WindowParameters;

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
    ASSERT_TRUE((testsupport::AgreesOnScene<TestedAverage, TypeParam>(seed)));
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
          const WindowParameters parameters{.kernelSize = kernelSize, .background = 11};
          ASSERT_TRUE(AgreesWithReference<TestedAverage>(parameters, input, {}, output));
        }
      }
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
        WindowParameters parameters{.kernelSize = kernelSize};
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
        ASSERT_TRUE(AgreesWithReference<TestedAverage>(parameters, input, {}, output));
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
      ASSERT_TRUE(
          FilterWindows<TestedAverage>({.kernelSize = kernelSize}, input, mask, output).Ok());
      for (std::int64_t w = 0; w < kWindows; ++w) {
        ASSERT_EQ(output.At(w * kernelSize + half, 0), expected[static_cast<std::size_t>(w)])
            << "kernel " << kernelSize << (masked ? ", masked" : "") << ", window " << w;
      }
    }
  }
}

// The multiplication that replaces the division of whole windows of bytes, for every sum.
TEST(Reciprocal16, DividesEverySumOfBytesExactly) {
  for (std::uint32_t side = 3; side <= 15; side += 2) {
    const std::uint32_t divisor = side * side;
    const Reciprocal16 by = Reciprocal16::Of(divisor);
    ASSERT_TRUE(by.exact) << divisor;
    for (std::uint32_t sum = 0; sum <= 255 * divisor; ++sum) {
      const std::uint64_t mean = (sum + by.bias) * std::uint64_t{by.multiplier} >> (16 + by.shift);
      ASSERT_EQ(static_cast<double>(mean), std::nearbyint(static_cast<double>(sum) / divisor))
          << sum << "/" << divisor;
    }
  }
  EXPECT_FALSE(Reciprocal16::Of(17 * 17).exact);  // its sums do not fit
}

}  // namespace
}  // namespace zarn::processes::filters
