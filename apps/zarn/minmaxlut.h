// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `minmax-lut` to the program.
void AddMinMaxLutCommand(CLI::App& app);

}  // namespace zarn::app
