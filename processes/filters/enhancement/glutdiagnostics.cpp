// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/enhancement/glutdiagnostics.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cstddef>
#include <cstdint>
#include <map>
#include <sstream>
#include <string>
#include <vector>

#include "host/gobs/raster.h"
#include "processes/filters/enhancement/trimmethod.h"

namespace zarn::processes::filters {
namespace {

using Metadata = std::map<std::string, std::string>;

constexpr const char* kEnhancementType = "EnhancementType";
constexpr const char* kPowerEnhancement = "Power";
constexpr const char* kTrimMethod = "TrimMethod";

constexpr std::array kStatuses{CellStatus::kNoData, CellStatus::kValid, CellStatus::kInvalid,
                               CellStatus::kMasked};

std::uint8_t ClassOf(CellStatus status) {
  return static_cast<std::uint8_t>(std::find(kStatuses.begin(), kStatuses.end(), status) -
                                   kStatuses.begin());
}

// With as many digits as give the same number again.
template <typename Number>
std::string ToText(Number value) {
  std::array<char, 32> text;
  return {text.data(), std::to_chars(text.data(), text.data() + text.size(), value).ptr};
}

// A number that is the whole rest of a text.
template <typename Number>
bool Parse(std::string_view text, Number& value) {
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  return error == std::errc() && end == text.data() + text.size();
}

template <typename Number>
bool Find(const Metadata& metadata, const char* name, Number& value) {
  const auto item = metadata.find(name);
  return item != metadata.end() && Parse(std::string_view(item->second), value);
}

bool FindTileSizes(const Metadata& metadata, GLUTParameters& parameters) {
  const auto item = metadata.find("GLUTTileSizes");
  if (item == metadata.end()) return false;
  const std::string_view text = item->second;
  const std::size_t blank = text.find(' ');
  return blank != std::string_view::npos && Parse(text.substr(0, blank), parameters.tileWidth) &&
         Parse(text.substr(blank + 1), parameters.tileHeight);
}

bool FindFlag(const Metadata& metadata, const char* name, bool& flag) {
  int value = 0;
  if (!Find(metadata, name, value)) return false;
  flag = value != 0;
  return true;
}

gobs::RasterInfo GridInfo(const CellGrid& grid, int channels, gobs::NativeDataTypeCode code) {
  return {static_cast<std::uint32_t>(grid.Columns()), static_cast<std::uint32_t>(grid.Rows()),
          static_cast<std::uint32_t>(channels), code};
}

}  // namespace

datasources::AuxiliaryData DescribeGrid(const GLUTParameters& parameters,
                                        const ogc::cs::GeocodingInfo& geocoding) {
  return {.geocoding = geocoding,
          .metadata = {{kEnhancementType, kPowerEnhancement},
                       {kTrimMethod,
                        TrimMethodToString(static_cast<TrimMethod>(parameters.trimMethod))},
                       {"LeftTrimOption", ToText(parameters.leftTrim)},
                       {"RightTrimOption", ToText(parameters.rightTrim)},
                       {"IgnoreFirstBin", ToText(parameters.ignoreFirstBin ? 1 : 0)},
                       {"IgnoreLastBin", ToText(parameters.ignoreLastBin ? 1 : 0)},
                       {"GLUTTileSizes",
                        ToText(parameters.tileWidth) + " " + ToText(parameters.tileHeight)},
                       {"NO_DATA_VALUE", ToText(int{ClassOf(CellStatus::kNoData)})},
                       {"PixelDepth", ToText(parameters.pixelDepth)},
                       {"Power", ToText(parameters.power)}},
          .classes = {{"NoData GeoLUTs", 0, 0, 0},
                      {"Valid GeoLUTs", 0, 255, 0},
                      {"Invalid GeoLUTs", 255, 0, 0},
                      {"Masked GeoLUTs", 255, 255, 0}}};
}

void WriteClasses(const CellGrid& grid, const datasources::AuxiliaryData& auxiliary,
                  datasources::BasicWriter& writer) {
  gobs::Raster raster(GridInfo(grid, 1, gobs::NativeDataTypeCode::kUInt8));
  auto* const classes = static_cast<std::uint8_t*>(raster.Data());
  for (std::size_t cell = 0; cell < grid.CellCount(); ++cell) {
    classes[cell] = ClassOf(grid.Status(cell));
  }
  writer.Write(raster, auxiliary);
}

void WriteCoefficients(const CellGrid& grid, datasources::AuxiliaryData auxiliary,
                       datasources::BasicWriter& writer) {
  gobs::Raster raster(GridInfo(grid, 2 * grid.Channels(), gobs::NativeDataTypeCode::kFloat32));
  auto* value = static_cast<float*>(raster.Data());
  for (std::size_t cell = 0; cell < grid.CellCount(); ++cell) {
    for (int c = 0; c < grid.Channels(); ++c) {
      *value++ = grid.Gain(cell, c);
      *value++ = grid.Offset(cell, c);
    }
  }
  auxiliary.classes.clear();
  auxiliary.metadata.erase("NO_DATA_VALUE");
  writer.Write(raster, auxiliary);
}

std::optional<GLUTParameters> ReadParameters(const datasources::IRasterReader& classes,
                                             const datasources::IRasterReader& coefficients) {
  const bool arePair =
      classes.DataTypeCode() == gobs::NativeDataTypeCode::kUInt8 && classes.Channels() == 1 &&
      coefficients.DataTypeCode() == gobs::NativeDataTypeCode::kFloat32 &&
      coefficients.Channels() % 2 == 0 && classes.Width() == coefficients.Width() &&
      classes.Height() == coefficients.Height();
  if (!arePair) return std::nullopt;
  const Metadata metadata = classes.Auxiliary().metadata;
  const auto type = metadata.find(kEnhancementType);
  if (type == metadata.end() || type->second != kPowerEnhancement) return std::nullopt;
  GLUTParameters parameters;
  const bool complete = Find(metadata, "PixelDepth", parameters.pixelDepth) &&
                        Find(metadata, "Power", parameters.power) &&
                        Find(metadata, "LeftTrimOption", parameters.leftTrim) &&
                        Find(metadata, "RightTrimOption", parameters.rightTrim) &&
                        FindFlag(metadata, "IgnoreFirstBin", parameters.ignoreFirstBin) &&
                        FindFlag(metadata, "IgnoreLastBin", parameters.ignoreLastBin) &&
                        FindTileSizes(metadata, parameters) && metadata.contains(kTrimMethod);
  if (!complete) return std::nullopt;
  parameters.trimMethod =
      static_cast<std::int32_t>(StringToTrimMethod(metadata.find(kTrimMethod)->second));
  parameters.gridRows = static_cast<std::int32_t>(classes.Height());
  parameters.gridColumns = static_cast<std::int32_t>(classes.Width());
  parameters.channelCount = static_cast<std::int32_t>(coefficients.Channels() / 2);
  return parameters;
}

void ReadCells(datasources::IRasterReader& classes, datasources::IRasterReader& coefficients,
               CellGrid& grid) {
  gobs::Raster statuses(GridInfo(grid, 1, gobs::NativeDataTypeCode::kUInt8));
  gobs::Raster values(GridInfo(grid, 2 * grid.Channels(), gobs::NativeDataTypeCode::kFloat32));
  std::vector<std::uint8_t> valid(grid.CellCount());
  classes.Read(statuses, valid.data());
  coefficients.Read(values, valid.data());
  const auto* const status = static_cast<const std::uint8_t*>(statuses.Data());
  const auto* value = static_cast<const float*>(values.Data());
  for (std::size_t cell = 0; cell < grid.CellCount(); ++cell) {
    const std::size_t known = std::min<std::size_t>(status[cell], kStatuses.size());
    grid.SetStatus(cell, known < kStatuses.size() ? kStatuses[known] : CellStatus::kInvalid);
    for (int c = 0; c < grid.Channels(); ++c, value += 2) grid.Set(cell, c, value[0], value[1]);
  }
}

}  // namespace zarn::processes::filters
