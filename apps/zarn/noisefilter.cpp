// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/noisefilter.h"

#include <CLI/CLI.hpp>
#include <memory>

#include "apps/zarn/neighbourhood.h"
#include "processes/filters/factories/noisefilterfactory.h"

namespace zarn::app {

void AddNoiseCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "noise",
      "Turns isolated pixels and samples that are too bright for their window into "
      "background");
  const auto options = std::make_shared<NeighbourhoodOptions>();
  AddNeighbourhoodOptions(
      command, *options,
      {.background =
           "Value that removed samples get. Pixels that have it in all bands enter no window and "
           "stay as they are; by default the no-data value of OUT, that of --dst-nodata where it "
           "is "
           "given"});
  command.callback([options] {
    RunBackgroundFilter(*options, [](int size, double background) {
      return std::unique_ptr<processes::filters::IFilter>(
          processes::filters::NoiseFilterFactory(size, background).GetCPUFilter());
    });
  });
  command.footer(
      "A sample is removed, each band by itself, when its magnitude exceeds the mean of its window "
      "by more\nthan one and a half standard deviations, when nothing else counts in the window, "
      "or "
      "when fewer than\ntwo of the eight pixels around it count. All others stay as they are, dark "
      "ones as well.\nPixels that are no-data, NaN, transparent (alpha 0) or masked are left as "
      "they are and enter no\nwindow; at the image's edge the window is clipped.\n\n"
      "Example:\n  zarn noise --size 5 --background 0 radar.tif clean.tif");
}

}  // namespace zarn::app
