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
#include "processes/filters/factories/directcopyrsfactory.h"

namespace zarn::app {
namespace {

struct ShiftOptions {
  ImageFilterOptions image;
  int columns = 0;
  int rows = 0;
};

/// Copies whole pixels. The blocks lie at their places in the image, so the filter itself finds out
/// what they share.
class WholePixels : public PixelMover {
 public:
  WholePixels(const RasterSource& source, int columns, int rows)
      : image_{0, 0, source.Width(), source.Height()},
        columns_(columns),
        rows_(rows),
        filter_(processes::filters::DirectCopyRSFactory(columns, rows).GetCPUFilter()) {}

  void Enter(const Window&) override {}

  Window SourceOf(const Window& part) const override {
    const std::int64_t left = std::max<std::int64_t>(part.x + columns_, 0);
    const std::int64_t top = std::max<std::int64_t>(part.y + rows_, 0);
    const std::int64_t right = std::min(part.x + part.width + columns_, image_.width);
    const std::int64_t bottom = std::min(part.y + part.height + rows_, image_.height);
    if (left >= right || top >= bottom) return {};
    return {left, top, right - left, bottom - top};
  }

  void Move(const gobs::Raster& source, const std::uint8_t* mask, const std::vector<double>& fill,
            gobs::Raster& output, std::uint8_t* covered) override {
    filter_->SetNoDataValues(nullptr, &fill);
    const auto result = filter_->Process(source, output, 0, 0, nullptr);
    if (!result.Ok()) throw RunError("cannot shift: " + result.message);
    const std::int64_t left = std::int64_t{source.OriginX()} - columns_ - output.OriginX();
    const std::int64_t top = std::int64_t{source.OriginY()} - rows_ - output.OriginY();
    for (std::int64_t row = 0; row < output.Height(); ++row) {
      const bool inside = row >= top && row < top + source.Height();
      const std::int64_t first = (row - top) * source.Width() - left;
      for (std::int64_t column = 0; column < output.Width(); ++column) {
        const bool exists = inside && column >= left && column < left + source.Width();
        *covered++ = exists && (mask == nullptr || mask[first + column] != 0) ? 1 : 0;
      }
    }
  }

 private:
  Window image_;
  std::int64_t columns_;
  std::int64_t rows_;
  std::unique_ptr<processes::filters::IFilter> filter_;
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
