// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/nearestrsfactory.h"

#include "processes/filters/resample/nearestrs.h"

namespace zarn::processes::filters {

NearestRSFactory::NearestRSFactory(utils::IBufPosTfm* positions) : transform(positions) {}

NearestRSFactory::NearestRSFactory(const NearestRSFactory& other) = default;
NearestRSFactory& NearestRSFactory::operator=(const NearestRSFactory& other) = default;
NearestRSFactory::~NearestRSFactory() = default;

IFilter* NearestRSFactory::GetCPUFilter() const { return new CPUNearestRS(transform); }

}  // namespace zarn::processes::filters
