// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/carryover.h"

#include <cpl_string.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <sstream>
#include <string>

#include "apps/zarn/gdalruntime.h"
#include "host/gobs/saturatecast.h"

namespace zarn::app {
namespace {

void CopyGeoreference(GDALDataset& source, GDALDataset& output) {
  if (source.GetGCPCount() > 0) {
    output.SetGCPs(source.GetGCPCount(), source.GetGCPs(), source.GetGCPSpatialRef());
  }
  if (source.GetSpatialRef() != nullptr) output.SetSpatialRef(source.GetSpatialRef());
  double transform[6];
  if (source.GetGeoTransform(transform) == CE_None) output.SetGeoTransform(transform);
}

void Place(const OutputGrid& grid, GDALDataset& output) {
  std::array<double, 6> transform = grid.transform;
  if (!grid.crs.IsEmpty()) output.SetSpatialRef(&grid.crs);
  output.SetGeoTransform(transform.data());
}

void CopyMetadata(GDALDataset& source, GDALDataset& output, bool placing) {
  CPLStringList general(CSLDuplicate(source.GetMetadata()));
  general.SetNameValue("NODATA_VALUES", nullptr);
  if (!general.empty()) output.SetMetadata(general.List());
  if (!placing) return;
  for (const char* const domain : {"RPC", "GEOLOCATION"}) {
    char** const items = source.GetMetadata(domain);
    if (items != nullptr) output.SetMetadata(items, domain);
  }
}

// Statistics describe the pixels before the filter.
CPLStringList WithoutStatistics(char** items) {
  CPLStringList kept;
  for (; items != nullptr && *items != nullptr; ++items) {
    if (!STARTS_WITH_CI(*items, "STATISTICS_")) kept.AddString(*items);
  }
  return kept;
}

void CopyBand(GDALRasterBand& source, GDALRasterBand& output) {
  if (source.GetDescription()[0] != '\0') output.SetDescription(source.GetDescription());
  if (source.GetColorTable() != nullptr &&
      output.SetColorTable(source.GetColorTable()) != CE_None) {
    Warn("the output cannot hold the palette of band " + std::to_string(source.GetBand()));
  }
  const GDALColorInterp colour = source.GetColorInterpretation();
  if (colour != GCI_Undefined && colour != output.GetColorInterpretation()) {
    output.SetColorInterpretation(colour);
  }
  CPLStringList items = WithoutStatistics(source.GetMetadata());
  if (!items.empty()) output.SetMetadata(items.List());
  int has = FALSE;
  const double offset = source.GetOffset(&has);
  if (has != FALSE && offset != 0) output.SetOffset(offset);
  const double scale = source.GetScale(&has);
  if (has != FALSE && scale != 1) output.SetScale(scale);
  if (source.GetUnitType()[0] != '\0') output.SetUnitType(source.GetUnitType());
}

void DeclareNoData(GDALRasterBand& band, double value) {
  switch (band.GetRasterDataType()) {
    case GDT_Int64:
      band.SetNoDataValueAsInt64(gobs::SaturateCast<std::int64_t>(value));
      break;
    case GDT_UInt64:
      band.SetNoDataValueAsUInt64(gobs::SaturateCast<std::uint64_t>(value));
      break;
    default:
      band.SetNoDataValue(value);
  }
}

void DeclareNoData(const RasterSource& source, const std::vector<double>& values,
                   GDALDataset& output) {
  if (values.empty()) return;
  // Like the filters, it takes NaN for one value.
  const auto differ = [](double a, double b) {
    return a != b && !(std::isnan(a) && std::isnan(b));
  };
  const bool equal = std::adjacent_find(values.begin(), values.end(), differ) == values.end();
  if (equal || values.size() == 1) {
    for (const int number : source.Channels()) {
      DeclareNoData(*output.GetRasterBand(number), values.front());
    }
    return;
  }
  // Most formats have one value for all bands; this item has one for each and means, like the
  // filters, the pixel as a whole.
  std::ostringstream list;
  list.precision(17);
  for (const double value : values) list << (&value == values.data() ? "" : " ") << value;
  output.SetMetadataItem("NODATA_VALUES", list.str().c_str());
}

}  // namespace

bool NeedsMask(const RasterSource& source, const std::vector<double>& noData) {
  return !source.Masks().empty() || (noData.empty() && source.Alphas().empty());
}

void Describe(const RasterSource& source, const std::vector<double>& noData, GDALDataset& output,
              const OutputGrid* grid) {
  for (int number = 1; number <= output.GetRasterCount(); ++number) {
    CopyBand(*source.Dataset().GetRasterBand(number), *output.GetRasterBand(number));
  }
  CopyMetadata(source.Dataset(), output, grid == nullptr);
  if (grid == nullptr) {
    CopyGeoreference(source.Dataset(), output);
  } else {
    Place(*grid, output);
  }
  DeclareNoData(source, noData, output);
}

void CarryOver(const RasterSource& source, const std::vector<double>& noData, GDALDataset& output,
               const OutputGrid* grid, bool masked) {
  Describe(source, noData, output, grid);
  if (masked || !source.Masks().empty()) output.CreateMaskBand(GMF_PER_DATASET);
}

}  // namespace zarn::app
