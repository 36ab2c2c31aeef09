// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `segment-filter` to the program.
void AddSegmentFilterCommand(CLI::App& app);

}  // namespace zarn::app
