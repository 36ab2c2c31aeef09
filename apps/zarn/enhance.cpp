// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/enhance.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "apps/zarn/enhancement/classfile.h"
#include "apps/zarn/enhancement/curvefield.h"
#include "apps/zarn/enhancement/sourcereader.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/imagefilter.h"
#include "apps/zarn/stagingfolder.h"
#include "host/core/exception.h"
#include "host/nspio/counter.h"
#include "processes/filters/enhancement/glut.h"
#include "processes/filters/enhancement/trimmethod.h"
#include "processes/filters/framework/nodata.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;
namespace fs = std::filesystem;
using MatrixPtr = std::unique_ptr<filters::IGeoLUTMatrix>;

struct EnhanceOptions {
  ImageFilterOptions image;
  std::int64_t tileSize = 128;
  double power = 1;
  std::string trim = "percentage";
  std::string left;
  std::string right;
  std::string maxGain;
  std::string diagnostic;
  bool noInterpolate = false;
};

double TrimOption(const char* name, const std::string& text, bool isPercentage) {
  if (text.empty()) return isPercentage ? 0.02 : 2.0;
  const double value = ParseNumber(name, text);
  const bool isUsable = isPercentage ? value >= 0 && value < 1 : value >= 0 && value <= 1000;
  if (isUsable) return value;
  throw UsageError(std::string(name) + " " + text + " is not " +
                   (isPercentage ? "a share of the pixels from 0 to below 1"
                                 : "a number of standard deviations from 0 to 1000"));
}

int CellsAlong(int pixels, std::int64_t tile) {
  return static_cast<int>((pixels + tile - 1) / tile);
}

filters::GLUTParameters ParametersFor(const EnhanceOptions& options, const RasterSource& source) {
  const bool isPercentage = options.trim == "percentage";
  // A tile that reaches from edge to edge is as good as any longer one.
  const auto width =
      static_cast<std::int32_t>(std::min<std::int64_t>(options.tileSize, source.Width()));
  const auto height =
      static_cast<std::int32_t>(std::min<std::int64_t>(options.tileSize, source.Height()));
  return {.trimMethod = static_cast<std::int32_t>(isPercentage ? filters::TrimMethod::kPercentage
                                                               : filters::TrimMethod::kMeanNSigma),
          .tileWidth = width,
          .tileHeight = height,
          .gridRows = CellsAlong(source.Height(), height),
          .gridColumns = CellsAlong(source.Width(), width),
          .channelCount = static_cast<std::int32_t>(source.Channels().size()),
          .leftTrim = TrimOption("--left", options.left, isPercentage),
          .rightTrim = TrimOption("--right", options.right, isPercentage),
          .power = static_cast<float>(options.power),
          .pixelDepth = static_cast<std::int32_t>(8 * source.Type().Bytes())};
}

std::vector<float> MaxGains(const EnhanceOptions& options, std::size_t channels) {
  std::vector<double> given = ParseNumbers("--max-gain", options.maxGain);
  if (given.size() == 1) given.resize(channels, given.front());
  if (given.size() != channels) {
    throw UsageError("--max-gain has " + std::to_string(given.size()) +
                     " values; give one for all bands or one for each of the " +
                     std::to_string(channels));
  }
  for (const double gain : given) {
    if (!(gain > 0)) throw UsageError("--max-gain " + options.maxGain + " is not above 0");
  }
  return {given.begin(), given.end()};
}

MatrixPtr MakeMatrix(const EnhanceOptions& options, const RasterSource& source,
                     const NoDataValues& noData, const StagingFolder* diagnostic,
                     nspio::Counter& progress) {
  std::vector<float> maxGains;
  if (!options.maxGain.empty()) maxGains = MaxGains(options, source.Channels().size());
  MatrixPtr matrix(filters::GLUT::GetGLUTMatrix(ParametersFor(options, source)));
  if (!matrix) throw RunError("--tile-size makes too many tiles; give a larger one");
  std::optional<MaskFile> mask;
  if (!options.image.mask.empty()) mask.emplace(options.image.mask, source);
  SourceReader reader(source, noData, mask ? &*mask : nullptr);
  matrix->SetHostData(&progress);
  matrix->LoadFromImage(reader);
  matrix->SetHostData(nullptr);
  if (!maxGains.empty()) matrix->ValidateMaxGain(maxGains.data());
  matrix->Clean({.globalFilter = true, .localFilter = true});
  if (diagnostic != nullptr) {
    ClassFile classes(*diagnostic, source);
    matrix->WriteDiagnosticRaster(classes, nullptr, reader.Auxiliary().geocoding);
  }
  try {
    matrix->InterpolateCells(true);
  } catch (const DataException&) {
    throw RunError("no tile of " + source.Name() +
                   " can be stretched: all are without valid pixels, of one level, or above "
                   "--max-gain");
  }
  return matrix;
}

template <typename T>
WindowFilter EnhanceWindows(const filters::IGeoLUTMatrix& matrix, const EnhanceOptions& options,
                            const NoDataValues& noData) {
  return [field = std::make_shared<CurveField<T>>(
              matrix, options.noInterpolate ? CellBlending::kNone : CellBlending::kBilinear),
          output = filters::ConvertNoData<T>(noData.output)](const WindowBlocks& blocks) {
    field->Apply(blocks.input, blocks.valid, output.empty() ? nullptr : output.data(),
                 blocks.output);
    return filters::FilterResult::Success();
  };
}

