// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <omp.h>

#include <cstdint>
#include <limits>

#include "host/sys/openmp.h"

namespace zarn::sys {
namespace {

class OpenMPTest : public ::testing::Test {
 protected:
  void SetUp() override { omp_set_num_threads(5); }
  void TearDown() override { omp_set_num_threads(former_); }

 private:
  int former_ = omp_get_max_threads();
};

TEST_F(OpenMPTest, ThreadCountIsKeptWithinWhatThereIsAndRestored) {
  const struct {
    std::int64_t asked;
    int given;
  } kCases[] = {{1, 1},
                {3, 3},
                {5, 5},
                {6, 5},
                {4001, 5},
                {std::int64_t{1} << 32, 5},
                {std::numeric_limits<std::int64_t>::max(), 5},
                {0, 1},
                {-7, 1},
                {std::numeric_limits<std::int64_t>::min(), 1}};
  for (const auto& c : kCases) {
    SCOPED_TRACE(c.asked);
    {
      const OMPThreadCount count(c.asked);
      EXPECT_EQ(OMPGetMaxThreads(), c.given);
    }
    EXPECT_EQ(OMPGetMaxThreads(), 5);
  }
}

TEST_F(OpenMPTest, DynamicAdjustmentIsSetAndRestored) {
  for (const int before : {0, 1}) {
    omp_set_dynamic(before);
    for (const bool wanted : {true, false}) {
      const OMPDynamic dynamic(wanted);
      EXPECT_EQ(omp_get_dynamic() != 0, wanted);
    }
    EXPECT_EQ(omp_get_dynamic(), before);
  }
  omp_set_dynamic(0);
}

}  // namespace
}  // namespace zarn::sys
