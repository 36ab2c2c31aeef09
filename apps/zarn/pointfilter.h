// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "apps/zarn/commandline.h"
#include "apps/zarn/imagefilter.h"

namespace zarn::app {

/// What the commands share that correct each pixel by itself, with parameters from a file.
struct PointFilterOptions {
  ImageFilterOptions image;
  std::string params;
};

/// What such a command tells its users.
struct PointFilterHelp {
  std::string schema;       ///< the form of the parameter file, lines ending in '\n'
  std::string noData;       ///< what becomes of valid pixels with the no-data value
  std::string example;      ///< a command line
  std::string exampleFile;  ///< what --example prints
};

/// Declares IN, OUT and the options on a subcommand, and its footer.
CLI::Option& AddPointFilterOptions(CLI::App& command, PointFilterOptions& options,
                                   const PointFilterHelp& help);

/// The sentence about no-data of filters that keep their results off it.
inline constexpr const char* kNoResultIsNoData = "No corrected pixel becomes the no-data value.";

/// Makes the filter for an image; throws `UsageError` when the parameters do not fit it.
using PointFilterMaker =
    std::function<std::unique_ptr<processes::filters::IFilter>(const RasterSource&)>;
/// Looks at parameters, image and no-data values together, to warn.
using PointFilterCheck = std::function<void(const RasterSource&, const NoDataValues&)>;

/// Filters the input file into the output file. Throws `UsageError` and `RunError`.
void RunPointFilter(const ImageFilterOptions& options, const PointFilterMaker& make,
                    const PointFilterCheck& check = nullptr);

}  // namespace zarn::app
