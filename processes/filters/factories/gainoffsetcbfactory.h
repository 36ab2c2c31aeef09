// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes colour balancers that give each channel a gain and an offset.
class ZARN_FILTERS_EXPORT GainOffsetCBFactory : public IFilterFactory {
 public:
  /// One entry per channel each; nothing is validated here.
  GainOffsetCBFactory(const std::vector<double>& gains, const std::vector<double>& offsets);
  GainOffsetCBFactory(const GainOffsetCBFactory& other);
  GainOffsetCBFactory& operator=(const GainOffsetCBFactory& other);
  ~GainOffsetCBFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  std::vector<double> gains_;
  std::vector<double> offsets_;
};

}  // namespace zarn::processes::filters
