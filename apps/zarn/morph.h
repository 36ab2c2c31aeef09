// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `morph` to the program.
void AddMorphCommand(CLI::App& app);

}  // namespace zarn::app
