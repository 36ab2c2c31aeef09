// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "host/hostexport.h"

namespace zarn::nspio {

/// Progress of a long operation. The operation calls `Update` from one thread at a time; an
/// implementation cancels it by throwing.
class ZARN_HOST_EXPORT Counter {
 public:
  Counter() = default;
  Counter(const Counter&) = delete;
  Counter& operator=(const Counter&) = delete;
  virtual ~Counter();

  /// `fraction` of the work done, 0 to 1, never decreasing within a step; `step` names what is
  /// being done, where the work has several steps.
  void Update(double fraction, const std::string& step = std::string()) { Report(fraction, step); }

 protected:
  virtual void Report(double fraction, const std::string& step) = 0;
};

}  // namespace zarn::nspio
