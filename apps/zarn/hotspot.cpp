// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/hotspot.h"

#include <CLI/CLI.hpp>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "apps/zarn/channellist.h"
#include "apps/zarn/parameters.h"
#include "apps/zarn/pointfilter.h"
#include "processes/filters/factories/hotspotnormfactory.h"

namespace zarn::app {
namespace {

struct HotSpots {
  std::vector<std::vector<double>> coefficients;
  std::optional<std::uint32_t> columnDivisor;
  std::optional<std::uint32_t> rowDivisor;
};

HotSpots ReadHotSpots(const std::string& name) {
  const ParameterFile file(name, {"columnDivisor", "rowDivisor"}, {"coefficients"});
  const auto divisor = [&](const char* key) {
    return file.Whole().Has(key) ? std::optional(file.Whole().Count(key)) : std::nullopt;
  };
  HotSpots spots{{}, divisor("columnDivisor"), divisor("rowDivisor")};
  for (const ParameterObject& channel : file.Channels()) {
    spots.coefficients.push_back(channel.Numbers("coefficients", {6}));
  }
  return spots;
}

void Run(const PointFilterOptions& options) {
  const HotSpots spots = ReadHotSpots(options.params);
  RunPointFilter(options.image, [&](const RasterSource& source) {
    const processes::filters::HotSpotNormFactory factory(
        OnePerChannel(source, options.params, "channels", spots.coefficients),
        spots.columnDivisor.value_or(static_cast<std::uint32_t>(source.Width())),
        spots.rowDivisor.value_or(static_cast<std::uint32_t>(source.Height())));
    return std::unique_ptr<processes::filters::IFilter>(factory.GetCPUFilter());
  });
}

}  // namespace

void AddHotSpotCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "hotspot", "Removes a bright spot: subtracts a quadratic surface from each band");
  const auto options = std::make_shared<PointFilterOptions>();
  AddPointFilterOptions(
      command, *options,
      {.schema = "  {\"columnDivisor\": M, \"rowDivisor\": N,\n"
                 "   \"channels\": [{\"coefficients\": [p0, p1, p2, p3, p4, p5]}, ...]}\n"
                 "With x = column / M and y = row / N, counted from 0, a sample loses\n"
                 "  p0 x^2 + p1 x y + p2 y^2 + p3 x + p4 y + p5.\n"
                 "M and N may be left out and are then the width and the height of the image.\n",
       .noData = kNoResultIsNoData,
       .example = "zarn hotspot --params spot.json scene.tif even.tif",
       .exampleFile = "{\n  \"columnDivisor\": 1000,\n  \"rowDivisor\": 800,\n  \"channels\": [\n"
                      "    {\"coefficients\": [-60, 0, -60, 60, 60, 0]}\n  ]\n}\n"})
      .required();
  command.callback([options] { Run(*options); });
}

}  // namespace zarn::app
