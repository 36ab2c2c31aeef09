// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `noise` to the program.
void AddNoiseCommand(CLI::App& app);

}  // namespace zarn::app
