// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "host/mosaic/mosdodgingcoeffs.h"
#include "host/mosaic/mosdodgingsurface.h"
#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes dodging filters: coefficients per channel and correction surfaces of the host.
class ZARN_FILTERS_EXPORT DodgingCBFactory : public IFilterFactory {
 public:
  /// Keeps the address of `coeffs` (one entry per channel), which must outlive the factory: each
  /// filter copies what they are when it is made. The surfaces are borrowed by the factory and its
  /// filters; null means that there is none. Nothing is validated here.
  DodgingCBFactory(const std::vector<MOSDodgingCoeffs>& coeffs, MOSDodgingType type,
                   MOSDodgingSurfaceFactoryRef* gainSurface,
                   MOSDodgingSurfaceFactoryRef* offsetSurface);
  DodgingCBFactory(const DodgingCBFactory& other);
  DodgingCBFactory& operator=(const DodgingCBFactory& other);
  ~DodgingCBFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  const std::vector<MOSDodgingCoeffs>* coeffs_;
  MOSDodgingType type_;
  MOSDodgingSurfaceFactoryRef* gainSurface_;
  MOSDodgingSurfaceFactoryRef* offsetSurface_;
};

}  // namespace zarn::processes::filters
