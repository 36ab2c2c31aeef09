// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `shift` to the program.
void AddShiftCommand(CLI::App& app);

}  // namespace zarn::app
