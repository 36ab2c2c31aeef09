// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/nodata.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdlib>
#include <sstream>
#include <string>

#include "apps/zarn/channellist.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "host/gobs/datatypeadapter.h"

namespace zarn::app {
namespace {

std::string ToText(double value) {
  std::ostringstream text;
  text.precision(17);
  text << value;
  return text.str();
}

// No-data is the pixel as a whole, so there is a value for every channel or none at all.
std::vector<double> ForAllChannels(const RasterSource& source, const std::string& option,
                                   const std::vector<double>& values) {
  return values.empty() ? values : OnePerChannel(source, option, "values", values);
}

// The list, or none when a value can never occur: no pixel can then equal it in all channels.
std::vector<double> Holdable(const RasterSource& source, const std::string& origin,
                             std::vector<double> values) {
  for (const double value : values) {
    if (CanHold(source.Type().code, value)) continue;
    Warn(origin + " " + ToText(value) + " cannot occur in " + source.Type().Name() +
         " samples and is taken as none");
    return {};
  }
  return values;
}

void RefuseNoneAmongNumbers(const std::string& option, const std::string& list) {
  if (("," + list + ",").find(",none,") == std::string::npos) return;
  throw UsageError(option + ": 'none' must stand alone, it means no no-data value for all bands");
}

}  // namespace

double ParseNumber(const std::string& option, const std::string& text) {
  char* end = nullptr;
  const double value = std::strtod(text.c_str(), &end);
  if (end == text.c_str() || *end != '\0') {
    throw UsageError(option + ": '" + text + "' is not a number");
  }
  return value;
}

std::vector<double> ParseNumbers(const std::string& option, const std::string& text) {
  std::vector<double> values;
  for (std::size_t begin = 0; begin <= text.size();) {
    const std::size_t end = std::min(text.find(',', begin), text.size());
    values.push_back(ParseNumber(option, text.substr(begin, end - begin)));
    begin = end + 1;
  }
  return values;
}

std::optional<std::vector<double>> ParseNoData(const std::string& option, const std::string& text) {
  if (text.empty()) return std::nullopt;
  if (text == "none") return std::vector<double>();
  RefuseNoneAmongNumbers(option, text);
  return ParseNumbers(option, text);
}

bool CanHold(gobs::NativeDataTypeCode code, double value) {
  using enum gobs::NativeDataTypeCode;
  // Half a step beyond the largest float still rounds to it.
  constexpr double kPastLargestFloat = 0x1.ffffffp+127;
  if (code == kFloat64) return true;
  if (code == kFloat32) return !std::isfinite(value) || std::abs(value) < kPastLargestFloat;
  const double least = gobs::DataTypeAdapter::MinValue(code);
  const double most = gobs::DataTypeAdapter::MaxValue(code);
  // Beyond 2^53 a double stands for several 64-bit integers, except for the type's own limits.
  if (std::abs(value) >= 0x1p53) return value == least || value == most;
  return value == std::trunc(value) && value >= least && value <= most;
}

std::vector<double> NoDataOf(const RasterSource& source, const std::string& option,
                             const std::string& text) {
  const auto given = ParseNoData(option, text);
  return given ? Holdable(source, option, ForAllChannels(source, option, *given))
               : Holdable(source, source.Name() + ": no-data value", source.NoData());
}

NoDataValues ResolveNoData(const RasterSource& source, const std::string& srcOption,
                           const std::string& dstOption) {
  NoDataValues result;
  result.input = NoDataOf(source, "--src-nodata", srcOption);
  const auto dst = ParseNoData("--dst-nodata", dstOption);
  result.output = result.input;
  if (dst) {
    result.output = Holdable(source, "--dst-nodata", ForAllChannels(source, "--dst-nodata", *dst));
    result.translate = !result.output.empty();
  }
  return result;
}

}  // namespace zarn::app
