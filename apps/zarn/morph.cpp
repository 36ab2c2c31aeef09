// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/morph.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "apps/zarn/imagefilter.h"
#include "apps/zarn/kerneloptions.h"
#include "processes/filters/framework/morphology.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;
using Bytes = std::vector<std::uint8_t>;

// With R the matching pixels, D grown and E shrunk:
const std::vector<std::string> kOperations{
    "dilate",    // D(R)
    "erode",     // E(R)
    "open",      // D(E(R))
    "close",     // E(D(R))
    "gradient",  // D(R) without E(R)
    "tophat",    // R without D(E(R))
    "blackhat",  // E(D(R)) without R
};

struct MorphOptions {
  ImageFilterOptions image;
  KernelOptions kernel;
  std::string operation;
  int match = 0;
  std::optional<int> set;
  std::optional<int> background;

  bool HasTwoSteps() const {
    return operation != "dilate" && operation != "erode" && operation != "gradient";
  }
};

// Morphology of one channel of a window. Pixels that are invalid or outside of the image do not
// exist: each step sees them as what changes nothing.
class RegionMorphology {
 public:
  RegionMorphology(std::vector<int> offsets, std::string operation)
      : offsets_(std::move(offsets)), operation_(std::move(operation)) {}

  /// The pixels of the result, 1 or 0, for the pixels of `region`, 1 or 0. `valid` may be null.
  const Bytes& Apply(const Bytes& region, int width, int height, const std::uint8_t* valid) {
    width_ = width;
    height_ = height;
    valid_ = valid;
    current_ = region;
    const auto& op = operation_;
    if (op == "dilate") return Dilate();
    if (op == "erode") return Erode();
    if (op == "open" || op == "tophat") {
      Erode();
      const Bytes& opened = Dilate();
      return op == "open" ? opened : Subtract(region, opened);
    }
    if (op == "close" || op == "blackhat") {
      Dilate();
      const Bytes& closed = Erode();
      return op == "close" ? closed : Subtract(closed, region);
    }
    const Bytes eroded = Erode();
    current_ = region;
    return Subtract(Dilate(), eroded);
  }

 private:
  const Bytes& Dilate() { return Step(filters::MorphDilation, 0); }
  const Bytes& Erode() { return Step(filters::MorphErosion, 1); }

  using Operation = void(const std::uint8_t*, std::uint8_t*, int, int, std::uint8_t,
                         const std::vector<int>&);
  const Bytes& Step(Operation operation, std::uint8_t neutral) {
    if (valid_ != nullptr) {
      for (std::size_t i = 0; i < current_.size(); ++i) {
        current_[i] = valid_[i] == 0 ? neutral : current_[i];
      }
    }
    next_.assign(current_.size(), 0);
    operation(current_.data(), next_.data(), width_, height_, 1, offsets_);
    std::swap(current_, next_);
    return current_;
  }

  const Bytes& Subtract(const Bytes& from, const Bytes& what) {
    next_.resize(from.size());
    for (std::size_t i = 0; i < from.size(); ++i) {
      next_[i] = static_cast<std::uint8_t>(from[i] & ~what[i]);
    }
    return next_;
  }

  std::vector<int> offsets_;
  std::string operation_;
  int width_ = 0;
  int height_ = 0;
  const std::uint8_t* valid_ = nullptr;
  Bytes current_;
  Bytes next_;
};

class MorphFilter {
 public:
  MorphFilter(const MorphOptions& options, const Kernel& kernel)
      : morphology_(Offsets(kernel), options.operation),
        match_(static_cast<std::uint8_t>(options.match)),
        set_(static_cast<std::uint8_t>(options.set.value_or(options.match))),
        background_(
            static_cast<std::uint8_t>(options.background.value_or(options.match == 0 ? 255 : 0))) {}

  filters::FilterResult Process(const WindowBlocks& blocks) {
    const gobs::Raster& input = blocks.input;
    if (gobs::GetDataTypeCode(input) != gobs::NativeDataTypeCode::kUInt8) {
      return filters::FilterResult::Failure("Masks must be Byte.");
    }
    for (std::size_t c = 0; c < input.Channels(); ++c) ProcessChannel(blocks, c);
    return filters::FilterResult::Success();
  }

 private:
  static std::vector<int> Offsets(const Kernel& kernel) {
    std::vector<int> offsets;
    filters::SetupKernelSE(static_cast<float>(kernel.size), offsets, kernel.shape);
    return offsets;
  }

