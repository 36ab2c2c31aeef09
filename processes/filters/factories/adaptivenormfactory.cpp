// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/adaptivenormfactory.h"

#include "processes/filters/normalization/adaptivenorm.h"

namespace zarn::processes::filters {

AdaptiveNormFactory::AdaptiveNormFactory(const double& value) : value_(value) {}

AdaptiveNormFactory::AdaptiveNormFactory(const AdaptiveNormFactory& other) = default;
AdaptiveNormFactory& AdaptiveNormFactory::operator=(const AdaptiveNormFactory& other) = default;
AdaptiveNormFactory::~AdaptiveNormFactory() = default;

IFilter* AdaptiveNormFactory::GetCPUFilter() const { return new CPUAdaptiveNorm(value_); }

}  // namespace zarn::processes::filters
