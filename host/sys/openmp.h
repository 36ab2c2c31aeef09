// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <thread>

#include "host/hostexport.h"

namespace zarn::sys {

/// Threads that the next parallel region of the calling thread may use.
ZARN_HOST_EXPORT int OMPGetMaxThreads();
/// The threads that an option stands for: 0 means as many as the next region may use.
inline int OMPThreadsFor(int option) { return option > 0 ? option : OMPGetMaxThreads(); }
/// Threads of the innermost active parallel region; 1 outside.
ZARN_HOST_EXPORT int OMPGetNumThreads();
/// Number of the calling thread within its region, from 0.
ZARN_HOST_EXPORT int OMPGetThreadNum();

/// Sets dynamic adjustment of the thread count for its lifetime and restores it afterwards.
class ZARN_HOST_EXPORT OMPDynamic {
 public:
  explicit OMPDynamic(bool dynamic);
  OMPDynamic(const OMPDynamic&) = delete;
  OMPDynamic& operator=(const OMPDynamic&) = delete;
  ~OMPDynamic();

 private:
  int previous_;
};

/// Sets the thread count of the next regions for its lifetime and restores it afterwards. The
/// request is kept within 1 .. `OMPGetMaxThreads()`: a pixel count may be passed as it is.
class ZARN_HOST_EXPORT OMPThreadCount {
 public:
  explicit OMPThreadCount(std::int64_t count);
  OMPThreadCount(const OMPThreadCount&) = delete;
  OMPThreadCount& operator=(const OMPThreadCount&) = delete;
  ~OMPThreadCount();

 private:
  int previous_;
};

/// Lets threads that wait for the next parallel region give up their processors soon, for its
/// lifetime: for a program whose other threads have work for them.
///
/// GNU's run-time lets them spin for milliseconds, except where it manages more threads than there
/// are processors. So this adds two, which do nothing.
class ZARN_HOST_EXPORT OMPBriefWaits {
 public:
  OMPBriefWaits();

 private:
  std::jthread idle_;
};

}  // namespace zarn::sys
