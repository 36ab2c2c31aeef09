// SPDX-License-Identifier: Apache-2.0
#include "host/utils/ibufpostfm.h"

namespace zarn::utils {

IBufPosTfm::~IBufPosTfm() = default;

}  // namespace zarn::utils
