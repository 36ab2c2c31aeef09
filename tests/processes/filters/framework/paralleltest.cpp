// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <omp.h>

#include <algorithm>
#include <atomic>
#include <vector>

#include "processes/filters/framework/parallel.h"

namespace zarn::processes::filters::parallel {
namespace {

class ParallelTest : public ::testing::Test {
 protected:
  void TearDown() override {
    omp_set_num_threads(threads_);
    omp_set_dynamic(dynamic_);
  }

 private:
  int threads_ = omp_get_max_threads();
  int dynamic_ = omp_get_dynamic();
};

TEST_F(ParallelTest, EveryRowBelongsToOneBand) {
  omp_set_dynamic(0);
  for (const int threads : {7, 3, 2, 1}) {
    omp_set_num_threads(threads);
    for (const std::ptrdiff_t rows : {0, 1, 2, 3, 6, 7, 8, 100}) {
      SCOPED_TRACE(::testing::Message() << rows << " rows, " << threads << " threads");
      const std::ptrdiff_t bands = BandCount(rows);
      EXPECT_EQ(bands, std::clamp<std::ptrdiff_t>(rows, 1, threads));
      std::vector<std::atomic<int>> owners(static_cast<std::size_t>(rows));
      std::vector<std::atomic<int>> calls(static_cast<std::size_t>(bands));
      std::atomic<int> team{0};
      ForEachRowBand(rows, bands,
                     [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
                       team = omp_get_num_threads();
                       ++calls[static_cast<std::size_t>(band)];
                       for (std::ptrdiff_t y = begin; y < end; ++y) {
                         ++owners[static_cast<std::size_t>(y)];
                       }
                     });
      EXPECT_EQ(team, threads);
      EXPECT_TRUE(std::all_of(owners.begin(), owners.end(), [](int n) { return n == 1; }));
      EXPECT_TRUE(std::all_of(calls.begin(), calls.end(), [](int n) { return n == 1; }));
    }
  }
}

TEST_F(ParallelTest, AllowsDynamicThreadsOnlyOutsideARegion) {
  omp_set_dynamic(0);
  omp_set_num_threads(2);
  int changed = 0;
#pragma omp parallel reduction(+ : changed)
  {
    AllowDynamicThreads();
    changed += omp_get_dynamic();
  }
  EXPECT_EQ(changed, 0);
  EXPECT_EQ(omp_get_dynamic(), 0);
  AllowDynamicThreads();
  EXPECT_NE(omp_get_dynamic(), 0);
}

}  // namespace
}  // namespace zarn::processes::filters::parallel
