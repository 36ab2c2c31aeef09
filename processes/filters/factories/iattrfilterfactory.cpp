// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/iattrfilterfactory.h"

namespace zarn::processes::filters {

IAttrFilterFactory::~IAttrFilterFactory() = default;

}  // namespace zarn::processes::filters
