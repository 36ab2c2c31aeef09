// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/averagefilterfactory.h"

#include "processes/filters/neighbourhood/averagefilter.h"

namespace zarn::processes::filters {

AverageFilterFactory::AverageFilterFactory(int size, double background)
    : kernelSize(size), noDataValue(background) {}

AverageFilterFactory::AverageFilterFactory(int size) : kernelSize(size) {}

AverageFilterFactory::AverageFilterFactory(const AverageFilterFactory& other) = default;
AverageFilterFactory& AverageFilterFactory::operator=(const AverageFilterFactory& other) = default;
AverageFilterFactory::~AverageFilterFactory() = default;

IFilter* AverageFilterFactory::GetCPUFilter() const {
  return new CPUAverageFilter(kernelSize, noDataValue);
}

}  // namespace zarn::processes::filters
