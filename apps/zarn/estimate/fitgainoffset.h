// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `fit-gain-offset` to the program.
void AddFitGainOffsetCommand(CLI::App& app);

}  // namespace zarn::app
