// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `fit-hotspot` to the program.
void AddFitHotSpotCommand(CLI::App& app);

}  // namespace zarn::app
