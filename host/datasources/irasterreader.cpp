// SPDX-License-Identifier: Apache-2.0
#include "host/datasources/irasterreader.h"

namespace zarn::datasources {

IRasterReader::~IRasterReader() = default;

}  // namespace zarn::datasources
