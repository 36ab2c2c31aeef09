// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `enhance` to the program.
void AddEnhanceCommand(CLI::App& app);

}  // namespace zarn::app
