// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes median filters: the middle sample of a square window of up to 7x7 pixels, with no-data and
/// background pixels left out of every median and left alone.
class ZARN_FILTERS_EXPORT MedianFilterFactory : public IFilterFactory {
 public:
  /// `size` is the side of the window in pixels (an even size acts as the next odd one); a pixel
  /// whose channels all equal `background` is background. Nothing is validated here.
  MedianFilterFactory(int size, double background);
  /// Without a background value: every pixel that is not no-data counts.
  explicit MedianFilterFactory(int size);
  MedianFilterFactory(const MedianFilterFactory& other);
  MedianFilterFactory& operator=(const MedianFilterFactory& other);
  ~MedianFilterFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  int kernelSize;
  std::optional<double> noDataValue;
};

}  // namespace zarn::processes::filters
