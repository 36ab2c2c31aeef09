// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Sets options of a command from a JSON file: an object whose keys are long names of options
/// without dashes, or of positional arguments in lower case. What the command line gives counts
/// more. Values are strings, numbers, lists of them, and true or false for flags. Throws
/// `UsageError` that names file and key.
void ApplyConfig(const std::string& file, CLI::App& command);

}  // namespace zarn::app
