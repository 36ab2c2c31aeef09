// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// `zarn blend`: pastes an image into a mosaic along a cutline.
void AddBlendCommand(CLI::App& app);

}  // namespace zarn::app
