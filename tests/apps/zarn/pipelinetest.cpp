// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <barrier>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "apps/zarn/pipeline.h"

namespace zarn::app {
namespace {

TEST(Pipeline, TakesEveryJobThroughAllStagesInOrderInItsSlot) {
  constexpr std::size_t kJobs = 500;
  constexpr std::size_t kSlots = 3;
  std::array<std::size_t, kSlots> slots{};
  std::vector<std::size_t> left;
  const auto caller = std::this_thread::get_id();
  std::thread::id middle;
  RunPipeline(kJobs, kSlots,
              {[&](std::size_t job, std::size_t slot) {
                 // What the job before left in its slot may still be read here.
                 if (job > 0) {
                   EXPECT_EQ(slots[(slot + kSlots - 1) % kSlots], (job - 1) * 10);
                 }
                 slots[slot] = job * 10;
               },
               [&](std::size_t job, std::size_t slot) {
                 EXPECT_EQ(slots[slot], job * 10);
                 middle = std::this_thread::get_id();
               },
               [&](std::size_t job, std::size_t slot) {
                 EXPECT_EQ(slots[slot], job * 10);
                 left.push_back(job);
               }},
              1);
  EXPECT_EQ(middle, caller);
  ASSERT_EQ(left.size(), kJobs);
  for (std::size_t job = 0; job < kJobs; ++job) EXPECT_EQ(left[job], job);
}

TEST(Pipeline, OverlapsItsStages) {
  // Three different jobs meet in the three stages; without overlap this never ends.
  std::barrier meeting(3);
  RunPipeline(5, 3,
              {[&](std::size_t job, std::size_t) {
                 if (job == 2) meeting.arrive_and_wait();
               },
               [&](std::size_t job, std::size_t) {
                 if (job == 1) meeting.arrive_and_wait();
               },
               [&](std::size_t job, std::size_t) {
                 if (job == 0) meeting.arrive_and_wait();
               }},
              1);
}

TEST(Pipeline, StopsAllStagesAtTheFirstException) {
  for (std::size_t failing = 0; failing < 3; ++failing) {
    std::atomic<std::size_t> begun = 0;
    std::vector<Stage> stages;
    for (std::size_t stage = 0; stage < 3; ++stage) {
      stages.push_back([&, stage](std::size_t job, std::size_t) {
        ++begun;
        if (stage == failing && job == 4)
          throw std::runtime_error("stage " + std::to_string(stage));
      });
    }
    try {
      RunPipeline(100000, 3, stages, 1);
      ADD_FAILURE() << "the exception of stage " << failing << " is lost";
    } catch (const std::runtime_error& error) {
      EXPECT_EQ(error.what(), "stage " + std::to_string(failing));
    }
    EXPECT_LT(begun, 30U);
  }
}

}  // namespace
}  // namespace zarn::app
