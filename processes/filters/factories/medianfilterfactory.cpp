// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/medianfilterfactory.h"

#include "processes/filters/neighbourhood/medianfilter.h"

namespace zarn::processes::filters {

MedianFilterFactory::MedianFilterFactory(int size, double background)
    : kernelSize(size), noDataValue(background) {}

MedianFilterFactory::MedianFilterFactory(int size) : kernelSize(size) {}

MedianFilterFactory::MedianFilterFactory(const MedianFilterFactory& other) = default;
MedianFilterFactory& MedianFilterFactory::operator=(const MedianFilterFactory& other) = default;
MedianFilterFactory::~MedianFilterFactory() = default;

IFilter* MedianFilterFactory::GetCPUFilter() const {
  return new CPUMedianFilter(kernelSize, noDataValue);
}

}  // namespace zarn::processes::filters
