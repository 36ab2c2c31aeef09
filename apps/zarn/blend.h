// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <CLI/CLI.hpp>

namespace zarn::app {

/// `zarn blend`: pastes an image into a mosaic along a cutline.
void AddBlendCommand(CLI::App& app);

}  // namespace zarn::app
