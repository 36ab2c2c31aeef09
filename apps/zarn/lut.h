// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "apps/zarn/commandline.h"

namespace zarn::app {

/// Entries of a look-up table, one for each value of a byte.
inline constexpr std::size_t kTableSize = 256;
using LookUpTable = std::vector<std::uint8_t>;

/// A table that brightens the middle tones a little, as the list of a parameter file.
std::string ExampleTable();

/// The tables as the factories take them, which copy them.
std::vector<unsigned char*> PointersTo(std::vector<LookUpTable>& tables);

/// Adds the command `lut` to the program.
void AddLutCommand(CLI::App& app);

}  // namespace zarn::app
