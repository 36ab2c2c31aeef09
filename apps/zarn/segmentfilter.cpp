// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/segmentfilter.h"

#include <CLI/CLI.hpp>
#include <memory>
#include <string>
#include <utility>

#include "apps/zarn/errors.h"
#include "apps/zarn/imagefilter.h"
#include "apps/zarn/kerneloptions.h"
#include "apps/zarn/nodata.h"
#include "processes/filters/attribute/iattributefilter.h"
#include "processes/filters/factories/attrfilterfactory.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;

struct SegmentFilterOptions {
  ImageFilterOptions image;  ///< its mask is the input mask
  KernelOptions kernel;
  std::string statistic;
  std::string labels;
  double labelTolerance = 0;
  std::string labelNoData;
  std::string outputMask;
  bool fill = false;
};

using FilterPtr = std::unique_ptr<filters::IAttributeFilter>;

constexpr Kernel kOnePixel{1, filters::KernelShape::kSquare};

FilterPtr MakeFilter(const SegmentFilterOptions& options, const Kernel& kernel) {
  const filters::FILTERALGO algorithm = options.statistic == "mean" ? filters::FILTERALGO::kAverage
                                        : options.statistic == "median"
                                            ? filters::FILTERALGO::kMedian
                                            : filters::FILTERALGO::kTrimmedMean;
  const filters::AttrFilterFactory factory(kernel.size, kernel.shape);
  return FilterPtr(factory.GetFilter(algorithm));
}

// No-data pixels are among the invalid ones of a window, whatever their channels' values are.
WindowFilter OnWindows(FilterPtr filter) {
  return [owned = std::shared_ptr<filters::IAttributeFilter>(std::move(filter))](
             const WindowBlocks& blocks) {
    if (blocks.labels == nullptr) {
      return owned->Process(blocks.input, blocks.output, blocks.valid, blocks.writable);
    }
    return owned->ProcessWithAttributes(blocks.input, *blocks.labels, blocks.output, 1,
                                        blocks.valid, blocks.writable);
  };
}

// The filter itself knows its types of labels; one pixel asks it.
void RequireLabelType(const SegmentFilterOptions& options, const LabelFile& labels) {
  const FilterPtr probe = MakeFilter(options, kOnePixel);
  probe->useAttributes = true;
  const gobs::Raster label(gobs::RasterInfo(1, 1, 1, labels.Type()));
  const gobs::Raster input(gobs::RasterInfo(1, 1, 1, gobs::NativeDataTypeCode::kUInt8));
  gobs::Raster output(gobs::RasterInfo(1, 1, 1, gobs::NativeDataTypeCode::kUInt8));
  const filters::FilterResult result =
      probe->ProcessWithAttributes(input, label, output, 1, nullptr, nullptr);
  if (!result.Ok())
    throw RunError("cannot use the labels " + labels.Name() + ": " + result.message);
}

FittedFilter FitFilter(const SegmentFilterOptions& options, const RasterSource& source) {
  FittedFilter fitted;
  FilterPtr filter = MakeFilter(options, options.kernel.For(source));
  if (!options.labels.empty()) {
    fitted.labels = std::make_unique<LabelFile>(
        options.labels, source, options.labelNoData,
        options.labelTolerance > 0 ? LabelComparison::kDifference : LabelComparison::kEquality);
    RequireLabelType(options, *fitted.labels);
    filter->useAttributes = true;
    filter->attrNoDataValue = fitted.labels->NoData();
    filter->attrTolerance = options.labelTolerance;
  }
  if (!options.outputMask.empty()) {
    fitted.outputMask = std::make_unique<MaskFile>(options.outputMask, source);
  }
  fitted.filter = OnWindows(std::move(filter));
  fitted.halo = options.kernel.Halo(source, 1);
  fitted.marksNoData = true;
  fitted.protectsInvalid = !options.fill;
  return fitted;
}

void Run(const SegmentFilterOptions& options) {
  RunImageFilter(
      options.image,
      {.probe = [&](const RasterSource&) { return OnWindows(MakeFilter(options, kOnePixel)); },
       .fit = [&](const RasterSource& source, const NoDataValues&,
                  nspio::Counter&) { return FitFilter(options, source); }});
}

}  // namespace

void AddSegmentFilterCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "segment-filter", "Mean, median or trimmed mean over the neighbours within the same segment");
  const auto options = std::make_shared<SegmentFilterOptions>();
  command
      .add_option("--statistic", options->statistic,
                  "What becomes of the neighbours: mean, median (the lower one of two) or "
                  "trimmed-mean (without the lowest and the highest quarter)")
      ->type_name("NAME")
      ->check(CLI::IsMember({"mean", "median", "trimmed-mean"}))
      ->required();
  AddKernelOptions(command, options->kernel);
  CLI::Option* const labels =
      command
          .add_option("--labels", options->labels,
                      "Raster of one band with the segment or class of each pixel, on the grid of "
                      "IN or coarser by a whole number; without it all pixels are of one segment")
          ->type_name("FILE");
  command
      .add_option(
          "--label-tolerance", options->labelTolerance,
          "Neighbours whose label is up to V larger or smaller count as of the same segment")
      ->type_name("V")
      ->check(CLI::Validator(
          [](const std::string& text) {
            const bool isPositive = ParseNumber("--label-tolerance", text) >= 0;  // not so for NaN
            return isPositive ? std::string() : "'" + text + "' is not at least 0";
          },
          ""))
      ->capture_default_str()
      ->needs(labels);
  command
      .add_option("--label-nodata", options->labelNoData,
                  "Label of pixels without one, which belong to every segment, or 'none'; by "
                  "default the no-data value of the labels")
      ->type_name("V")
      ->needs(labels);
  AddImageFilterOptions(command, options->image,
                        {.maskHelp = "Raster of the same size; pixels where it is 0 enter no "
                                     "statistic, like no-data",
                         .maskOption = "--input-mask"});
  command
      .add_option("--output-mask", options->outputMask,
                  "Raster of the same size; pixels where it is 0 stay as they are")
      ->type_name("FILE");
  command.add_flag("--fill", options->fill,
                   "Write pixels that are no-data, NaN, transparent or masked as well, from their "
                   "neighbours");
  command.callback([options] { Run(*options); });
  command.footer(
      "Pixels that are no-data, NaN, transparent (alpha 0) or masked enter no statistic, and stay "
      "as they are\nwithout --fill; at the image's edge the kernel is clipped. Means of integers "
      "lose their fraction.\n\n"
      "Examples:\n"
      "  zarn segment-filter --statistic median --size 5 --labels segments.tif scene.tif "
      "smooth.tif\n"
      "  zarn segment-filter --statistic mean --labels classes.tif --label-tolerance 2 scene.tif "
      "smooth.tif");
}

}  // namespace zarn::app
