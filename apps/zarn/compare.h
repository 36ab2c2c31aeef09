// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `compare` to the program.
void AddCompareCommand(CLI::App& app);

}  // namespace zarn::app
