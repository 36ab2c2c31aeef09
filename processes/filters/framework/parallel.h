// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/sys/parallel.h"

namespace zarn::processes::filters {

namespace parallel = sys::parallel;

}  // namespace zarn::processes::filters
