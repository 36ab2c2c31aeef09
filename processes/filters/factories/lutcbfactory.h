// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <vector>

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes colour balancers with a table of 256 bytes per channel.
class ZARN_FILTERS_EXPORT LUTCBFactory : public IFilterFactory {
 public:
  /// Copies 256 bytes from each pointer, one for each channel; the caller keeps the arrays. Throws
  /// `ParameterException` (parameter "luts") for a null pointer.
  explicit LUTCBFactory(const std::vector<unsigned char*>& luts);
  LUTCBFactory(const LUTCBFactory& other);
  LUTCBFactory& operator=(const LUTCBFactory& other);
  ~LUTCBFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  std::vector<std::array<unsigned char, 256>> luts_;
};

}  // namespace zarn::processes::filters
