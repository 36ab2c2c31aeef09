// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/hotspotnormfactory.h"

#include <utility>

#include "processes/filters/normalization/hotspotnorm.h"

namespace zarn::processes::filters {

HotSpotNormFactory::HotSpotNormFactory(std::vector<std::vector<double>> coeffs,
                                       unsigned int columnDivisor, unsigned int rowDivisor)
    : coeffs_(std::move(coeffs)), columnDivisor_(columnDivisor), rowDivisor_(rowDivisor) {}

HotSpotNormFactory::HotSpotNormFactory(const HotSpotNormFactory& other) = default;
HotSpotNormFactory& HotSpotNormFactory::operator=(const HotSpotNormFactory& other) = default;
HotSpotNormFactory::~HotSpotNormFactory() = default;

IFilter* HotSpotNormFactory::GetCPUFilter() const {
  return new CPUHotSpotNorm(coeffs_, columnDivisor_, rowDivisor_);
}

}  // namespace zarn::processes::filters
