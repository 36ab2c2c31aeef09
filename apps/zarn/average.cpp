// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/average.h"

#include <CLI/CLI.hpp>
#include <memory>
#include <optional>

#include "apps/zarn/neighbourhood.h"
#include "processes/filters/factories/averagefilterfactory.h"

namespace zarn::app {
namespace {

std::unique_ptr<processes::filters::IFilter> MakeAverageFilter(int size,
                                                               std::optional<double> background) {
  using processes::filters::AverageFilterFactory;
  const AverageFilterFactory factory =
      background ? AverageFilterFactory(size, *background) : AverageFilterFactory(size);
  return std::unique_ptr<processes::filters::IFilter>(factory.GetCPUFilter());
}

}  // namespace

void AddAverageCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "average", "Mean over a square window; no-data, masked and background pixels enter no mean");
  const auto options = std::make_shared<NeighbourhoodOptions>();
  AddNeighbourhoodOptions(command, *options);
  command.callback([options] { RunNeighbourhoodFilter(*options, MakeAverageFilter); });
  command.footer(
      "Pixels that are no-data, NaN, transparent (alpha 0) or masked are left as they are and "
      "enter "
      "no mean;\nat the image's edge the window is clipped.\n\n"
      "Example:\n  zarn average --size 5 scene.tif smooth.tif");
}

}  // namespace zarn::app
