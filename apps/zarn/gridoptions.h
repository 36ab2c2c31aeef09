// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "apps/zarn/outputgrid.h"

namespace zarn::app {

// What `--t-srs`, `--te` and `--tr` ask for.

/// Throws `UsageError` unless all values are finite.
void RequireNumbers(const std::string& option, const std::vector<double>& values);

/// The coordinate system of `--t-srs`; throws `UsageError`.
OGRSpatialReference ParseCrs(const std::string& text);

/// A suggested grid with the extent (left, lower, right, upper) and the pixel size (width, height)
/// that were asked for; either may be empty. Throws `UsageError`.
OutputGrid Adjusted(OutputGrid grid, const std::vector<double>& extent,
                    const std::vector<double>& resolution);

}  // namespace zarn::app
