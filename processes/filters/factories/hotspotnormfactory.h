// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes filters that subtract a quadratic surface per channel.
class ZARN_FILTERS_EXPORT HotSpotNormFactory : public IFilterFactory {
 public:
  /// A row of six coefficients for each channel; the divisors are the extent of the whole image in
  /// pixels. Nothing is validated here.
  HotSpotNormFactory(std::vector<std::vector<double>> coeffs, unsigned int columnDivisor,
                     unsigned int rowDivisor);
  HotSpotNormFactory(const HotSpotNormFactory& other);
  HotSpotNormFactory& operator=(const HotSpotNormFactory& other);
  ~HotSpotNormFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  std::vector<std::vector<double>> coeffs_;
  unsigned int columnDivisor_;
  unsigned int rowDivisor_;
};

}  // namespace zarn::processes::filters
