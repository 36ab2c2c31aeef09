// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// `zarn sample`: writes generated scenes to try the other commands on.
void AddSampleCommand(CLI::App& app);

}  // namespace zarn::app
