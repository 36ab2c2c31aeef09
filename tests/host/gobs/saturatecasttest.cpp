// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <vector>

#include "host/gobs/saturatecast.h"

namespace zarn::gobs {
namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

template <typename T>
struct Case {
  double value;
  T expected;
};

template <typename T>
void ExpectAll(const std::vector<Case<T>>& cases) {
  for (const Case<T>& c : cases) EXPECT_EQ(SaturateCast<T>(c.value), c.expected) << c.value;
  constexpr T kMin = std::numeric_limits<T>::min();
  constexpr T kMax = std::numeric_limits<T>::max();
  for (const double value : {0x1p64, 0x1p100, 1e300, kInfinity}) {
    EXPECT_EQ(SaturateCast<T>(value), kMax) << value;
  }
  for (const double value : {-0x1p64, -0x1p100, -1e300, -kInfinity}) {
    EXPECT_EQ(SaturateCast<T>(value), kMin) << value;
  }
  for (const double value : {0.0, -0.0, 0.999, -0.999, 5e-324, kNaN, -kNaN}) {
    EXPECT_EQ(SaturateCast<T>(value), 0) << value;
  }
}

TEST(SaturateCast, TruncatesAndSaturatesSmallIntegers) {
  ExpectAll<std::uint8_t>(
      {{-1, 0}, {-9999, 0}, {1.999, 1}, {254.999, 254}, {255.999, 255}, {256, 255}, {300, 255}});
  ExpectAll<std::int8_t>({{126.999, 126},
                          {127.999, 127},
                          {128, 127},
                          {-127.999, -127},
                          {-128.999, -128},
                          {-129, -128}});
  ExpectAll<std::uint16_t>({{65534.9, 65534}, {65535.9, 65535}, {65536, 65535}, {-1, 0}});
  ExpectAll<std::int16_t>({{32767.9, 32767}, {32768, 32767}, {-32768.9, -32768}, {-2.9, -2}});
}

TEST(SaturateCast, HoldsTheEdgesOfWideIntegers) {
  ExpectAll<std::uint32_t>({{0x1p31, 2147483648U},
                            {4294967294.9, 4294967294U},
                            {4294967295.9, 4294967295U},
                            {0x1p32, 4294967295U},
                            {-0x1p31, 0U}});
  ExpectAll<std::int32_t>({{2147483646.9, 2147483646},
                           {2147483647.9, 2147483647},
                           {0x1p31, 2147483647},
                           {-2147483647.9, -2147483647},
                           {-2147483648.9, -2147483647 - 1},
                           {-0x1p32, -2147483647 - 1}});
  // The neighbours of a 64-bit edge among doubles lie 1024 or 2048 apart.
  ExpectAll<std::int64_t>({{std::nextafter(0x1p63, 0), 9223372036854774784},
                           {0x1p63, 9223372036854775807},
                           {std::nextafter(-0x1p63, 0), -9223372036854774784},
                           {-0x1p63, std::numeric_limits<std::int64_t>::min()}});
  ExpectAll<std::uint64_t>({{0x1p63, 9223372036854775808U},
                            {std::nextafter(0x1p64, 0), 18446744073709549568U},
                            {-1, 0U}});
}

TEST(SaturateCast, NarrowsFloatingTypes) {
  EXPECT_EQ(SaturateCast<float>(0.1), 0.1F);
  EXPECT_EQ(SaturateCast<float>(1e300), std::numeric_limits<float>::infinity());
  EXPECT_EQ(SaturateCast<float>(-1e300), -std::numeric_limits<float>::infinity());
  EXPECT_TRUE(std::isnan(SaturateCast<float>(kNaN)));
  EXPECT_TRUE(std::signbit(SaturateCast<float>(-0.0)));
  EXPECT_EQ(SaturateCast<double>(-1e300), -1e300);
}

}  // namespace
}  // namespace zarn::gobs
