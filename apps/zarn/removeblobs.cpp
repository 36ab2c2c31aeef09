// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/removeblobs.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdint>
#include <cstring>
#include <memory>
#include <utility>
#include <vector>

#include "apps/zarn/neighbourhood.h"
#include "processes/filters/factories/removeblobfactory.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;

std::unique_ptr<filters::IFilter> MakeRemoveBlob(int size, double background) {
  return std::unique_ptr<filters::IFilter>(
      filters::RemoveBlobFactory(size, background).GetCPUFilter());
}

// The filter takes the margins of its block for background. So it gets a larger block around each
// window, as far as two squares reach, of which the middle is kept.
class BlobWindows {
 public:
  BlobWindows(std::unique_ptr<filters::IFilter> filter, std::int64_t half)
      : filter_(std::move(filter)), half_(static_cast<std::uint32_t>(half)) {}

  static std::int64_t Halo(std::int64_t half) { return 3 * half; }

  filters::FilterResult Process(const WindowBlocks& blocks) {
    const gobs::Raster& input = blocks.input;
    const std::uint32_t reach = 2 * half_;
    const std::uint32_t width = input.Width() + 2 * reach;
    const std::uint32_t height = input.Height() + 2 * reach;
    const gobs::Raster larger =
        gobs::Raster::WrapConst(gobs::RasterInfo(width, height, input.Channels(), input.Type(),
                                                 {.marginX = half_, .marginY = half_}),
                                input.Data(), input.DataSize());
    const gobs::RasterInfo filteredInfo(width, height, input.Channels(), input.Type());
    if (filtered_.size() < filteredInfo.DescribedSize()) {
      filtered_ = std::vector<std::byte>(filteredInfo.DescribedSize());
    }
    gobs::Raster filtered(filteredInfo, filtered_.data(), filtered_.size());
    filters::FilterResult result = filter_->Process(larger, filtered, 0, 0, blocks.valid);
    if (!result.Ok()) return result;
    const std::size_t pixelBytes = std::size_t{input.Type().BytesPerSample()} * input.Channels();
    const std::size_t rowBytes = input.Width() * pixelBytes;
    auto* const output = static_cast<std::byte*>(blocks.output.Data());
    for (std::size_t y = 0; y < input.Height(); ++y) {
      std::memcpy(output + y * rowBytes,
                  filtered_.data() + ((y + reach) * width + reach) * pixelBytes, rowBytes);
    }
    return result;
  }

 private:
  std::unique_ptr<filters::IFilter> filter_;
  std::uint32_t half_;
  std::vector<std::byte> filtered_;
};

WindowFilter OnLargerWindows(int size, double background) {
  const auto windows =
      std::make_shared<BlobWindows>(MakeRemoveBlob(size, background), std::int64_t{size / 2});
  return [windows](const WindowBlocks& blocks) { return windows->Process(blocks); };
}

// A square that does not fit into the image fits nowhere, whatever its size.
int ClampedSize(std::int64_t size, const RasterSource& source) {
  const std::int64_t tooLarge = std::int64_t{std::min(source.Width(), source.Height())} + 2;
  return static_cast<int>(std::min(size, tooLarge));
}

void Run(const NeighbourhoodOptions& options) {
  RunImageFilter(options.image,
                 {.probe = [](const RasterSource&) { return OnLargerWindows(1, 0); },
                  .fit =
                      [&](const RasterSource& source, const NoDataValues& noData, nspio::Counter&) {
                        const int size = ClampedSize(options.size, source);
                        FittedFilter fitted;
                        fitted.filter =
                            OnLargerWindows(size, RequireBackground(options, source, noData));
                        fitted.halo = BlobWindows::Halo(size / 2);
                        fitted.filterBytes = source.Channels().size() * source.Type().Bytes();
                        // No-data pixels are not data here: a blob that they
                        // surround is one. The filter compares them exactly.
                        fitted.marksNoData = true;
                        fitted.exactNoData = true;
                        return fitted;
                      }});
}

}  // namespace

void AddRemoveBlobsCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "remove-blobs", "Turns what is smaller than a square, or narrower, into background");
  const auto options = std::make_shared<NeighbourhoodOptions>();
  AddNeighbourhoodOptions(
      command, *options,
      {.background =
           "Value of background pixels (all bands equal it) and of removed ones; by default the "
           "no-data value of OUT, that of --dst-nodata where it is given",
       .mask = "Raster of the same size; pixels where it is 0 are taken for background and stay as "
               "they are"});
  command.callback([options] { Run(*options); });
  command.footer(
      "Data is all that is neither background nor no-data, NaN, transparent (alpha 0), masked or "
      "outside of\nthe image. Of the data those pixels stay that some square of --size pixels a "
      "side covers which fits\ninto the data; all others become background.\n\n"
      "Example:\n  zarn remove-blobs --size 5 --background 0 mask.tif clean.tif");
}

}  // namespace zarn::app
