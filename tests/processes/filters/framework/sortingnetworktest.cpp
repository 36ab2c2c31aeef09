// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <numeric>
#include <utility>
#include <vector>

#include "processes/filters/framework/sortingnetwork.h"
#include "tests/support/randomnumbers.h"

namespace zarn::processes::filters {
namespace {

// A step that keeps one result only spoils the other: nothing may look at it.
void Apply(const std::vector<Exchange>& network, std::vector<int>& values) {
  for (const Exchange& step : network) {
    const auto [lesser, greater] = std::minmax({values[step.first], values[step.second]});
    values[step.first] = step.keep == Exchange::Keep::kGreater ? -1 : lesser;
    values[step.second] = step.keep == Exchange::Keep::kLesser ? -1 : greater;
  }
}

// A network that sorts all zeros and ones sorts everything.
TEST(SelectionNetwork, SelectsRanksOfAllZerosAndOnes) {
  for (std::size_t count = 1; count <= 13; ++count) {
    for (std::size_t low = 0; low < count; ++low) {
      for (std::size_t high = low; high < count; ++high) {
        const std::vector<Exchange> network = SelectionNetwork(count, low, high);
        for (std::uint32_t bits = 0; bits < 1U << count; ++bits) {
          std::vector<int> values;
          for (std::size_t i = 0; i < count; ++i) values.push_back(static_cast<int>(bits >> i & 1));
          const auto zeros = static_cast<std::size_t>(std::count(values.begin(), values.end(), 0));
          Apply(network, values);
          for (std::size_t rank = low; rank <= high; ++rank) {
            ASSERT_EQ(values[rank], rank < zeros ? 0 : 1)
                << count << " values, ranks " << low << " to " << high;
          }
        }
      }
    }
  }
}

TEST(SelectionNetwork, SelectsRanksOfManyValues) {
  testsupport::RandomNumbers random(1);
  for (const std::size_t count : {25U, 49U, 64U, 65U, 225U, 961U}) {
    const std::size_t low = count / 4;
    const std::size_t high = count / 2;
    const std::vector<Exchange> network = SelectionNetwork(count, low, high);
    for (int round = 0; round < 20; ++round) {
      std::vector<int> values(count);
      std::iota(values.begin(), values.end(), 0);
      for (std::size_t i = count - 1; i > 0; --i) {
        std::swap(values[i], values[random.Below(static_cast<std::uint32_t>(i + 1))]);
      }
      Apply(network, values);
      for (std::size_t rank = low; rank <= high; ++rank) {
        ASSERT_EQ(values[rank], static_cast<int>(rank)) << count << " values";
      }
    }
  }
}

}  // namespace
}  // namespace zarn::processes::filters
