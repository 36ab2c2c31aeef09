// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes colour balancers whose gain is a polynomial of the position in the whole image.
class ZARN_FILTERS_EXPORT NeighborhoodCBFactory : public IFilterFactory {
 public:
  /// A row of 2, 4 or 7 coefficients and a bias for each channel; with any other number only the
  /// biases count. Throws `ParameterException` when there is no bias, when the numbers of rows and
  /// biases differ, or when the rows differ in length.
  NeighborhoodCBFactory(const std::vector<std::vector<double>>& oCoeff,
                        const std::vector<double>& oBias);
  NeighborhoodCBFactory(const NeighborhoodCBFactory& other);
  NeighborhoodCBFactory& operator=(const NeighborhoodCBFactory& other);
  ~NeighborhoodCBFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  std::vector<std::vector<double>> oCoeff_;
  std::vector<double> oBias_;
};

}  // namespace zarn::processes::filters
