// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/minmaxlut.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cmath>
#include <memory>
#include <string>
#include <vector>

#include "apps/zarn/channellist.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/lut.h"
#include "apps/zarn/parameters.h"
#include "apps/zarn/pointfilter.h"
#include "host/gobs/datatypeadapter.h"
#include "processes/filters/factories/minmaxlutcbfactory.h"

namespace zarn::app {
namespace {

struct RangeTable {
  LookUpTable table;
  double min = 0;
  double max = 0;
};

// An end of the range as the filter sees it: a sample.
double AsSample(const SampleType& type, double value) {
  using Limits = gobs::DataTypeAdapter;
  const double clamped =
      std::clamp(value, Limits::MinValue(type.code), Limits::MaxValue(type.code));
  if (type.code == gobs::NativeDataTypeCode::kFloat64) return clamped;
  return GDALDataTypeIsFloating(type.gdal) != FALSE
             ? static_cast<double>(static_cast<float>(clamped))
             : std::trunc(clamped);
}

// Whether a valid pixel can become the no-data pixel of the output: samples beyond an end of the
// range get that end itself, all others are kept off the no-data value.
bool CanMakeNoData(const RasterSource& source, const std::vector<RangeTable>& tables,
                   const NoDataValues& noData) {
  if (noData.output.empty()) return false;
  const SampleType& type = source.Type();
  for (std::size_t c = 0; c < tables.size(); ++c) {
    const double low = AsSample(type, tables[c].min);
    const double high = AsSample(type, tables[c].max);
    const bool below = low > gobs::DataTypeAdapter::MinValue(type.code);
    const bool above = high < gobs::DataTypeAdapter::MaxValue(type.code);
    const double value = noData.output[c];
    if (!(below && value == low) && !(above && value == high)) return false;
  }
  return true;
}

std::vector<RangeTable> ReadTables(const std::string& name) {
  const ParameterFile file(name, {}, {"table", "min", "max"});
  std::vector<RangeTable> tables;
  for (const ParameterObject& channel : file.Channels()) {
    tables.push_back(
        {channel.Bytes("table", kTableSize), channel.Number("min"), channel.Number("max")});
    if (tables.back().min >= tables.back().max) channel.Refuse("max", "more than 'min'");
  }
  return tables;
}

std::unique_ptr<processes::filters::IFilter> MakeFilter(const std::vector<RangeTable>& channels) {
  std::vector<LookUpTable> tables;
  std::vector<double> mins;
  std::vector<double> maxs;
  for (const RangeTable& channel : channels) {
    tables.push_back(channel.table);
    mins.push_back(channel.min);
    maxs.push_back(channel.max);
  }
  const processes::filters::MinMaxLUTCBFactory factory(PointersTo(tables), mins, maxs);
  return std::unique_ptr<processes::filters::IFilter>(factory.GetCPUFilter());
}

void Run(const PointFilterOptions& options) {
  const std::vector<RangeTable> given = ReadTables(options.params);
  const auto tablesFor = [&](const RasterSource& source) {
    return OnePerChannel(source, options.params, "channels", given);
  };
  RunPointFilter(
      options.image, [&](const RasterSource& source) { return MakeFilter(tablesFor(source)); },
      [&](const RasterSource& source, const NoDataValues& noData) {
        if (!CanMakeNoData(source, tablesFor(source), noData)) return;
        Warn(options.params +
             ": an end of the range is the no-data value of the output; pixels beyond it in all "
             "bands become no-data (see --dst-nodata)");
      });
}

}  // namespace

void AddMinMaxLutCommand(CLI::App& app) {
  CLI::App& command = *app.add_subcommand(
      "minmax-lut", "Look-up table of 256 entries spread over a range of values, for each band");
  const auto options = std::make_shared<PointFilterOptions>();
  AddPointFilterOptions(
      command, *options,
      {.schema =
           "  {\"channels\": [{\"table\": [256 whole numbers from 0 to 255], \"min\": A, \"max\": "
           "B}, ...]}\n"
           "A and B stand for 0 and 255, in the samples and in the table; samples beyond them "
           "become A or B.\n",
       .noData = "Corrected pixels are kept off that\nvalue, except where A or B is the no-data "
                 "value in all bands.",
       .example = "zarn minmax-lut --params curve.json scene12bit.tif brighter.tif",
       .exampleFile = "{\n  \"channels\": [\n    {\"min\": 0, \"max\": 4095, \"table\": " +
                      ExampleTable() + "}\n  ]\n}\n"})
      .required();
  command.callback([options] { Run(*options); });
}

}  // namespace zarn::app
