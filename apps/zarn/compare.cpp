// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/compare.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "apps/zarn/anysampletype.h"
#include "apps/zarn/blockreader.h"
#include "apps/zarn/dataset.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/progress.h"

namespace zarn::app {
namespace {

struct CompareOptions {
  std::string reference;
  std::string input;
  std::string srcNoData;
  bool quiet = false;
};

/// Differences of one band, over the pixels that both images have.
struct Differences {
  double sum = 0;
  double squares = 0;
  double largest = 0;

  void Add(double difference) {
    sum += difference;
    squares += difference * difference;
    largest = std::max(largest, std::abs(difference));
  }
};

Window Common(const RasterSource& first, const RasterSource& other, const GridPlace& place) {
  const std::int64_t x = std::max<std::int64_t>(place.column, 0);
  const std::int64_t y = std::max<std::int64_t>(place.row, 0);
  return {x, y, std::min<std::int64_t>(first.Width(), place.column + other.Width()) - x,
          std::min<std::int64_t>(first.Height(), place.row + other.Height()) - y};
}

const std::byte* ValidAt(const WindowBuffers& buffers) {
  return buffers.masked ? buffers.valid.Data() : nullptr;
}

void Compare(const CompareOptions& options) {
  if (options.quiet) SilenceWarnings();
  SetGdalThreads(0);
  const RasterSource reference(options.reference);
  const RasterSource input(options.input);
  RequireComparable(reference, input);
  const GridPlace place = PlaceOnGrid(reference, input);
  const Window area = Common(reference, input, place);
  if (area.width <= 0 || area.height <= 0) {
    throw RunError(input.Name() + " and " + reference.Name() +
                   " have no pixel in common; compare their extents with gdalinfo");
  }
  const NoDataValues referenceNoData{NoDataOf(reference, "--src-nodata", options.srcNoData), {}};
  const NoDataValues inputNoData{NoDataOf(input, "--src-nodata", options.srcNoData), {}};
  BlockReader referenceReader(reference, referenceNoData,
                              {.marksNoData = true, .preparesOutput = false});
  BlockReader inputReader(input, inputNoData, {.marksNoData = true, .preparesOutput = false});
  const std::size_t channels = reference.Channels().size();
  std::vector<Differences> bands(channels);
  std::int64_t common = 0;
  TerminalProgress progress(options.quiet);
  constexpr std::int64_t kPixels = std::int64_t{1} << 22;
  const std::int64_t rows = std::max<std::int64_t>(1, kPixels / area.width);
  WindowBuffers first;
  WindowBuffers second;
  for (std::int64_t y = 0; y < area.height; y += rows) {
    const Window window{area.x, area.y + y, area.width, std::min(rows, area.height - y)};
    referenceReader.Read(window, nullptr, first);
    inputReader.Read({window.x - place.column, window.y - place.row, window.width, window.height},
                     nullptr, second);
    const std::byte* const valid = ValidAt(first);
    const std::byte* const otherValid = ValidAt(second);
    VisitAnySampleType(
        reference.Type().code, [&]<typename T>(std::type_identity<T>, std::size_t parts) {
          const T* a = reinterpret_cast<const T*>(first.samples.Data());
          const T* b = reinterpret_cast<const T*>(second.samples.Data());
          for (std::int64_t i = 0; i < window.width * window.height; ++i) {
            const bool both = (valid == nullptr || valid[i] != std::byte{0}) &&
                              (otherValid == nullptr || otherValid[i] != std::byte{0});
            if (both) {
              ++common;
              for (std::size_t c = 0; c < channels; ++c) {
                bands[c].Add(static_cast<double>(b[c * parts]) - static_cast<double>(a[c * parts]));
              }
            }
            a += channels * parts;
            b += channels * parts;
          }
        });
    progress.Update(static_cast<double>(y + window.height) / static_cast<double>(area.height));
  }
  if (common == 0) {
    throw RunError(input.Name() + " and " + reference.Name() + " have no valid pixel in common");
  }
  std::printf("%s - %s, %lld common pixels\n  band       mean        rms    largest\n",
              input.Name().c_str(), reference.Name().c_str(), static_cast<long long>(common));
  const auto count = static_cast<double>(common);
  for (std::size_t c = 0; c < channels; ++c) {
    std::printf("  %4zu %10.3f %10.3f %10.6g\n", c + 1, bands[c].sum / count,
                std::sqrt(bands[c].squares / count), bands[c].largest);
  }
}

}  // namespace

void AddCompareCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "compare", "How far two images on one pixel grid differ where both have data");
  const auto options = std::make_shared<CompareOptions>();
  command.add_option("REF", options->reference, "Raster to compare with")
      ->type_name("")
      ->required();
  command
      .add_option("IN", options->input, "Raster to compare; it may cover another part of the grid")
      ->type_name("")
      ->required();
  command
      .add_option("--src-nodata", options->srcNoData,
                  "No-data value of both, one for all bands or one for each, or 'none'; by default "
                  "each file's own")
      ->type_name("V[,V...]");
  command.add_flag("-q,--quiet", options->quiet, "No progress and no warnings");
  command.callback([options] { Compare(*options); });
  command.footer(
      "Prints for each band the mean of IN - REF, the root of its mean square and the largest "
      "difference.\n\nExample:\n  zarn compare truth.tif mosaic.tif");
}

}  // namespace zarn::app
