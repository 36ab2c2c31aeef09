// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `average` to the program.
void AddAverageCommand(CLI::App& app);

}  // namespace zarn::app
