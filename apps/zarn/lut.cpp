// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/lut.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <memory>

#include "apps/zarn/channellist.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/parameters.h"
#include "apps/zarn/pointfilter.h"
#include "processes/filters/factories/lutcbfactory.h"

namespace zarn::app {
namespace {

// Whether the entry is that of one sample value only; the outer ones also serve what lies beyond.
bool ServesOneValue(const SampleType& type, std::size_t index) {
  using enum gobs::NativeDataTypeCode;
  const bool isUnsigned = type.code == kUInt8 || type.code == kUInt16 || type.code == kUInt32;
  return isUnsigned && (type.Bytes() == 1 || index < kTableSize - 1);
}

// Whether the tables can turn a valid pixel into the no-data pixel of the output.
bool CanMakeNoData(const RasterSource& source, const std::vector<LookUpTable>& tables,
                   const NoDataValues& noData) {
  if (noData.output.empty()) return false;
  bool onlyFromNoData = !noData.input.empty();
  for (std::size_t c = 0; c < tables.size(); ++c) {
    bool reached = false;
    for (std::size_t i = 0; i < kTableSize; ++i) {
      if (tables[c][i] != noData.output[c]) continue;
      reached = true;
      onlyFromNoData = onlyFromNoData && ServesOneValue(source.Type(), i) &&
                       noData.input[c] == static_cast<double>(i);
    }
    if (!reached) return false;
  }
  return !onlyFromNoData;
}

std::vector<LookUpTable> ReadTables(const std::string& name) {
  const ParameterFile file(name, {}, {"table"});
  std::vector<LookUpTable> tables;
  for (const ParameterObject& channel : file.Channels()) {
    tables.push_back(channel.Bytes("table", kTableSize));
  }
  return tables;
}

void Run(const PointFilterOptions& options) {
  const std::vector<LookUpTable> given = ReadTables(options.params);
  const auto tablesFor = [&](const RasterSource& source) {
    return OnePerChannel(source, options.params, "channels", given);
  };
  RunPointFilter(
      options.image,
      [&](const RasterSource& source) {
        std::vector<LookUpTable> tables = tablesFor(source);
        const processes::filters::LUTCBFactory factory(PointersTo(tables));
        return std::unique_ptr<processes::filters::IFilter>(factory.GetCPUFilter());
      },
      [&](const RasterSource& source, const NoDataValues& noData) {
        if (!CanMakeNoData(source, tablesFor(source), noData)) return;
        Warn(options.params +
             ": the tables have the no-data value of the output; pixels that get it in all bands "
             "become no-data (see --dst-nodata)");
      });
}

}  // namespace

std::string ExampleTable() {
  constexpr std::size_t kPerLine = 16;
  std::string text = "[";
  for (std::size_t i = 0; i < kTableSize; ++i) {
    const std::size_t brightened = i + i * (kTableSize - 1 - i) / 1000;
    text += (i == 0 ? "" : i % kPerLine == 0 ? ",\n      " : ", ") + std::to_string(brightened);
  }
  return text + "]";
}

std::vector<unsigned char*> PointersTo(std::vector<LookUpTable>& tables) {
  std::vector<unsigned char*> pointers(tables.size());
  std::transform(tables.begin(), tables.end(), pointers.begin(),
                 [](LookUpTable& table) { return table.data(); });
  return pointers;
}

void AddLutCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand("lut", "Look-up table of 256 entries for each band");
  const auto options = std::make_shared<PointFilterOptions>();
  AddPointFilterOptions(
      command, *options,
      {.schema = "  {\"channels\": [{\"table\": [256 whole numbers from 0 to 255]}, ...]}\n"
                 "A sample v becomes entry v of the table: the first one below 0, the last one "
                 "above 255.\n",
       .noData = "The table's values are written as they\nare: one that is the no-data value in "
                 "all bands makes a pixel no-data.",
       .example = "zarn lut --params curve.json scene.tif brighter.tif",
       .exampleFile = "{\n  \"channels\": [\n    {\"table\": " + ExampleTable() + "}\n  ]\n}\n"})
      .required();
  command.callback([options] { Run(*options); });
}

}  // namespace zarn::app
