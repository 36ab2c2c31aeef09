// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <omp.h>

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <iterator>
#include <thread>
#include <vector>

#include "tests/support/averagefiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesOnScene;

// Threads that a parallel region opened here gets.
int TeamSize() {
  int size = 0;
#pragma omp parallel
  {
#pragma omp single
    size = omp_get_num_threads();
  }
  return size;
}

class AverageFilterThreadsTest : public ::testing::Test {
 protected:
  void TearDown() override {
    omp_set_num_threads(threads_);
    omp_set_max_active_levels(levels_);
  }

 private:
  int threads_ = omp_get_max_threads();
  int levels_ = omp_get_max_active_levels();
};

TEST_F(AverageFilterThreadsTest, GivesTheSameBitsForEveryThreadCount) {
  for (const int threads : {1, 2, 3}) {
    omp_set_num_threads(threads);
    ASSERT_EQ(TeamSize(), threads);
    for (std::uint64_t seed = 10000; seed < 10150; ++seed) {
      EXPECT_TRUE(AgreesOnScene<std::uint8_t>(seed));
      EXPECT_TRUE(AgreesOnScene<std::int16_t>(seed));
      EXPECT_TRUE(AgreesOnScene<float>(seed));
    }
    ASSERT_EQ(TeamSize(), threads);
  }
}

TEST_F(AverageFilterThreadsTest, SharesTheRowsOutAmongTheThreads) {
#if defined(__clang__) || !defined(__linux__)
  GTEST_SKIP() << "counts the threads that GNU's run-time starts for a new master thread";
#else
  const auto liveThreads = [] {
    using std::filesystem::directory_iterator;
    return std::distance(directory_iterator("/proc/self/task"), directory_iterator());
  };
  for (const int threads : {1, 2, 3}) {
    // A thread without regions so far has no team yet.
    std::thread([&] {
      omp_set_num_threads(threads);
      const testsupport::TestBlock<std::uint8_t> input(
          {.width = 50, .height = 40, .marginX = 1, .marginY = 1});
      testsupport::TestBlock<std::uint8_t> output({.width = 50, .height = 40});
      const auto before = liveThreads();
      EXPECT_TRUE(testsupport::FilterAverage({}, input, {}, output).Ok());
      EXPECT_EQ(liveThreads() - before, threads - 1);
    }).join();
  }
#endif
}

TEST_F(AverageFilterThreadsTest, RunsInsideAParallelRegion) {
  for (const int levels : {1, 2}) {
    omp_set_max_active_levels(levels);
    omp_set_num_threads(2);
    int outer = 0;
    std::vector<int> inner(2);
#pragma omp parallel num_threads(2)
    {
      const int me = omp_get_thread_num();
#pragma omp single
      outer = omp_get_num_threads();
      omp_set_num_threads(2);
      for (std::uint64_t i = 0; i < 40; ++i) {
        const std::uint64_t seed = 20000 + 2 * i + static_cast<std::uint64_t>(me);
        EXPECT_TRUE(AgreesOnScene<std::uint8_t>(seed));
        EXPECT_TRUE(AgreesOnScene<double>(seed));
      }
      inner[static_cast<std::size_t>(me)] = TeamSize();
    }
    ASSERT_EQ(outer, 2);
    EXPECT_EQ(inner, std::vector<int>(2, levels));
  }
}

TEST_F(AverageFilterThreadsTest, RunsInThreadsOfTheHost) {
  std::vector<std::thread> hosts;
  for (std::uint64_t host = 0; host < 3; ++host) {
    hosts.emplace_back([host] {
      omp_set_num_threads(2);
      for (std::uint64_t i = 0; i < 40; ++i) {
        EXPECT_TRUE(AgreesOnScene<std::uint16_t>(30000 + 3 * i + host));
      }
    });
  }
  for (std::thread& host : hosts) host.join();
}

}  // namespace
}  // namespace zarn::processes::filters
