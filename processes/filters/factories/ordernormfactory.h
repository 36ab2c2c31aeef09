// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/factories/ifilterfactory.h"

namespace zarn::processes::filters {

/// Makes order normalisation filters, which leave the pixels as they are.
class ZARN_FILTERS_EXPORT OrderNormFactory : public IFilterFactory {
 public:
  /// The order is kept as it is.
  explicit OrderNormFactory(const unsigned char& order);
  OrderNormFactory(const OrderNormFactory& other);
  OrderNormFactory& operator=(const OrderNormFactory& other);
  ~OrderNormFactory() override;

  IFilter* GetCPUFilter() const override;

 private:
  unsigned char order_;
};

}  // namespace zarn::processes::filters
