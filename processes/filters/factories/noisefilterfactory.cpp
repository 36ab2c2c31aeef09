// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/noisefilterfactory.h"

#include "processes/filters/neighbourhood/noisefilter.h"

namespace zarn::processes::filters {

NoiseFilterFactory::NoiseFilterFactory(int size, double background)
    : kernelSize(size), noDataValue(background) {}

NoiseFilterFactory::NoiseFilterFactory(const NoiseFilterFactory& other) = default;
NoiseFilterFactory& NoiseFilterFactory::operator=(const NoiseFilterFactory& other) = default;
NoiseFilterFactory::~NoiseFilterFactory() = default;

IFilter* NoiseFilterFactory::GetCPUFilter() const {
  return new CPUNoiseFilter(kernelSize, noDataValue);
}

}  // namespace zarn::processes::filters
