// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/ifilterfactory.h"

#include "host/nspio/debugger.h"

namespace zarn::processes::filters {

IFilterFactory::~IFilterFactory() = default;

IFilter* IFilterFactory::GetCUDAFilter() const {
  if (nspio::Debugger::moDebugLevel != 0) {
    // File and line are part of the message's fixed form; log readers match them.
    nspio::Debugger::Debug("CUDA not supported, using CPU Filter instead.", 1, "zarn_filters",
                           "processes/filters/factories/ifilterfactory", 38);
  }
  return GetCPUFilter();
}

}  // namespace zarn::processes::filters
