// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/cubicrsfactory.h"

#include "processes/filters/resample/cubicrs.h"

namespace zarn::processes::filters {

CubicRSFactory::CubicRSFactory(utils::IBufPosTfm* positions) : transform(positions) {}

CubicRSFactory::CubicRSFactory(const CubicRSFactory& other) = default;
CubicRSFactory& CubicRSFactory::operator=(const CubicRSFactory& other) = default;
CubicRSFactory::~CubicRSFactory() = default;

IFilter* CubicRSFactory::GetCPUFilter() const { return new CPUCubicRS(transform); }

}  // namespace zarn::processes::filters
