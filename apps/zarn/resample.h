// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `resample` to the program.
void AddResampleCommand(CLI::App& app);

}  // namespace zarn::app
