// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/gainoffsetcbfactory.h"

#include "processes/filters/colorbalance/gainoffsetcb.h"

namespace zarn::processes::filters {

GainOffsetCBFactory::GainOffsetCBFactory(const std::vector<double>& gains,
                                         const std::vector<double>& offsets)
    : gains_(gains), offsets_(offsets) {}

GainOffsetCBFactory::GainOffsetCBFactory(const GainOffsetCBFactory& other) = default;
GainOffsetCBFactory& GainOffsetCBFactory::operator=(const GainOffsetCBFactory& other) = default;
GainOffsetCBFactory::~GainOffsetCBFactory() = default;

IFilter* GainOffsetCBFactory::GetCPUFilter() const { return new CPUGainOffsetCB(gains_, offsets_); }

}  // namespace zarn::processes::filters
