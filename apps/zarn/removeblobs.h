// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `remove-blobs` to the program.
void AddRemoveBlobsCommand(CLI::App& app);

}  // namespace zarn::app
