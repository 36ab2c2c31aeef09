// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/pipeline.h"

#include <condition_variable>
#include <exception>
#include <mutex>
#include <thread>

#include "host/sys/openmp.h"

namespace zarn::app {
namespace {

class Conveyor {
 public:
  Conveyor(std::size_t jobs, std::size_t slots, const std::vector<Stage>& stages)
      : jobs_(jobs), slots_(slots), stages_(stages), done_(stages.size(), 0) {}

  void RunStage(std::size_t stage) {
    try {
      for (std::size_t job = 0; job < jobs_ && WaitFor(stage, job); ++job) {
        stages_[stage](job, job % slots_);
        Finish(stage);
      }
    } catch (...) {
      Fail(std::current_exception());
    }
  }

  void RethrowFailure() const {
    if (failure_) std::rethrow_exception(failure_);
  }

 private:
  bool Ready(std::size_t stage, std::size_t job) const {
    return stage == 0 ? job < done_.back() + slots_ : job < done_[stage - 1];
  }

  // False when another stage has failed.
  bool WaitFor(std::size_t stage, std::size_t job) {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [&] { return failure_ || Ready(stage, job); });
    return !failure_;
  }

  void Finish(std::size_t stage) {
    const std::lock_guard lock(mutex_);
    ++done_[stage];
    changed_.notify_all();
  }

  void Fail(std::exception_ptr failure) {
    const std::lock_guard lock(mutex_);
    if (!failure_) failure_ = std::move(failure);
    changed_.notify_all();
  }

  const std::size_t jobs_;
  const std::size_t slots_;
  const std::vector<Stage>& stages_;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::vector<std::size_t> done_;  ///< jobs that each stage has finished
  std::exception_ptr failure_;
};

}  // namespace

void RunPipeline(std::size_t jobs, std::size_t slots, const std::vector<Stage>& stages,
                 std::size_t callersStage) {
  Conveyor conveyor(jobs, slots, stages);
  const sys::OMPBriefWaits briefWaits;
  {
    std::vector<std::jthread> threads;
    for (std::size_t stage = 0; stage < stages.size(); ++stage) {
      if (stage != callersStage) threads.emplace_back([&, stage] { conveyor.RunStage(stage); });
    }
    conveyor.RunStage(callersStage);
  }
  conveyor.RethrowFailure();
}

void RunOnOneThread(std::size_t jobs, std::size_t slots, const std::vector<Stage>& stages) {
  for (std::size_t job = 0; job < jobs; ++job) {
    for (const Stage& stage : stages) stage(job, job % slots);
  }
}

}  // namespace zarn::app
