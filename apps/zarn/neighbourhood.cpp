// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/neighbourhood.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <limits>

#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/nodata.h"

namespace zarn::app {
namespace {

// A window that reaches beyond the image on all sides sees the whole image, as does any larger one.
int ClampedSize(std::int64_t size, const RasterSource& source) {
  const std::int64_t whole = 2 * std::int64_t{std::max(source.Width(), source.Height())} + 1;
  return static_cast<int>(std::min({size, whole, std::int64_t{std::numeric_limits<int>::max()}}));
}

std::optional<double> ParseBackground(const std::string& text, const SampleType& type) {
  if (text.empty() || text == "none") return std::nullopt;
  const double value = ParseNumber("--background", text);
  if (CanHold(type.code, value)) return value;
  Warn("--background " + text + " cannot occur in " + type.Name() +
       " samples and is taken as none");
  return std::nullopt;
}

}  // namespace

void AddNeighbourhoodOptions(CLI::App& command, NeighbourhoodOptions& options) {
  command
      .add_option("--size", options.size,
                  "Side of the window in pixels; an even size acts as the next odd one")
      ->type_name("N")
      ->check(WholeNumber(1, std::nullopt))
      ->capture_default_str();
  command
      .add_option("--background", options.background,
                  "Value of background pixels (all bands equal it), which enter no window and stay "
                  "as they are; none by default")
      ->type_name("V");
  AddImageFilterOptions(
      command, options.image,
      {.maskHelp =
           "Raster of the same size; pixels where it is 0 enter no window and stay as they are"});
}

void RunNeighbourhoodFilter(const NeighbourhoodOptions& options,
                            const NeighbourhoodFilterMaker& makeFilter) {
  RunImageFilter(
      options.image,
      {.probe = [&](const RasterSource&) { return OnWindows(makeFilter(1, std::nullopt), {}); },
       .fit =
           [&](const RasterSource& source, const NoDataValues& noData) {
             const int size = ClampedSize(options.size, source);
             const auto background = ParseBackground(options.background, source.Type());
             return FittedFilter{OnWindows(makeFilter(size, background), noData), size / 2};
           }});
}

}  // namespace zarn::app
