// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <omp.h>

#include <cstddef>
#include <cstdint>
#include <thread>
#include <vector>

#include "processes/filters/framework/parallel.h"
#include "tests/support/windowfiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesOnScene;
using testsupport::TestedAverage;

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
      EXPECT_TRUE((AgreesOnScene<TestedAverage, std::uint8_t>(seed)));
      EXPECT_TRUE((AgreesOnScene<TestedAverage, std::int16_t>(seed)));
      EXPECT_TRUE((AgreesOnScene<TestedAverage, float>(seed)));
    }
    ASSERT_EQ(TeamSize(), threads);
  }
}

TEST_F(AverageFilterThreadsTest, SharesTheRowsOutAmongTheThreads) {
  for (const int threads : {1, 2, 3}) {
    omp_set_num_threads(threads);
    const std::ptrdiff_t bands = parallel::BandCount(40);
    EXPECT_EQ(bands, threads);
    std::vector<int> thread(static_cast<std::size_t>(bands), -1);
    std::vector<int> rows(40);
    parallel::ForEachRowBand(40, bands,
                             [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
                               thread[static_cast<std::size_t>(band)] = omp_get_thread_num();
                               for (std::ptrdiff_t y = begin; y < end; ++y)
                                 ++rows[static_cast<std::size_t>(y)];
                             });
    // Every band has a thread of its own, and every row one band.
    for (int t = 0; t < threads; ++t) EXPECT_EQ(thread[static_cast<std::size_t>(t)], t);
    EXPECT_EQ(rows, std::vector<int>(40, 1));
  }
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
        EXPECT_TRUE((AgreesOnScene<TestedAverage, std::uint8_t>(seed)));
        EXPECT_TRUE((AgreesOnScene<TestedAverage, double>(seed)));
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
        EXPECT_TRUE((AgreesOnScene<TestedAverage, std::uint16_t>(30000 + 3 * i + host)));
      }
    });
  }
  for (std::thread& host : hosts) host.join();
}

}  // namespace
}  // namespace zarn::processes::filters
