// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <vector>

#include "processes/filters/framework/outputconverter.h"
#include "tests/support/conversionreference.h"
#include "tests/support/testblock.h"

namespace zarn::processes::filters {
namespace {

using testsupport::ReferenceResult;
using testsupport::SameSample;

constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

template <typename T>
void CompareWithReference(double low, double high, std::optional<double> noData,
                          const std::vector<double>& values) {
  const OutputConverter<T> converter(low, high, noData);
  for (const double value : values) {
    const T actual = converter(value);
    const T expected = ReferenceResult<T>(value, low, high, noData);
    ASSERT_TRUE(SameSample(actual, expected))
        << ::testing::PrintToString(value) << " within " << low << " .. " << high << " avoiding "
        << (noData ? ::testing::PrintToString(*noData) : "nothing") << " is "
        << ::testing::PrintToString(+actual) << " instead of "
        << ::testing::PrintToString(+expected);
  }
}

template <typename T>
void CompareAllBounds(const std::vector<double>& edges) {
  std::vector<double> values = {kNaN,   kInfinity, -kInfinity, 1e300,   -1e300,
                                0x1p63, -0x1p63,   0x1p64,     -0x1p64, -0.0};
  for (double value = -300; value <= 300; value += 0.25) values.push_back(value);
  for (const double tie : {-128.5, -2.5, 0.5, 2.5, 126.5, 254.5, 255.5}) {
    values.insert(values.end(), {std::nextafter(tie, -kInfinity), std::nextafter(tie, kInfinity)});
  }
  std::vector<std::optional<double>> noDataValues(edges.begin(), edges.end());
  noDataValues.emplace_back(std::nullopt);
  for (const double low : edges) {
    for (const double high : edges) {
      for (const std::optional<double>& noData : noDataValues) {
        CompareWithReference<T>(low, high, noData, values);
        if (::testing::Test::HasFatalFailure()) return;
      }
    }
  }
}

TEST(OutputConverter, AgreesWithTheReferenceOnAllBoundsOfBytes) {
  CompareAllBounds<std::uint8_t>(
      {-kInfinity, -1e9, -7, -0.6, 0, 0.9, 1, 2, 3.7, 100, 101, 253, 254, 255, 256.5, 1e300});
  CompareAllBounds<std::int8_t>(
      {-kInfinity, -129.5, -128, -127, -126, -3.7, -1, -0.5, 0, 1, 2, 126, 127, 128, 1e300});
}

TEST(OutputConverter, NeverGivesTheNoDataValueOfIntegers) {
  const OutputConverter<std::int8_t> lowest(-128, 127, -128);
  EXPECT_EQ(lowest.low(), -127);
  EXPECT_FALSE(lowest.avoids());
  EXPECT_EQ(lowest(-128.2), -127);
  const OutputConverter<std::int8_t> zero(-128, 127, 0);
  EXPECT_TRUE(zero.avoids());
  EXPECT_EQ(zero(0.4), 1);
  EXPECT_EQ(zero(-0.4), 1);
  EXPECT_EQ(zero(-0.6), -1);
  const OutputConverter<std::uint8_t> highest(0, 255, 255);
  EXPECT_EQ(highest(300), 254);
  // One below the high bound there is still room above; a fraction is cut off.
  EXPECT_EQ(OutputConverter<std::uint8_t>(0, 100, 99.9)(99), 100);
  // A value beyond the type counts as the type's end.
  EXPECT_EQ(OutputConverter<std::uint8_t>(0, 255, 300)(255), 254);
  EXPECT_EQ(OutputConverter<std::uint8_t>(0, 255, -9999)(0), 1);
}

TEST(OutputConverter, AgreesWithTheReferenceAtTheEdgesOfWiderIntegers) {
  const auto compare = [&]<typename T>(T) {
    const auto min = static_cast<double>(std::numeric_limits<T>::min());
    const auto max = static_cast<double>(std::numeric_limits<T>::max());
    std::vector<double> values = {kNaN, kInfinity, -kInfinity, 1e300, -1e300, 0x1p63, -0x1p63};
    for (const double centre : {min, 0.0, 1000.0, max}) {
      for (double step = -3; step <= 3; step += 0.125) values.push_back(centre + step);
    }
    for (const std::optional<double> noData :
         {std::optional<double>(), std::optional(min), std::optional(min + 1), std::optional(0.0),
          std::optional(1000.0), std::optional(max - 1), std::optional(max),
          std::optional(1e300)}) {
      CompareWithReference<T>(min, max, noData, values);
      CompareWithReference<T>(max, min, noData, values);
      CompareWithReference<T>(999, 1002, noData, values);
      CompareWithReference<T>(1000, 1000, noData, values);
    }
  };
  compare(std::uint16_t{});
  compare(std::int16_t{});
  compare(std::uint32_t{});
  compare(std::int32_t{});
}

TEST(OutputConverter, HoldsTheLimitsOf64Bits) {
  constexpr std::int64_t kMin = std::numeric_limits<std::int64_t>::min();
  constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();
  const OutputConverter<std::int64_t> plain(-0x1p63, 0x1p63);
  EXPECT_EQ(plain.low(), kMin);
  EXPECT_EQ(plain.high(), kMax);
  for (const double value : {0x1p63, 0x1p64, 1e300, kInfinity}) EXPECT_EQ(plain(value), kMax);
  for (const double value : {-0x1p63, -0x1p64, -1e300, -kInfinity, kNaN}) {
    EXPECT_EQ(plain(value), kMin);
  }
  EXPECT_EQ(plain(std::nextafter(0x1p63, 0)), kMax - 1023);
  EXPECT_EQ(plain(4503599627370496.5), 4503599627370496);  // a tie at 2^52
  EXPECT_EQ(OutputConverter<std::int64_t>(-0x1p63, 0x1p63, -0x1p63)(-1e300), kMin + 1);
  EXPECT_EQ(OutputConverter<std::int64_t>(-0x1p63, 0x1p63, 0x1p63)(1e300), kMax - 1);
  EXPECT_EQ(OutputConverter<std::int64_t>(-5, 0x1p63, 0)(0.2), 1);

  constexpr std::uint64_t kUnsignedMax = std::numeric_limits<std::uint64_t>::max();
  const OutputConverter<std::uint64_t> positive(0, 0x1p64);
  EXPECT_EQ(positive.high(), kUnsignedMax);
  EXPECT_EQ(positive(0x1p64), kUnsignedMax);
  EXPECT_EQ(positive(-1), 0U);
  EXPECT_EQ(positive(kNaN), 0U);
  EXPECT_EQ(OutputConverter<std::uint64_t>(0, 0x1p64, 0x1p64)(kInfinity), kUnsignedMax - 1);
  EXPECT_EQ(OutputConverter<std::uint64_t>(0, 0x1p64, 0)(0.3), 1U);
}

template <typename T>
class FloatingConverterTest : public ::testing::Test {
 protected:
  static constexpr double kMax = static_cast<double>(std::numeric_limits<T>::max());
};
using FloatingTypes = ::testing::Types<float, double>;
TYPED_TEST_SUITE(FloatingConverterTest, FloatingTypes, testsupport::TypeNames);

TYPED_TEST(FloatingConverterTest, AgreesWithTheReferenceAroundTheNoDataValue) {
  constexpr double kMax = TestFixture::kMax;
  const std::vector<double> edges = {-kInfinity, -kMax,    -9999, -1,       -1e-5, -0.9e-5,
                                     0,          0.9e-5,   1e-5,  2e-5,     1,     1 + 0.9e-5,
                                     1 + 1.1e-5, 16777216, kMax,  kInfinity};
  std::vector<double> values = {kNaN, 5e-324, -5e-324};
  for (const double edge : edges) {
    values.push_back(edge);
    for (const double step : {1e-12, 0.5e-5, 0.99e-5, 1e-5, 1.01e-5, 2e-5, 1e-3, 0.5, 1.0}) {
      values.insert(values.end(), {edge - step, edge + step});
    }
    values.insert(values.end(),
                  {std::nextafter(edge, -kInfinity), std::nextafter(edge, kInfinity)});
    const auto narrow = static_cast<float>(edge);
    for (const float limit : {-INFINITY, INFINITY}) {
      values.push_back(static_cast<double>(std::nextafter(narrow, limit)));
    }
  }
  std::vector<std::optional<double>> noDataValues(edges.begin(), edges.end());
  noDataValues.emplace_back(std::nullopt);
  noDataValues.emplace_back(kNaN);
  noDataValues.emplace_back(0.1);
  for (const double low : edges) {
    for (const double high : edges) {
      for (const auto& noData : noDataValues) {
        CompareWithReference<TypeParam>(low, high, noData, values);
        ASSERT_FALSE(this->HasFatalFailure());
      }
    }
  }
}

TEST(OutputConverter, FollowsTheFloatingRules) {
  constexpr float kMax = std::numeric_limits<float>::max();
  constexpr double kLow = -static_cast<double>(kMax);
  constexpr double kHigh = kMax;
  const OutputConverter<float> plain(kLow, kHigh);
  EXPECT_EQ(plain(2.5), 2.5F);
  EXPECT_EQ(plain(0.1), 0.1F);
  EXPECT_EQ(plain(1e300), kMax);
  EXPECT_EQ(plain(-kInfinity), -kMax);
  EXPECT_TRUE(std::isnan(plain(kNaN)));
  // A float has no value within 1e-5 of -9999; the next one is taken, upwards.
  const OutputConverter<float> collar(kLow, kHigh, -9999);
  EXPECT_EQ(collar(-9999), std::nextafter(-9999.0F, 0.0F));
  EXPECT_EQ(collar(std::nextafter(-9999.0F, 0.0F)), std::nextafter(-9999.0F, 0.0F));
  EXPECT_TRUE(std::isnan(collar(kNaN)));
  EXPECT_EQ(OutputConverter<float>(kLow, kHigh, kMax)(1e300), std::nextafter(kMax, 0.0F));
  EXPECT_EQ(OutputConverter<float>(kLow, kHigh, -kMax)(-1e300), -std::nextafter(kMax, 0.0F));
  // Near a bound the bound moves, even when the value lies outside.
  EXPECT_EQ(OutputConverter<double>(0, 1, -5e-6)(-3), -5e-6 + 1e-5);
  EXPECT_EQ(OutputConverter<double>(0, 1, 1 + 5e-6)(3), 1 + 5e-6 - 1e-5);
  // Well inside, results are moved up whichever side they come from.
  EXPECT_EQ(OutputConverter<double>(0, 1, 0.5)(0.5 - 9e-6), 0.5 + 1e-5);
  EXPECT_EQ(OutputConverter<double>(0, 1, 0.5)(0.5 - 1.1e-5), 0.5 - 1.1e-5);
}

}  // namespace
}  // namespace zarn::processes::filters
