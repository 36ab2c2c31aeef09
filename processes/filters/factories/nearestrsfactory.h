// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/utils/ibufpostfm.h"
#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes resamplers that take the pixel that a position lies in.
class ZARN_FILTERS_EXPORT NearestRSFactory : public IFilterFactory {
 public:
  /// Keeps the address of the transform, which may be null. The first filter that the factory or a
  /// copy of it makes owns the transform and deletes it at its own end; a second filter would be
  /// left with a deleted one, so make one filter for each transform. A factory that made no filter
  /// leaves the transform to the caller.
  explicit NearestRSFactory(utils::IBufPosTfm* positions);
  NearestRSFactory(const NearestRSFactory& other);
  NearestRSFactory& operator=(const NearestRSFactory& other);
  ~NearestRSFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  utils::IBufPosTfm* transform;
};

}  // namespace zarn::processes::filters
