// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes average filters: the mean over a square window, with no-data and background pixels left
/// out of every mean and left alone.
class ZARN_FILTERS_EXPORT AverageFilterFactory : public IFilterFactory {
 public:
  /// `size` is the side of the window in pixels (an even size acts as the next odd one); a pixel
  /// whose channels all equal `background` is background. Nothing is validated here.
  AverageFilterFactory(int size, double background);
  /// Without a background value: every pixel that is not no-data counts.
  explicit AverageFilterFactory(int size);
  AverageFilterFactory(const AverageFilterFactory& other);
  AverageFilterFactory& operator=(const AverageFilterFactory& other);
  ~AverageFilterFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  int kernelSize;
  std::optional<double> noDataValue;
};

}  // namespace zarn::processes::filters
