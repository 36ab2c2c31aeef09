// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/minmaxlutcbfactory.h"

#include "processes/filters/colorbalance/minmaxlutcb.h"

namespace zarn::processes::filters {

MinMaxLUTCBFactory::MinMaxLUTCBFactory(const std::vector<unsigned char*>& luts,
                                       const std::vector<double>& mins,
                                       const std::vector<double>& maxs)
    : luts_(CopyTables(luts)), mins_(mins), maxs_(maxs) {}

MinMaxLUTCBFactory::MinMaxLUTCBFactory(const MinMaxLUTCBFactory& other) = default;
MinMaxLUTCBFactory& MinMaxLUTCBFactory::operator=(const MinMaxLUTCBFactory& other) = default;
MinMaxLUTCBFactory::~MinMaxLUTCBFactory() = default;

IFilter* MinMaxLUTCBFactory::GetCPUFilter() const {
  return new CPUMinMaxLUTCB(luts_, mins_, maxs_);
}

}  // namespace zarn::processes::filters
