// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/imagefilter.h"

#include <CLI/CLI.hpp>
#include <charconv>
#include <filesystem>
#include <system_error>
#include <utility>

#include "apps/zarn/blockreader.h"
#include "apps/zarn/blockwriter.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/progress.h"
#include "host/core/exception.h"
#include "host/sys/openmp.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;

[[noreturn]] void FailFiltering(const RasterSource& source, const std::string& reason) {
  throw RunError("cannot filter " + source.Name() + ": band " +
                 std::to_string(source.Channels().front()) + " is " + source.Type().Name() + ": " +
                 reason);
}

}  // namespace

void RequireSampleType(const RasterSource& source, const WindowFilter& probe) {
  using enum gobs::NativeDataTypeCode;
  if (source.Type().code == kUnknown || source.Type().code == kNone) {
    FailFiltering(source, "Unknown sample type.");
  }
  // One pixel asks.
  const gobs::RasterInfo pixel(1, 1, 1, source.Type().code);
  gobs::Raster output(pixel);
  filters::FilterResult result;
  try {
    const gobs::Raster input(pixel);
    result = probe({input, output});
  } catch (const Exception& refusal) {
    // Filters that look their type up in a list refuse it in this way.
    result = filters::FilterResult::Failure(refusal.Message());
  }
  if (!result.Ok()) FailFiltering(source, result.message);
}

std::optional<WindowSize> ParseWindow(const std::string& text) {
  if (text.empty()) return std::nullopt;
  WindowSize size;
  const char* const end = text.data() + text.size();
  const auto [cross, error] = std::from_chars(text.data(), end, size.width);
  if (error == std::errc() && cross != end && *cross == 'x') {
    const auto [rest, rowError] = std::from_chars(cross + 1, end, size.height);
    const bool positive = size.width > 0 && size.height > 0;
    if (rowError == std::errc() && rest == end && positive) return size;
  }
  throw UsageError("--window: '" + text + "' is not of the form COLSxROWS, for example 512x256");
}

void RefuseMaskAsOutput(const ImageFilterOptions& options) {
  std::error_code error;
  if (std::filesystem::equivalent(options.mask, options.output.target, error)) {
    throw UsageError("the output " + options.output.target +
                     " is the mask file; name another output");
  }
}

CLI::Validator WholeNumber(std::int64_t least, std::optional<std::int64_t> most) {
  const std::string range = most ? " from " + std::to_string(least) + " to " + std::to_string(*most)
                                 : " of at least " + std::to_string(least);
  return CLI::Validator(
      [=](const std::string& text) {
        const bool digits = text.find_first_not_of("0123456789") == std::string::npos;
        const double value = digits && !text.empty() ? std::stod(text) : -1;
        const bool inRange =
            value >= static_cast<double>(least) && (!most || value <= static_cast<double>(*most));
        return inRange ? std::string() : "'" + text + "' is not a whole number" + range;
      },
      "");
}

void AddWorkOptions(CLI::App& command, WorkOptions& options, const std::string& image) {
  const auto number = [&](const char* name, auto& value, const char* type, std::int64_t least,
                          std::optional<std::int64_t> most, const char* description) {
    command.add_option(name, value, description)
        ->type_name(type)
        ->check(WholeNumber(least, most))
        ->capture_default_str();
  };
  number("--threads", options.threads, "N", 0, 4096,
         "Threads for filtering and for compression each; 0 means all");
  number("--memory", options.memory, "MIB", 1, std::int64_t{1} << 30,
         "Memory for the windows in work");
  command
      .add_option("--window", options.window,
                  "Size of the pieces in which " + image +
                      " is worked through, instead of choosing it; the result does not depend on "
                      "it")
      ->type_name("COLSxROWS");
  command.add_flag("-q,--quiet", options.quiet, "No progress and no warnings");
}

