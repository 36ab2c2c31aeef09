// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/bilinearrsfactory.h"

#include "processes/filters/resample/bilinearrs.h"

namespace zarn::processes::filters {

BilinearRSFactory::BilinearRSFactory(utils::IBufPosTfm* positions) : transform(positions) {}

BilinearRSFactory::BilinearRSFactory(const BilinearRSFactory& other) = default;
BilinearRSFactory& BilinearRSFactory::operator=(const BilinearRSFactory& other) = default;
BilinearRSFactory::~BilinearRSFactory() = default;

IFilter* BilinearRSFactory::GetCPUFilter() const { return new CPUBilinearRS(transform); }

}  // namespace zarn::processes::filters
