// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/polynomial.h"

#include <CLI/CLI.hpp>
#include <memory>
#include <string>
#include <vector>

#include "apps/zarn/channellist.h"
#include "apps/zarn/parameters.h"
#include "apps/zarn/pointfilter.h"
#include "processes/filters/factories/neighborhoodcbfactory.h"

namespace zarn::app {
namespace {

struct Surfaces {
  std::vector<std::vector<double>> coefficients;
  std::vector<double> biases;
};

Surfaces ReadSurfaces(const std::string& name) {
  const ParameterFile file(name, {}, {"bias", "coefficients"});
  Surfaces surfaces;
  std::vector<std::size_t> lengths{2, 4, 7};
  for (const ParameterObject& channel : file.Channels()) {
    surfaces.biases.push_back(channel.Number("bias"));
    surfaces.coefficients.push_back(channel.Numbers("coefficients", lengths));
    // All channels have the degree of the first one.
    lengths = {surfaces.coefficients.front().size()};
  }
  return surfaces;
}

void Run(const PointFilterOptions& options) {
  const Surfaces surfaces = ReadSurfaces(options.params);
  RunPointFilter(options.image, [&](const RasterSource& source) {
    const processes::filters::NeighborhoodCBFactory factory(
        OnePerChannel(source, options.params, "channels", surfaces.coefficients),
        OnePerChannel(source, options.params, "channels", surfaces.biases));
    return std::unique_ptr<processes::filters::IFilter>(factory.GetCPUFilter());
  });
}

}  // namespace

void AddPolynomialCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "polynomial", "Gain that varies over the image as a polynomial of the position");
  const auto options = std::make_shared<PointFilterOptions>();
  AddPointFilterOptions(
      command, *options,
      {.schema =
           "  {\"channels\": [{\"bias\": B, \"coefficients\": [2, 4 or 7 numbers]}, ...]}\n"
           "A sample v in column x and row y of the image, both from 0, becomes with w = v + B\n"
           "  a0 + a1 w\n"
           "  a0 + (a1 + a2 y + a3 x) w\n"
           "  a0 + (a1 + a2 y + a3 x + a4 y^2 + a5 x^2 + a6 x y) w\n"
           "with as many coefficients in all bands.\n",
       .noData = kNoResultIsNoData,
       .example = "zarn polynomial --params falloff.json scene.tif even.tif",
       .exampleFile = "{\n  \"channels\": [\n"
                      "    {\"bias\": 0, \"coefficients\": [0, 0.95, 0.0001, 0.00005]}\n  ]\n}\n"})
      .required();
  command.callback([options] { Run(*options); });
}

}  // namespace zarn::app
