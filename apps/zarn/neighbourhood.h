// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "apps/zarn/commandline.h"
#include "apps/zarn/imagefilter.h"
#include "processes/filters/framework/ifilter.h"

namespace zarn::app {

/// What the commands of the square-window filters share: `zarn <command> [options] IN OUT`.
struct NeighbourhoodOptions {
  ImageFilterOptions image;
  std::int64_t size = 3;
  std::string background;
};

/// Declares the options on a subcommand.
void AddNeighbourhoodOptions(CLI::App& command, NeighbourhoodOptions& options);

/// Makes a filter for a window of `size` pixels a side, with a background value or none.
using NeighbourhoodFilterMaker = std::function<std::unique_ptr<processes::filters::IFilter>(
    int size, std::optional<double> background)>;

/// Filters the input file into the output file. Throws `UsageError` and `RunError`.
void RunNeighbourhoodFilter(const NeighbourhoodOptions& options,
                            const NeighbourhoodFilterMaker& makeFilter);

}  // namespace zarn::app
