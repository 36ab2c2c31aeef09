// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/ordernormfactory.h"

#include "processes/filters/normalization/ordernorm.h"

namespace zarn::processes::filters {

OrderNormFactory::OrderNormFactory(const unsigned char& order) : order_(order) {}

OrderNormFactory::OrderNormFactory(const OrderNormFactory& other) = default;
OrderNormFactory& OrderNormFactory::operator=(const OrderNormFactory& other) = default;
OrderNormFactory::~OrderNormFactory() = default;

IFilter* OrderNormFactory::GetCPUFilter() const { return new CPUOrderNorm(order_); }

}  // namespace zarn::processes::filters
