// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Adds the command `polynomial` to the program.
void AddPolynomialCommand(CLI::App& app);

}  // namespace zarn::app