  void ProcessChannel(const WindowBlocks& blocks, std::size_t c) {
    const gobs::Raster& input = blocks.input;
    const auto* const samples = static_cast<const std::uint8_t*>(input.Data()) + c;
    auto* const output = static_cast<std::uint8_t*>(blocks.output.Data()) + c;
    const std::size_t channels = input.Channels();
    const std::size_t fullWidth = input.FullWidth();
    region_.resize(fullWidth * input.FullHeight());
    for (std::size_t i = 0; i < region_.size(); ++i) {
      region_[i] = samples[i * channels] == match_ ? 1 : 0;
    }
    const Bytes& result = morphology_.Apply(region_, static_cast<int>(fullWidth),
                                            static_cast<int>(input.FullHeight()), blocks.valid);
    for (std::size_t y = 0; y < input.Height(); ++y) {
      const std::size_t first = (y + input.MarginY()) * fullWidth + input.MarginX();
      for (std::size_t x = 0; x < input.Width(); ++x) {
        const std::size_t i = first + x;
        if (blocks.valid != nullptr && blocks.valid[i] == 0) continue;
        const std::uint8_t other = region_[i] != 0 ? background_ : samples[i * channels];
        output[(y * input.Width() + x) * channels] = result[i] != 0 ? set_ : other;
      }
    }
  }

  RegionMorphology morphology_;
  std::uint8_t match_;
  std::uint8_t set_;
  std::uint8_t background_;
  Bytes region_;
};

WindowFilter OnWindows(const MorphOptions& options, const Kernel& kernel) {
  return [filter = std::make_shared<MorphFilter>(options, kernel)](const WindowBlocks& blocks) {
    return filter->Process(blocks);
  };
}

void Run(const MorphOptions& options) {
  RunImageFilter(options.image,
                 {.probe =
                      [&](const RasterSource& source) {
                        return OnWindows(options, options.kernel.For(source));
                      },
                  .fit =
                      [&](const RasterSource& source, const NoDataValues&, nspio::Counter&) {
                        const int steps = options.HasTwoSteps() ? 2 : 1;
                        return FittedFilter{OnWindows(options, options.kernel.For(source)),
                                            options.kernel.Halo(source, steps)};
                      },
                  .computes = false});
}

}  // namespace

void AddMorphCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "morph", "Grows, shrinks, opens or closes the region of one value of a byte mask");
  const auto options = std::make_shared<MorphOptions>();
  command
      .add_option("--op", options->operation,
                  "dilate, erode, open, close, gradient, tophat or blackhat, see below")
      ->type_name("NAME")
      ->check(CLI::IsMember(kOperations))
      ->required();
  const auto byte = [&](const char* name, auto& value, const char* description) {
    return command.add_option(name, value, description)->type_name("V")->check(WholeNumber(0, 255));
  };
  byte("--match", options->match, "Value of the region")->required();
  byte("--set", options->set,
       "Value that the pixels of the result get; by default that of --match");
  byte("--background", options->background,
       "Value that pixels of the region get that are not in the result; by default 0, with "
       "--match 0 255");
  AddKernelOptions(command, options->kernel);
  AddImageFilterOptions(
      command, options->image,
      {.maskHelp = "Raster of the same size; pixels where it is 0 do not exist for the region and "
                   "stay as they are",
       .offersNoData = false});
  command.callback([options] { Run(*options); });
  command.footer(
      "The region is the pixels with the value of --match:\n"
      "  dilate    the region and its neighbours under the kernel\n"
      "  erode     the pixels of the region with no neighbour outside of it\n"
      "  open      eroded, then dilated: without parts smaller than the kernel\n"
      "  close     dilated, then eroded: without holes and gaps smaller than the kernel\n"
      "  gradient  the outline: dilated without eroded\n"
      "  tophat    what open removes\n"
      "  blackhat  what close adds\n"
      "Pixels in neither the region nor the result keep their value; bands are treated one by "
      "one.\nBeyond the image's edge there is nothing that could grow into the region or eat it; "
      "the same holds\nfor transparent (alpha 0) and masked pixels. No-data is a value like any "
      "other.\n\n"
      "Examples:\n"
      "  zarn morph --op open --match 255 --size 5 --shape disc mask.tif clean.tif\n"
      "  zarn morph --op gradient --match 255 --set 1 mask.tif outline.tif");
}

}  // namespace zarn::app
