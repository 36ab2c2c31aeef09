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

/// What differs between the commands in these options.
struct NeighbourhoodHelp {
  std::optional<std::int64_t> largestSize = std::nullopt;
  std::string background =
      "Value of background pixels (all bands equal it), which enter no window and stay as they "
      "are; none by default";
  std::string mask =
      "Raster of the same size; pixels where it is 0 enter no window and stay as they are";
};

/// Declares the options on a subcommand.
void AddNeighbourhoodOptions(CLI::App& command, NeighbourhoodOptions& options,
                             const NeighbourhoodHelp& help = {});

/// The background value that was asked for, if any. One that the samples cannot hold is none, and
/// is warned about.
std::optional<double> FindBackground(const NeighbourhoodOptions& options,
                                     const RasterSource& source);
/// The same for filters that write it: by default the output's no-data value. Throws `UsageError`
/// where there is neither, and for a value that cannot be written.
double RequireBackground(const NeighbourhoodOptions& options, const RasterSource& source,
                         const NoDataValues& noData);

/// Makes a filter for a window of `size` pixels a side, with a background value or none.
using NeighbourhoodFilterMaker = std::function<std::unique_ptr<processes::filters::IFilter>(
    int size, std::optional<double> background)>;
/// Makes a filter that writes background.
using BackgroundFilterMaker =
    std::function<std::unique_ptr<processes::filters::IFilter>(int size, double background)>;

/// Filters the input file into the output file. Throws `UsageError` and `RunError`.
void RunNeighbourhoodFilter(const NeighbourhoodOptions& options,
                            const NeighbourhoodFilterMaker& makeFilter);
void RunBackgroundFilter(const NeighbourhoodOptions& options,
                         const BackgroundFilterMaker& makeFilter);

}  // namespace zarn::app
