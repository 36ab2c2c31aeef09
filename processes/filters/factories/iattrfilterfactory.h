// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/attribute/filteralgo.h"
#include "processes/filters/filtersexport.h"

namespace zarn::processes::filters {

class IAttributeFilter;

/// Makes attribute filters (attribute/iattributefilter.h). Every call returns a new filter, which
/// the caller owns and deletes and which does not refer back to the factory.
class ZARN_FILTERS_EXPORT IAttrFilterFactory {
 public:
  IAttrFilterFactory() = default;
  IAttrFilterFactory(const IAttrFilterFactory&) = default;
  IAttrFilterFactory& operator=(const IAttrFilterFactory&) = default;
  virtual ~IAttrFilterFactory();

  /// The best filter there is: that of `GetCUDAFilter`, or that of `GetCPUFilter` where there is
  /// none.
  virtual IAttributeFilter* GetFilter(FILTERALGO eType) const = 0;
  virtual IAttributeFilter* GetCPUFilter(FILTERALGO eType) const = 0;
  virtual IAttributeFilter* GetCUDAFilter(FILTERALGO eType) const = 0;
};

}  // namespace zarn::processes::filters
