// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/shift.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/regrid.h"
#include "apps/zarn/wholepixels.h"

namespace zarn::app {
namespace {

struct ShiftOptions {
  ImageFilterOptions image;
  int columns = 0;
  int rows = 0;
};

Regridding Fit(const ShiftOptions& options, const RasterSource& source) {
  return {std::nullopt,
          [&] { return std::make_unique<WholePixels>(source, options.columns, options.rows); }, 0};
}

}  // namespace

void AddShiftCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand("shift", "Move an image on its grid by whole pixels");
  const auto options = std::make_shared<ShiftOptions>();
  command
      .add_option(
          "--dx", options->columns,
          "Pixel (x, y) of OUT is pixel (x + N, y) of IN: the image moves N columns to the left")
      ->type_name("N")
      ->capture_default_str();
  command
      .add_option("--dy", options->rows,
                  "Pixel (x, y) of OUT is pixel (x, y + N) of IN: it moves N rows up")
      ->type_name("N")
      ->capture_default_str();
  AddImageFilterOptions(command, options->image, {});
  command.callback([options] {
    RunRegridding(options->image,
                  [&](const RasterSource& source) { return Fit(*options, source); });
  });
  command.footer(
      "Grid and georeference stay. What no pixel moves to becomes the no-data value of OUT, or "
      "transparent, or is marked in a mask band where there is neither.\n\n"
      "Example:\n  zarn shift --dx 3 --dy -2 scene.tif moved.tif");
}

}  // namespace zarn::app
