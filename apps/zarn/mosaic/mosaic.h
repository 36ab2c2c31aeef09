// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `mosaic` with its parts `plan`, `run` and `finish` to the program.
void AddMosaicCommand(CLI::App& app);

}  // namespace zarn::app
