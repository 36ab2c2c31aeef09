// SPDX-License-Identifier: Apache-2.0
#include "host/datasources/basicwriter.h"

namespace zarn::datasources {

BasicWriter::~BasicWriter() = default;

}  // namespace zarn::datasources
