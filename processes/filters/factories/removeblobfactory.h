// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes filters that turn regions of data into background where a square window does not fit into
/// them.
class ZARN_FILTERS_EXPORT RemoveBlobFactory : public IFilterFactory {
 public:
  /// `size` is the side of the window in pixels (an even size acts as the next odd one); a pixel
  /// whose channels all equal `background` is background. Nothing is validated here.
  RemoveBlobFactory(int size, double background);
  RemoveBlobFactory(const RemoveBlobFactory& other);
  RemoveBlobFactory& operator=(const RemoveBlobFactory& other);
  ~RemoveBlobFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  int kernelSize;
  double noDataValue;
};

}  // namespace zarn::processes::filters
