// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/dodge.h"

#include <CLI/CLI.hpp>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "apps/zarn/channellist.h"
#include "apps/zarn/parameters.h"
#include "apps/zarn/pointfilter.h"
#include "apps/zarn/surfacefile.h"
#include "host/mosaic/surfacecache.h"
#include "processes/filters/factories/dodgingcbfactory.h"

namespace zarn::app {
namespace {

struct Dodging {
  MOSDodgingType type = MOSDodgingType::kShift;
  std::vector<MOSDodgingCoeffs> coeffs;
  std::optional<std::string> gainSurface;
  std::optional<std::string> offsetSurface;
};

// Names in the file are relative to its own folder.
std::optional<std::string> SurfaceName(const ParameterObject& whole, const std::string& params,
                                       const char* key) {
  if (!whole.Has(key)) return std::nullopt;
  return (std::filesystem::path(params).parent_path() / whole.Text(key)).string();
}

MOSDodgingCoeffs ReadCoefficients(const ParameterObject& channel, MOSDodgingType type) {
  MOSDodgingCoeffs d;
  const auto read = [&](const char* key, double& value) {
    if (channel.Has(key)) value = channel.Number(key);
  };
  read("d0", d.d0);
  read("d1", d.d1);
  read("d2", d.d2);
  read("d3", d.d3);
  read("d4", d.d4);
  read("d5", d.d5);
  if (type == MOSDodgingType::kScaled && d.d2 == 0.0) channel.Refuse("d2", "a number other than 0");
  return d;
}

Dodging ReadDodging(const std::string& name) {
  const ParameterFile file(name, {"type", "gainSurface", "offsetSurface"},
                           {"d0", "d1", "d2", "d3", "d4", "d5"});
  Dodging dodging;
  const double type = file.Whole().Number("type");
  if (type != 0 && type != 1 && type != 2) file.Whole().Refuse("type", "0, 1 or 2");
  dodging.type = static_cast<MOSDodgingType>(static_cast<int>(type));
  dodging.gainSurface = SurfaceName(file.Whole(), name, "gainSurface");
  dodging.offsetSurface = SurfaceName(file.Whole(), name, "offsetSurface");
  for (const ParameterObject& channel : file.Channels()) {
    dodging.coeffs.push_back(ReadCoefficients(channel, dodging.type));
  }
  return dodging;
}

void Run(const PointFilterOptions& options) {
  const Dodging dodging = ReadDodging(options.params);
  constexpr std::size_t kSurfaceBytes = std::size_t{256} << 20;
  SurfaceCache cache(kSurfaceBytes);
  std::unique_ptr<SurfaceCache::Source> gain;
  std::unique_ptr<SurfaceCache::Source> offset;
  const auto open = [&](const std::optional<std::string>& name, const RasterSource& source,
                        std::unique_ptr<SurfaceCache::Source>& surface) {
    if (!name || surface) return;
    surface = std::make_unique<SurfaceCache::Source>(
        cache, [name, &source] { return ReadDodgingSurface(*name, source); });
    // What is wrong with the file is to be said before anything is written.
    surface->GetCacheRef();
  };
  RunPointFilter(options.image, [&](const RasterSource& source) {
    open(dodging.gainSurface, source, gain);
    open(dodging.offsetSurface, source, offset);
    const std::vector<MOSDodgingCoeffs> coeffs =
        OnePerChannel(source, options.params, "channels", dodging.coeffs);
    const processes::filters::DodgingCBFactory factory(coeffs, dodging.type, gain.get(),
                                                       offset.get());
    return std::unique_ptr<processes::filters::IFilter>(factory.GetCPUFilter());
  });
}

}  // namespace

void AddDodgeCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "dodge", "Evens out brightness by gain and offset surfaces and a model per band");
  const auto options = std::make_shared<PointFilterOptions>();
  AddPointFilterOptions(
      command, *options,
      {.schema = "  {\"type\": 0, 1 or 2, \"gainSurface\": FILE, \"offsetSurface\": FILE,\n"
                 "   \"channels\": [{\"d0\": 0, \"d1\": 0, \"d2\": 1, \"d3\": 0, \"d4\": 1, "
                 "\"d5\": 0}, ...]}\n"
                 "A surface is a raster of a few nodes, its pixel centres, with a band for each of "
                 "IN's or one for all;\nits name is relative to the parameter file. Either may be "
                 "left out, as may coefficients (shown with\ntheir defaults). With "
                 "a = sample d4 + d5 and g and o the surfaces at a pixel, it becomes\n"
                 "  type 0: a + d1 + o\n"
                 "  type 1: (r a + a + d1 + o) / 2 where r = (d0 + d1) / (d0 - o) exceeds 1, else "
                 "as type 0\n"
                 "  type 2: (a - d0) (d3 / d2 + 1) g + d0 + d1 + o\n"
                 "'zarn fit-dodging' writes such files.\n",
       .noData = kNoResultIsNoData,
       .example = "zarn dodge --params scene.json scene.tif even.tif",
       .exampleFile = "{\n  \"type\": 2,\n  \"channels\": [\n"
                      "    {\"d0\": 120, \"d1\": 5, \"d2\": 40, \"d3\": 4, \"d4\": 1, \"d5\": 0}"
                      "\n  ]\n}\n"})
      .required();
  command.callback([options] { Run(*options); });
}

}  // namespace zarn::app
