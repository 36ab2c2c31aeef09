// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `fit-dodging` to the program.
void AddFitDodgingCommand(CLI::App& app);

}  // namespace zarn::app
