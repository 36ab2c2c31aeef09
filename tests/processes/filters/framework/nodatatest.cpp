// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <vector>

#include "processes/filters/framework/nodata.h"
#include "tests/support/conversionreference.h"
#include "tests/support/sampletypes.h"

namespace zarn::processes::filters {
namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

template <typename T>
class NoDataTest : public ::testing::Test {};
TYPED_TEST_SUITE(NoDataTest, testsupport::HandledTypes, testsupport::TypeNames);

TYPED_TEST(NoDataTest, ConvertsListsAndBackgroundsLikeTheReference) {
  std::vector<double> values;
  for (const double edge : {-32768.0, -128.0, 0.0, 127.0, 255.0, 32767.0, 65535.0, -2147483648.0,
                            2147483647.0, 4294967295.0}) {
    for (double step = -2; step <= 2; step += 0.25) values.push_back(edge + step);
  }
  for (const double value : {1e10, 0x1p63, 0x1p64, 1e300, kInfinity}) {
    values.insert(values.end(), {value, -value});
  }
  values.push_back(kNaN);
  values.push_back(0.49999999999999994);
  const std::vector<TypeParam> samples = ConvertNoData<TypeParam>(values);
  ASSERT_EQ(samples.size(), values.size());
  for (std::size_t i = 0; i < values.size(); ++i) {
    SCOPED_TRACE(values[i]);
    const TypeParam expected = testsupport::ReferenceListEntry<TypeParam>(values[i]);
    if (std::isnan(static_cast<double>(expected))) {
      EXPECT_TRUE(std::isnan(static_cast<double>(samples[i])));
      continue;
    }
    EXPECT_EQ(samples[i], expected);
    EXPECT_EQ(TruncateToSample<TypeParam>(values[i]),
              testsupport::ReferenceBackground<TypeParam>(values[i]));
  }
  EXPECT_TRUE(ConvertNoData<TypeParam>({}).empty());
}

TEST(PixelEquality, LooksAtAllChannels) {
  const std::uint16_t value[] = {10, 20, 30};
  const std::uint16_t same[] = {10, 20, 30};
  const std::uint16_t last[] = {10, 20, 31};
  const std::uint16_t first[] = {11, 20, 30};
  for (const auto equals : {PixelEquals<std::uint16_t>, PixelNearlyEquals<std::uint16_t>}) {
    EXPECT_TRUE(equals(same, value, 3));
    EXPECT_FALSE(equals(last, value, 3));
    EXPECT_FALSE(equals(first, value, 3));
    EXPECT_TRUE(equals(last, value, 2));
  }
}

TEST(PixelEquality, IsExactOrTolerantForFloatingTypes) {
  constexpr double kEpsilon = 2.220446049250313e-16;
  const struct {
    double pixel;
    double value;
    bool equal;
    bool nearlyEqual;
  } kCases[] = {{1, 1, true, true},
                {0.0, -0.0, true, true},
                {0, kEpsilon, false, false},
                {0, std::nextafter(kEpsilon, 0), false, true},
                {std::nextafter(-kEpsilon, 0), 0, false, true},
                {std::nextafter(1.0, 0), 1, false, true},
                {std::nextafter(1.0, 2), 1, false, false},
                {-9999, -9999, true, true},
                {kNaN, kNaN, false, false},
                {kNaN, 0, false, false},
                {kInfinity, 1, false, false},
                // The difference of two infinities is NaN.
                {kInfinity, kInfinity, true, false}};
  for (const auto& c : kCases) {
    SCOPED_TRACE(::testing::Message() << c.pixel << " and " << c.value);
    EXPECT_EQ(PixelEquals(&c.pixel, &c.value, 1), c.equal);
    EXPECT_EQ(PixelNearlyEquals(&c.pixel, &c.value, 1), c.nearlyEqual);
  }
}

}  // namespace
}  // namespace zarn::processes::filters
