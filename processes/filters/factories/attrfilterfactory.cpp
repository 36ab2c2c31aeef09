// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/attrfilterfactory.h"

#include "host/core/exception.h"
#include "host/nspio/debugger.h"
#include "processes/filters/attribute/attraveragefilter.h"
#include "processes/filters/attribute/attrmedianfilter.h"
#include "processes/filters/attribute/attrtrimmedmean.h"

namespace zarn::processes::filters {

namespace {

// Source and lines are part of the messages' fixed form; log readers match them.
constexpr const char* kSource = "processes/filters/factories/attrfilterfactory";

}  // namespace

AttrFilterFactory::AttrFilterFactory(int size, KernelShape shape)
    : kernelSize(size), kernelShape(shape) {}
AttrFilterFactory::AttrFilterFactory(const AttrFilterFactory& other) = default;
AttrFilterFactory& AttrFilterFactory::operator=(const AttrFilterFactory& other) = default;
AttrFilterFactory::~AttrFilterFactory() = default;

IAttributeFilter* AttrFilterFactory::GetFilter(FILTERALGO eType) const {
  IAttributeFilter* const filter = GetCUDAFilter(eType);
  return filter != nullptr ? filter : GetCPUFilter(eType);
}

IAttributeFilter* AttrFilterFactory::GetCPUFilter(FILTERALGO eType) const {
  switch (eType) {
    case FILTERALGO::kAverage:
      return new CPUAttrAverageFilter(kernelSize, kernelShape);
    case FILTERALGO::kMedian:
      return new CPUAttrMedianFilter(kernelSize, kernelShape);
    case FILTERALGO::kTrimmedMean:
      return new CPUAttrTrimmedMean(kernelSize, kernelShape);
  }
  throw ParameterException("GetCPUFilter(): The provided filter algorithm was not recognized",
                           "eType", 1, kSource, __PRETTY_FUNCTION__, 91);
}

IAttributeFilter* AttrFilterFactory::GetCUDAFilter(FILTERALGO eType) const {
  if (nspio::Debugger::moDebugLevel > 0) {
    nspio::Debugger::Debug("CUDA not supported, using CPU Filter instead.", 1, "zarn_filters",
                           kSource, 146);
  }
  return GetCPUFilter(eType);
}

}  // namespace zarn::processes::filters
