// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/lutcbfactory.h"

#include "processes/filters/colorbalance/lutcb.h"

namespace zarn::processes::filters {

LUTCBFactory::LUTCBFactory(const std::vector<unsigned char*>& luts) : luts_(CopyTables(luts)) {}

LUTCBFactory::LUTCBFactory(const LUTCBFactory& other) = default;
LUTCBFactory& LUTCBFactory::operator=(const LUTCBFactory& other) = default;
LUTCBFactory::~LUTCBFactory() = default;

IFilter* LUTCBFactory::GetCPUFilter() const { return new CPULUTCB(luts_); }

}  // namespace zarn::processes::filters
