// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `hotspot` to the program.
void AddHotSpotCommand(CLI::App& app);

}  // namespace zarn::app
