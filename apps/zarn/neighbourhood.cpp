// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/neighbourhood.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cmath>
#include <limits>

#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/nodata.h"

namespace zarn::app {
namespace {

// A window that reaches beyond the image on all sides sees the whole image, as does any larger one.
int ClampedSize(std::int64_t size, const RasterSource& source) {
  const std::int64_t whole = 2 * std::int64_t{std::max(source.Width(), source.Height())} + 1;
  return static_cast<int>(std::min({size, whole, std::int64_t{std::numeric_limits<int>::max()}}));
}

void Run(const NeighbourhoodOptions& options, const NeighbourhoodFilterMaker& makeFilter,
         const std::function<std::optional<double>(const RasterSource&, const NoDataValues&)>&
             findBackground) {
  RunImageFilter(
      options.image,
      {.probe = [&](const RasterSource&) { return OnWindows(makeFilter(1, 0), {}); },
       .fit =
           [&](const RasterSource& source, const NoDataValues& noData, nspio::Counter&) {
             const int size = ClampedSize(options.size, source);
             const auto background = findBackground(source, noData);
             return FittedFilter{OnWindows(makeFilter(size, background), noData), size / 2};
           }});
}

std::string CannotOccur(const std::string& background, const RasterSource& source) {
  return "--background " + background + " cannot occur in " + source.Type().Name() + " samples";
}

}  // namespace

void AddNeighbourhoodOptions(CLI::App& command, NeighbourhoodOptions& options,
                             const NeighbourhoodHelp& help) {
  command
      .add_option("--size", options.size,
                  "Side of the window in pixels; an even size acts as the next odd one")
      ->type_name("N")
      ->check(WholeNumber(1, help.largestSize))
      ->capture_default_str();
  command.add_option("--background", options.background, help.background)->type_name("V");
  AddImageFilterOptions(command, options.image, {.maskHelp = help.mask});
}

std::optional<double> FindBackground(const NeighbourhoodOptions& options,
                                     const RasterSource& source) {
  const std::string& text = options.background;
  if (text.empty() || text == "none") return std::nullopt;
  const double value = ParseNumber("--background", text);
  if (CanHold(source.Type().code, value)) return value;
  Warn(CannotOccur(text, source) + " and is taken as none");
  return std::nullopt;
}

double RequireBackground(const NeighbourhoodOptions& options, const RasterSource& source,
                         const NoDataValues& noData) {
  const std::string& text = options.background;
  if (text == "none") throw UsageError("--background none: what is removed must become some value");
  if (!text.empty()) {
    const double value = ParseNumber("--background", text);
    if (!CanHold(source.Type().code, value)) throw UsageError(CannotOccur(text, source));
    return value;
  }
  const std::vector<double>& output = noData.output;
  const auto isNaN = [](double value) { return std::isnan(value); };
  if (!output.empty() && std::all_of(output.begin(), output.end(), isNaN)) return output.front();
  if (!output.empty() && std::equal(output.begin() + 1, output.end(), output.begin())) {
    return output.front();
  }
  throw UsageError(std::string("name the value of what is removed with --background: ") +
                   (output.empty() ? "there is no no-data value to take for it"
                                   : "the bands have different no-data values"));
}

void RunNeighbourhoodFilter(const NeighbourhoodOptions& options,
                            const NeighbourhoodFilterMaker& makeFilter) {
  Run(options, makeFilter, [&](const RasterSource& source, const NoDataValues&) {
    return FindBackground(options, source);
  });
}

void RunBackgroundFilter(const NeighbourhoodOptions& options,
                         const BackgroundFilterMaker& makeFilter) {
  Run(
      options,
      [&](int size, std::optional<double> background) { return makeFilter(size, *background); },
      [&](const RasterSource& source, const NoDataValues& noData) {
        return RequireBackground(options, source, noData);
      });
}

}  // namespace zarn::app
