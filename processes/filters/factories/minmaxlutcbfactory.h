// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <vector>

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes colour balancers with a table of 256 bytes over a range of samples per channel.
class ZARN_FILTERS_EXPORT MinMaxLUTCBFactory : public IFilterFactory {
 public:
  /// One entry per channel each. Copies 256 bytes from each pointer; the caller keeps the arrays.
  /// Throws `ParameterException` (parameter "luts") for a null pointer; nothing else is validated.
  MinMaxLUTCBFactory(const std::vector<unsigned char*>& luts, const std::vector<double>& mins,
                     const std::vector<double>& maxs);
  MinMaxLUTCBFactory(const MinMaxLUTCBFactory& other);
  MinMaxLUTCBFactory& operator=(const MinMaxLUTCBFactory& other);
  ~MinMaxLUTCBFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  std::vector<std::array<unsigned char, 256>> luts_;
  std::vector<double> mins_;
  std::vector<double> maxs_;
};

}  // namespace zarn::processes::filters
