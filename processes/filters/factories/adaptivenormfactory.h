// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes adaptive normalisation filters, which leave the pixels as they are.
class ZARN_FILTERS_EXPORT AdaptiveNormFactory : public IFilterFactory {
 public:
  /// The parameter is kept as it is.
  explicit AdaptiveNormFactory(const double& value);
  AdaptiveNormFactory(const AdaptiveNormFactory& other);
  AdaptiveNormFactory& operator=(const AdaptiveNormFactory& other);
  ~AdaptiveNormFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  double value_;
};

}  // namespace zarn::processes::filters
