// SPDX-License-Identifier: Apache-2.0
#include "host/sys/openmp.h"

#include <omp.h>

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <mutex>
#include <stop_token>

#include "host/sys/parallel.h"

namespace zarn::sys {

int OMPGetMaxThreads() { return omp_get_max_threads(); }

int OMPGetNumThreads() { return omp_get_num_threads(); }

int OMPGetThreadNum() { return omp_get_thread_num(); }

OMPDynamic::OMPDynamic(bool dynamic) : previous_(omp_get_dynamic()) {
  omp_set_dynamic(dynamic ? 1 : 0);
}

OMPDynamic::~OMPDynamic() { omp_set_dynamic(previous_); }

OMPThreadCount::OMPThreadCount(std::int64_t count) : previous_(omp_get_max_threads()) {
  omp_set_num_threads(static_cast<int>(std::clamp<std::int64_t>(count, 1, previous_)));
}

OMPThreadCount::~OMPThreadCount() { omp_set_num_threads(previous_); }

OMPBriefWaits::OMPBriefWaits()
    : idle_([](const std::stop_token& stop) {
        constexpr int kTeam = 2;
        const OMPThreadCount threads(kTeam);
        std::atomic<int> started{0};
        parallel::ForEachRowBand(kTeam, kTeam, [&](auto, auto, auto) { ++started; });
        std::mutex mutex;
        std::unique_lock lock(mutex);
        std::condition_variable_any never;
        never.wait(lock, stop, [] { return false; });
      }) {}

}  // namespace zarn::sys
