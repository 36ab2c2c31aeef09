// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <CLI/CLI.hpp>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "apps/zarn/dataset.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/stagedoutput.h"
#include "apps/zarn/windows.h"
#include "processes/filters/framework/ifilter.h"

namespace zarn::app {

/// What the commands share that filter one image: `zarn <command> [options] IN OUT`.
struct ImageFilterOptions {
  std::string input;
  OutputOptions output;
  std::string srcNoData;
  std::string dstNoData;
  std::string mask;
  std::string window;
  std::int64_t memory = 256;  ///< MiB
  int threads = 0;            ///< 0: all
  bool quiet = false;
};

/// Declares IN, OUT and the options on a subcommand; `maskHelp` says what a mask file does here.
void AddImageFilterOptions(CLI::App& command, ImageFilterOptions& options,
                           const std::string& maskHelp);

/// Accepts nothing but digits, within the range; numbers beyond 64 bits saturate when they are
/// converted.
CLI::Validator WholeNumber(std::int64_t least, std::optional<std::int64_t> most);

/// The size that `--window` asks for, if any; throws `UsageError`.
std::optional<WindowSize> ParseWindow(const std::string& text);
/// Throws `UsageError` when the output would replace the mask.
void RefuseMaskAsOutput(const ImageFilterOptions& options);

/// A filter made for one image.
struct FittedFilter {
  std::unique_ptr<processes::filters::IFilter> filter;
  std::int64_t halo = 0;  ///< pixels that it needs around a window on every side
};

/// How a command makes its filter once the image is open.
struct FilterMaker {
  /// A filter of the same kind that needs no halo. It is asked for the image's sample type, which
  /// the filters themselves know best, before anything is written.
  std::function<std::unique_ptr<processes::filters::IFilter>(const RasterSource&)> probe;
  /// The filter that does the work; its no-data values are set by the caller.
  std::function<FittedFilter(const RasterSource&, const NoDataValues&)> fit;
};

/// Filters the input file into the output file. Throws `UsageError` and `RunError`.
void RunImageFilter(const ImageFilterOptions& options, const FilterMaker& maker);

}  // namespace zarn::app
