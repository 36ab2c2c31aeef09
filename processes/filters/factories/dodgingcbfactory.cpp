// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/dodgingcbfactory.h"

#include "processes/filters/colorbalance/dodgingcb.h"

namespace zarn::processes::filters {

DodgingCBFactory::DodgingCBFactory(const std::vector<MOSDodgingCoeffs>& coeffs, MOSDodgingType type,
                                   MOSDodgingSurfaceFactoryRef* gainSurface,
                                   MOSDodgingSurfaceFactoryRef* offsetSurface)
    : coeffs_(&coeffs), type_(type), gainSurface_(gainSurface), offsetSurface_(offsetSurface) {}

DodgingCBFactory::DodgingCBFactory(const DodgingCBFactory& other) = default;
DodgingCBFactory& DodgingCBFactory::operator=(const DodgingCBFactory& other) = default;
DodgingCBFactory::~DodgingCBFactory() = default;

IFilter* DodgingCBFactory::GetCPUFilter() const {
  return new CPUDodgingCB(*coeffs_, type_, gainSurface_, offsetSurface_);
}

}  // namespace zarn::processes::filters
