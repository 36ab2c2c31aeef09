// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `dodge` to the program.
void AddDodgeCommand(CLI::App& app);

}  // namespace zarn::app
