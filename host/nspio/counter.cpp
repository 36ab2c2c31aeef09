// SPDX-License-Identifier: Apache-2.0
#include "host/nspio/counter.h"

namespace zarn::nspio {

Counter::~Counter() = default;

}  // namespace zarn::nspio
