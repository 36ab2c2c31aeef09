// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "apps/zarn/commandline.h"
#include "apps/zarn/estimate/gainoffsetnetwork.h"

namespace zarn::app {

/// Declares what the commands share that compare rasters: `--damping` and `--contrast`.
void AddGainLimitOptions(CLI::App& command, GainLimits& limits);

/// `--cell` (0 where not given) and `--src-nodata`.
void AddComparisonOptions(CLI::App& command, int& cell, std::string& srcNoData);

}  // namespace zarn::app
