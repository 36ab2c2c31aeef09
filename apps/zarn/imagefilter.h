// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "apps/zarn/commandline.h"
#include "apps/zarn/dataset.h"
#include "apps/zarn/labelfile.h"
#include "apps/zarn/maskfile.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/stagedoutput.h"
#include "apps/zarn/streamer.h"
#include "apps/zarn/windows.h"
#include "host/nspio/counter.h"
#include "processes/filters/framework/filterresult.h"
#include "processes/filters/framework/ifilter.h"

namespace zarn::app {

/// How the commands work that take a raster through memory in windows.
struct WorkOptions {
  std::string window;
  std::int64_t memory = 256;  ///< MiB
  int threads = 0;            ///< 0: all
  bool quiet = false;
};

/// What the commands share that filter one image: `zarn <command> [options] IN OUT`.
struct ImageFilterOptions : WorkOptions {
  std::string input;
  OutputOptions output;
  std::string srcNoData;
  std::string dstNoData;
  std::string mask;
};

/// What differs between commands in the options that they share.
struct ImageFilterHelp {
  std::string maskHelp;  ///< what a mask file does here; empty: there is none
  std::string maskOption = "--mask";
  bool offersNoData = true;  ///< whether the command knows of no-data values
};

/// Declares the options on a subcommand; `image` is what their help calls the raster.
void AddWorkOptions(CLI::App& command, WorkOptions& options, const std::string& image);

/// Declares IN, OUT and the options on a subcommand.
void AddImageFilterOptions(CLI::App& command, ImageFilterOptions& options,
                           const ImageFilterHelp& help);

/// Accepts nothing but digits, within the range; numbers beyond 64 bits saturate when they are
/// converted.
CLI::Validator WholeNumber(std::int64_t least, std::optional<std::int64_t> most);

/// Filters one window; a failure of the data comes back as its result.
using WindowFilter = std::function<processes::filters::FilterResult(const WindowBlocks& blocks)>;

/// A filter of the library that works on one block alone, with the no-data values given.
WindowFilter OnWindows(std::unique_ptr<processes::filters::IFilter> filter,
                       const NoDataValues& noData);

/// Throws `RunError` unless `probe`, which needs no halo and no labels, handles the sample type of
/// `source`: the filters themselves know best.
void RequireSampleType(const RasterSource& source, const WindowFilter& probe);

/// The size that `--window` asks for, if any; throws `UsageError`.
std::optional<WindowSize> ParseWindow(const std::string& text);
/// Throws `UsageError` when the output would replace the mask.
void RefuseMaskAsOutput(const ImageFilterOptions& options);

/// A filter made for one image.
struct FittedFilter {
  WindowFilter filter;
  std::int64_t halo = 0;  ///< pixels that it needs around a window on every side
  std::unique_ptr<LabelFile> labels = nullptr;     ///< read beside the image, or null
  std::unique_ptr<MaskFile> outputMask = nullptr;  ///< names pixels to be left alone, or null
  std::size_t filterBytes = 0;   ///< what the filter itself holds for each pixel of a block
  bool marksNoData = false;      ///< as `BlockRequest` has it
  bool exactNoData = false;      ///< as `BlockRequest` has it
  bool protectsInvalid = false;  ///< as `BlockRequest` has it
};

/// How a command makes its filter once the image is open.
struct FilterMaker {
  /// A filter of the same kind that needs no halo and no labels. It is asked for the image's sample
  /// type, which the filters themselves know best, before anything is written.
  std::function<WindowFilter(const RasterSource&)> probe;
  /// The filter that does the work; tells how far it is if `fittingShare` is above 0.
  std::function<FittedFilter(const RasterSource&, const NoDataValues&, nspio::Counter&)> fit;
  /// Whether the filter computes with samples as amounts. Else a palette is no hindrance, and
  /// no-data values are values like all others; the output declares those of the input.
  bool computes = true;
  /// What fitting takes of the time that it and the filtering take together.
  double fittingShare = 0;
};

/// Filters the input file into the output file. Throws `UsageError` and `RunError`.
void RunImageFilter(const ImageFilterOptions& options, const FilterMaker& maker);

}  // namespace zarn::app
