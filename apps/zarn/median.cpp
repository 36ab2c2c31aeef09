// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/median.h"

#include <CLI/CLI.hpp>
#include <memory>
#include <optional>

#include "apps/zarn/neighbourhood.h"
#include "processes/filters/factories/medianfilterfactory.h"

namespace zarn::app {
namespace {

std::unique_ptr<processes::filters::IFilter> MakeMedianFilter(int size,
                                                              std::optional<double> background) {
  using processes::filters::MedianFilterFactory;
  const MedianFilterFactory factory =
      background ? MedianFilterFactory(size, *background) : MedianFilterFactory(size);
  return std::unique_ptr<processes::filters::IFilter>(factory.GetCPUFilter());
}

}  // namespace

void AddMedianCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "median",
      "Median over a square window; no-data, masked and background pixels enter no median");
  const auto options = std::make_shared<NeighbourhoodOptions>();
  AddNeighbourhoodOptions(command, *options, {.largestSize = 7});
  command.callback([options] { RunNeighbourhoodFilter(*options, MakeMedianFilter); });
  command.footer(
      "The median is a sample of the window as it is, the lower one where two are in the middle; "
      "it may\nequal the no-data value. Pixels that are no-data, NaN, transparent (alpha 0) or "
      "masked are left as\nthey are and enter no median; at the image's edge the window is "
      "clipped.\n\n"
      "Example:\n  zarn median --size 5 radar.tif despeckled.tif");
}

}  // namespace zarn::app
