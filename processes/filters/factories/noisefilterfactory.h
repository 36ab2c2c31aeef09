// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes noise filters: isolated pixels and samples that stand out brightly from a square window
/// become background; no-data and background pixels are left out and left alone.
class ZARN_FILTERS_EXPORT NoiseFilterFactory : public IFilterFactory {
 public:
  /// `size` is the side of the window in pixels (an even size acts as the next odd one); a pixel
  /// whose channels all equal `background` is background. Nothing is validated here.
  NoiseFilterFactory(int size, double background);
  NoiseFilterFactory(const NoiseFilterFactory& other);
  NoiseFilterFactory& operator=(const NoiseFilterFactory& other);
  ~NoiseFilterFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  int kernelSize;
  double noDataValue;
};

}  // namespace zarn::processes::filters
