// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/enhancement/igeolutmatrix.h"

namespace zarn::processes::filters {

IGeoLUTMatrix::~IGeoLUTMatrix() = default;

}  // namespace zarn::processes::filters
