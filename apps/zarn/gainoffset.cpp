// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/gainoffset.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cmath>
#include <memory>
#include <string>
#include <vector>

#include "apps/zarn/channellist.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/parameters.h"
#include "apps/zarn/pointfilter.h"
#include "processes/filters/factories/gainoffsetcbfactory.h"

namespace zarn::app {
namespace {

struct GainOffsetOptions : PointFilterOptions {
  std::string gain;
  std::string offset;
};

// A list of factors or summands and what to call it.
struct NumberList {
  std::string name;
  std::string entries;
  std::vector<double> values;

  std::vector<double> For(const RasterSource& source) const {
    return OnePerChannel(source, name, entries, values);
  }
};

struct GainOffsetLists {
  NumberList gains;
  NumberList offsets;
};

NumberList ListOfOption(const std::string& name, const std::string& text, double otherwise) {
  NumberList list{name, "values", {otherwise}};
  if (!text.empty()) list.values = ParseNumbers(name, text);
  const auto isFinite = [](double value) { return std::isfinite(value); };
  if (!std::all_of(list.values.begin(), list.values.end(), isFinite)) {
    throw UsageError(name + ": '" + text + "' has a value that is not finite");
  }
  return list;
}

GainOffsetLists ReadLists(const GainOffsetOptions& options) {
  if (!options.params.empty()) {
    GainOffsetLists lists{{options.params, "channels", {}}, {options.params, "channels", {}}};
    const ParameterFile file(options.params, {}, {"gain", "offset"});
    for (const ParameterObject& channel : file.Channels()) {
      lists.gains.values.push_back(channel.Number("gain"));
      lists.offsets.values.push_back(channel.Number("offset"));
    }
    return lists;
  }
  if (options.gain.empty() && options.offset.empty()) {
    throw UsageError("give --gain, --offset or --params (see zarn gain-offset --help)");
  }
  return {ListOfOption("--gain", options.gain, 1), ListOfOption("--offset", options.offset, 0)};
}

void Run(const GainOffsetOptions& options) {
  const GainOffsetLists lists = ReadLists(options);
  RunPointFilter(options.image, [&](const RasterSource& source) {
    const processes::filters::GainOffsetCBFactory factory(lists.gains.For(source),
                                                          lists.offsets.For(source));
    return std::unique_ptr<processes::filters::IFilter>(factory.GetCPUFilter());
  });
}

}  // namespace

void AddGainOffsetCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "gain-offset", "Brightness and contrast: each band times a gain plus an offset");
  const auto options = std::make_shared<GainOffsetOptions>();
  const auto list = [&](const char* name, std::string& value, const char* type,
                        const char* description) {
    return command.add_option(name, value, description)->type_name(type);
  };
  CLI::Option* const gain = list("--gain", options->gain, "G[,G...]",
                                 "Factor for all bands or one for each; 1 by default");
  CLI::Option* const offset = list("--offset", options->offset, "O[,O...]",
                                   "Summand for all bands or one for each; 0 by default");
  AddPointFilterOptions(
      command, *options,
      {.schema = "  {\"channels\": [{\"gain\": G, \"offset\": O}, ...]}\n",
       .noData = kNoResultIsNoData,
       .example = "zarn gain-offset --gain 1.02,0.98,1 --offset 3 scene.tif balanced.tif",
       .exampleFile = "{\n  \"channels\": [\n    {\"gain\": 1.02, \"offset\": -3.5}\n  ]\n}\n"})
      .excludes(gain)
      ->excludes(offset);
  command.callback([options] { Run(*options); });
}

}  // namespace zarn::app