filters::FilterResult RequireBytesOrWords(const WindowBlocks& blocks) {
  using enum gobs::NativeDataTypeCode;
  const gobs::NativeDataTypeCode code = gobs::GetDataTypeCode(blocks.input);
  if (code == kUInt8 || code == kUInt16) return filters::FilterResult::Success();
  return filters::FilterResult::Failure(
      "only unsigned integers of 8 and 16 bits have levels to stretch");
}

// By any spelling, and whether it exists or not.
bool IsSameFile(const fs::path& a, const fs::path& b) {
  std::error_code error;
  return fs::equivalent(a, b, error) ||
         fs::weakly_canonical(a, error) == fs::weakly_canonical(b, error);
}

void Run(const EnhanceOptions& options) {
  std::optional<StagingFolder> diagnostic;
  if (!options.diagnostic.empty()) {
    for (const std::string& name :
         {options.image.input, options.image.output.target, options.image.mask}) {
      if (!name.empty() && IsSameFile(options.diagnostic, name)) {
        throw UsageError("--diagnostic " + options.diagnostic + " is " + name +
                         "; name another file");
      }
    }
    diagnostic.emplace(options.diagnostic, options.image.output.overwrite);
  }
  RunImageFilter(
      options.image,
      {.probe = [](const RasterSource&) { return RequireBytesOrWords; },
       .fit =
           [&](const RasterSource& source, const NoDataValues& noData, nspio::Counter& progress) {
             const MatrixPtr matrix =
                 MakeMatrix(options, source, noData, diagnostic ? &*diagnostic : nullptr, progress);
             FittedFilter fitted;
             fitted.filter = source.Type().Bytes() == 1
                                 ? EnhanceWindows<std::uint8_t>(*matrix, options, noData)
                                 : EnhanceWindows<std::uint16_t>(*matrix, options, noData);
             fitted.marksNoData = true;
             return fitted;
           },
       .fittingShare = 0.4});
  if (diagnostic) diagnostic->Publish();
}

}  // namespace

void AddEnhanceCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "enhance", "Local contrast: stretches every tile to the full range of grey levels");
  const auto options = std::make_shared<EnhanceOptions>();
  command.add_option("--tile-size", options->tileSize, "Side of a tile in pixels")
      ->type_name("N")
      ->check(WholeNumber(2, 4096))
      ->capture_default_str();
  command
      .add_option(
          "--power", options->power,
          "Exponent of the stretch: below 1 brightens the dark levels, above 1 darkens them")
      ->type_name("P")
      ->check(CLI::Validator(
          [](const std::string& text) {
            const double power = ParseNumber("--power", text);
            const bool isInRange = power >= 0.05 && power <= 5;  // not so for NaN
            return isInRange ? std::string() : "'" + text + "' is not from 0.05 to 5";
          },
          ""))
      ->capture_default_str();
  command
      .add_option("--trim", options->trim,
                  "How the ends of a tile's histogram are cut off: percentage (shares of its "
                  "pixels) or sigma (standard deviations from its mean)")
      ->type_name("METHOD")
      ->check(CLI::IsMember({"percentage", "sigma"}))
      ->capture_default_str();
  command
      .add_option(
          "--left", options->left,
          "What becomes black: a share of the pixels (0.02 by default), or deviations below "
          "the mean (2)")
      ->type_name("X");
  command
      .add_option(
          "--right", options->right,
          "What becomes white: a share of the pixels (0.02 by default), or deviations above "
          "the mean (2)")
      ->type_name("X");
  command
      .add_option("--max-gain", options->maxGain,
                  "Tiles with a gain above G take the stretch of the tiles around them; one for "
                  "all bands or one for each")
      ->type_name("G[,G...]");
  command
      .add_option("--diagnostic", options->diagnostic,
                  "GeoTIFF to write with a pixel for each tile: valid, invalid, no data or masked")
      ->type_name("FILE");
  command.add_flag("--no-interpolate", options->noInterpolate,
                   "Stretch every tile by itself, which shows the edges of the tiles");
  AddImageFilterOptions(command, options->image,
                        {.maskHelp = "Raster of the same size; pixels where it is 0 enter no "
                                     "histogram and stay as they are"});
  command.callback([options] { Run(*options); });
  command.footer(
      "The levels of a tile are stretched as gain * (level - offset)^power, from black at the "
      "trimmed low end of its\nhistogram to white at the high end, and pixels between the centres "
      "of four tiles take the mean of what the four\nmake of them, by their distances. Tiles that "
      "are flat, have too few valid pixels or differ greatly from those\naround them take the "
      "stretch of their neighbours. For bytes and unsigned 16-bit samples, which are stretched "
      "to\n255 and 65535.\n\n"
      "Pixels that are no-data, transparent (alpha 0) or masked enter no histogram and stay as "
      "they are; no enhanced\npixel becomes the no-data value.\n\n"
      "Example:\n  zarn enhance --tile-size 128 --power 0.7 scene.tif enhanced.tif");
}

}  // namespace zarn::app
