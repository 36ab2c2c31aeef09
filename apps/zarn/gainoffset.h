// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `gain-offset` to the program.
void AddGainOffsetCommand(CLI::App& app);

}  // namespace zarn::app
