// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/filtersexport.h"
#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {

/// Holds the parameters of one filter family and makes its filters. A factory is a copyable value;
/// filters do not refer back to it.
class ZARN_FILTERS_EXPORT IFilterFactory {
 public:
  virtual ~IFilterFactory();

  /// A new filter, which the caller owns and deletes.
  virtual IFilter* GetCPUFilter() const = 0;

  /// There is no GPU code: says so at debug level 1 and returns `GetCPUFilter()`.
  IFilter* GetCUDAFilter() const;

 protected:
  IFilterFactory() = default;
  IFilterFactory(const IFilterFactory&) = default;
  IFilterFactory& operator=(const IFilterFactory&) = default;
};

}  // namespace zarn::processes::filters