void AddImageFilterOptions(CLI::App& command, ImageFilterOptions& options,
                           const ImageFilterHelp& help) {
  const auto text = [&](const char* name, auto& value, const char* type,
                        const std::string& description) {
    return command.add_option(name, value, description)->type_name(type);
  };
  text("IN", options.input, "", "Raster to filter: anything that GDAL reads")->required();
  text("OUT", options.output.target, "", "Raster to write")->required();
  if (help.offersNoData) {
    text("--src-nodata", options.srcNoData, "V[,V...]",
         "No-data value of IN, one for all bands or one for each, or 'none'; by default the file's "
         "own");
    text("--dst-nodata", options.dstNoData, "V[,V...]",
         "No-data value of OUT, given to every invalid pixel, or 'none'; by default that of IN");
  }
  if (!help.maskHelp.empty()) {
    text(help.maskOption.c_str(), options.mask, "FILE", help.maskHelp);
  }
  text("--of", options.output.format, "FORMAT",
       "GDAL format of OUT; by default by its extension, else GTiff");
  text("--co", options.output.creation, "KEY=VALUE",
       "Creation option of the format, repeatable; GTiff is by default tiled and compressed "
       "(DEFLATE)")
      ->allow_extra_args(false);
  command.add_flag("--overwrite", options.output.overwrite, "Replace OUT if it exists");
  AddWorkOptions(command, options, "IN");
}

WindowFilter OnWindows(std::unique_ptr<filters::IFilter> filter, const NoDataValues& noData) {
  filter->SetNoDataValues(&noData.input, &noData.output);
  return
      [owned = std::shared_ptr<filters::IFilter>(std::move(filter))](const WindowBlocks& blocks) {
        return owned->Process(blocks.input, blocks.output, blocks.input.OriginX(),
                              blocks.input.OriginY(), blocks.valid);
      };
}

void RunImageFilter(const ImageFilterOptions& options, const FilterMaker& maker) {
  if (options.quiet) SilenceWarnings();
  SetGdalThreads(options.threads);
  const std::optional<WindowSize> forcedWindow = ParseWindow(options.window);

  const RasterSource source(options.input);
  if (maker.computes) source.RefusePalette();
  RequireSampleType(source, maker.probe(source));
  NoDataValues noData = ResolveNoData(source, options.srcNoData, options.dstNoData);
  if (!maker.computes) noData.input.clear();
  std::optional<MaskFile> mask;
  if (!options.mask.empty()) {
    mask.emplace(options.mask, source);
    RefuseMaskAsOutput(options);
  }

  // First, because fitting may read the whole image.
  StagedOutput output(options.output, source, noData.output);
  const sys::OMPThreadCount threads(sys::OMPThreadsFor(options.threads));
  TerminalProgress progress(options.quiet);
  const double filtered = output.CopiesAtTheEnd() ? 0.5 : 0.99;
  ProgressSpan fitting(progress, 0, maker.fittingShare * filtered);
  ProgressSpan filtering(progress, maker.fittingShare * filtered, filtered);
  ProgressSpan publishing(progress, filtered, 1);
  const FittedFilter fitted = maker.fit(source, noData, fitting);
  BlockReader reader(source, noData,
                     {.halo = fitted.halo,
                      .mask = mask ? &*mask : nullptr,
                      .labels = fitted.labels.get(),
                      .outputMask = fitted.outputMask.get(),
                      .marksNoData = fitted.marksNoData,
                      .exactNoData = fitted.exactNoData,
                      .protectsInvalid = fitted.protectsInvalid});
  BlockWriter writer(source, output.Dataset(), output.Name());
  int blockWidth = 1;
  int blockHeight = 1;
  output.Dataset().GetRasterBand(1)->GetBlockSize(&blockWidth, &blockHeight);
  const WindowPlan plan(
      {.image = {source.Width(), source.Height()},
       .outputBlock = {blockWidth, blockHeight},
       .halo = fitted.halo,
       .sampleBytes = reader.SampleBytes(),
       // Only one window is filtered at a time.
       .sideBytes = reader.SideBytes() + (fitted.filterBytes + kStreamSlots - 1) / kStreamSlots,
       .slots = kStreamSlots,
       .memory = static_cast<std::size_t>(options.memory) << 20,
       .forced = forcedWindow});
  FitBlockCache(source, plan, fitted.halo);

  StreamWindows(
      source, plan, reader,
      [&](const WindowBlocks& blocks) {
        const filters::FilterResult result = fitted.filter(blocks);
        if (!result.Ok()) FailFiltering(source, result.message);
      },
      writer, filtering);
  output.Publish(publishing);
}

}  // namespace zarn::app
