// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `median` to the program.
void AddMedianCommand(CLI::App& app);

}  // namespace zarn::app
