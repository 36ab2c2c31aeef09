// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/directcopyrsfactory.h"

#include "processes/filters/resample/directcopyrs.h"

namespace zarn::processes::filters {

DirectCopyRSFactory::DirectCopyRSFactory(int columnShift, int rowShift)
    : columnShift_(columnShift), rowShift_(rowShift) {}

DirectCopyRSFactory::DirectCopyRSFactory(const DirectCopyRSFactory& other) = default;
DirectCopyRSFactory& DirectCopyRSFactory::operator=(const DirectCopyRSFactory& other) = default;
DirectCopyRSFactory::~DirectCopyRSFactory() = default;

IFilter* DirectCopyRSFactory::GetCPUFilter() const {
  return new CPUDirectCopyRS(columnShift_, rowShift_);
}

}  // namespace zarn::processes::filters
