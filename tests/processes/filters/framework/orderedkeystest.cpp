// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <bit>
#include <cstdint>
#include <limits>
#include <vector>

#include "processes/filters/framework/orderedkeys.h"

namespace zarn::processes::filters {
namespace {

template <typename T>
void ExpectAscending(const std::vector<T>& samples) {
  for (std::size_t i = 0; i < samples.size(); ++i) {
    const OrderedKey<T> key = ToOrderedKey(samples[i]);
    EXPECT_EQ(std::bit_cast<OrderedKey<T>>(FromOrderedKey<T>(key)),
              std::bit_cast<OrderedKey<T>>(samples[i]));
    if (i > 0) {
      EXPECT_LT(ToOrderedKey(samples[i - 1]), key) << i;
    }
  }
}

template <typename T>
void ExpectFloatsInOrder() {
  using Limits = std::numeric_limits<T>;
  const T nan = Limits::quiet_NaN();
  ExpectAscending<T>({-Limits::infinity(), Limits::lowest(), T(-1), -Limits::min(),
                      -Limits::denorm_min(), T(-0.0), T(0), Limits::denorm_min(), Limits::min(),
                      T(1), Limits::max(), Limits::infinity(), nan});
  EXPECT_GT(ToOrderedKey(-nan), ToOrderedKey(Limits::infinity()));
}

TEST(OrderedKeys, SortAsSamplesAndComeBack) {
  ExpectAscending<std::int8_t>({-128, -1, 0, 1, 127});
  ExpectAscending<std::uint8_t>({0, 1, 127, 128, 255});
  ExpectAscending<std::int16_t>({-32768, -1, 0, 32767});
  ExpectAscending<std::uint32_t>({0, 1, 0x7FFFFFFF, 0x80000000, 0xFFFFFFFF});
  ExpectAscending<std::int32_t>({-2147483647 - 1, -5, 0, 2147483647});
  ExpectFloatsInOrder<float>();
  ExpectFloatsInOrder<double>();
  // Every NaN has a key of its own past the numbers.
  for (const std::uint32_t bits : {0x7F800001U, 0x7FFFFFFFU, 0xFF800001U, 0xFFFFFFFFU}) {
    const std::uint32_t key = ToOrderedKey(std::bit_cast<float>(bits));
    EXPECT_GT(key, ToOrderedKey(std::numeric_limits<float>::infinity()));
    EXPECT_EQ(std::bit_cast<std::uint32_t>(FromOrderedKey<float>(key)), bits);
  }
}

}  // namespace
}  // namespace zarn::processes::filters
