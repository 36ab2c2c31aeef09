// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes resamplers that copy whole pixels from a grid that is only shifted.
class ZARN_FILTERS_EXPORT DirectCopyRSFactory : public IFilterFactory {
 public:
  /// Output pixel (x, y) takes input pixel (x + columnShift, y + rowShift), besides what the
  /// origins of the blocks differ by. Nothing is validated here.
  DirectCopyRSFactory(int columnShift, int rowShift);
  DirectCopyRSFactory(const DirectCopyRSFactory& other);
  DirectCopyRSFactory& operator=(const DirectCopyRSFactory& other);
  ~DirectCopyRSFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  int columnShift_;
  int rowShift_;
};

}  // namespace zarn::processes::filters
