// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/dataset.h"

#include <cpl_error.h>
#include <cpl_string.h>

#include <cstdlib>
#include <optional>
#include <string>

#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"

namespace zarn::app {
namespace {

gobs::NativeDataTypeCode CodeOf(GDALDataType type) {
  using enum gobs::NativeDataTypeCode;
  switch (type) {
    case GDT_Byte:
      return kUInt8;
    case GDT_UInt16:
      return kUInt16;
    case GDT_Int16:
      return kInt16;
    case GDT_UInt32:
      return kUInt32;
    case GDT_Int32:
      return kInt32;
    case GDT_UInt64:
      return kUInt64;
    case GDT_Int64:
      return kInt64;
    case GDT_Float32:
      return kFloat32;
    case GDT_Float64:
      return kFloat64;
    case GDT_CInt16:
      return kComplexInt16;
    case GDT_CInt32:
      return kComplexInt32;
    case GDT_CFloat32:
      return kComplexFloat32;
    case GDT_CFloat64:
      return kComplexFloat64;
    default:
      return kUnknown;
  }
}

std::optional<double> DeclaredNoData(GDALRasterBand& band) {
  int declared = FALSE;
  double value = 0;
  switch (band.GetRasterDataType()) {
    case GDT_Int64:
      value = static_cast<double>(band.GetNoDataValueAsInt64(&declared));
      break;
    case GDT_UInt64:
      value = static_cast<double>(band.GetNoDataValueAsUInt64(&declared));
      break;
    default:
      value = band.GetNoDataValue(&declared);
  }
  return declared != FALSE ? std::optional(value) : std::nullopt;
}

}  // namespace

DatasetPtr OpenRaster(const std::string& name) {
  CPLErrorReset();
  DatasetPtr dataset(
      GDALDataset::Open(name.c_str(), GDAL_OF_RASTER | GDAL_OF_READONLY | GDAL_OF_VERBOSE_ERROR));
  if (!dataset) throw RunError("cannot open " + name + ": " + LastGdalMessage(name));
  return dataset;
}

SampleType SampleTypeOf(GDALRasterBand& band) {
  const GDALDataType type = band.GetRasterDataType();
  const char* const pixelType = band.GetMetadataItem("PIXELTYPE", "IMAGE_STRUCTURE");
  if (type == GDT_Byte && pixelType != nullptr && EQUAL(pixelType, "SIGNEDBYTE")) {
    return {gobs::NativeDataTypeCode::kInt8, type};
  }
  return {CodeOf(type), type};
}

RasterSource::RasterSource(const std::string& name) : RasterSource(name, OpenRaster(name)) {}

RasterSource::RasterSource(const std::string& name, DatasetPtr dataset)
    : name_(name), dataset_(std::move(dataset)) {
  if (dataset_->GetRasterCount() == 0) {
    throw RunError(name + " has no raster bands; name one of its subdatasets (see gdalinfo)");
  }
  SortBands();
  FindMasks();
  ReadNoData();
  dataset_->GetRasterBand(channels_.front())->GetBlockSize(&blockWidth_, &blockHeight_);
}

void RasterSource::SortBands() {
  type_ = SampleTypeOf(*dataset_->GetRasterBand(1));
  for (int number = 1; number <= dataset_->GetRasterCount(); ++number) {
    GDALRasterBand& band = *dataset_->GetRasterBand(number);
    const SampleType type = SampleTypeOf(band);
    if (type != type_) {
      throw RunError(name_ + " has bands of different types (band 1 is " + type_.Name() +
                     ", band " + std::to_string(number) + " is " + type.Name() +
                     "); make them equal with gdal_translate -ot");
    }
    (band.GetColorInterpretation() == GCI_AlphaBand ? alphas_ : channels_).push_back(number);
  }
  if (channels_.empty()) throw RunError(name_ + " has only alpha bands: nothing to filter");
}

void RasterSource::RefusePalette() const {
  for (const int number : channels_) {
    if (dataset_->GetRasterBand(number)->GetColorTable() == nullptr) continue;
    throw RunError(name_ + ", band " + std::to_string(number) +
                   ", has a palette: its values are colour numbers, not amounts; expand it with "
                   "gdal_translate -expand rgb");
  }
}

void RasterSource::FindMasks() {
  for (const int number : channels_) {
    GDALRasterBand& band = *dataset_->GetRasterBand(number);
    const int flags = band.GetMaskFlags();
    if ((flags & (GMF_ALL_VALID | GMF_NODATA | GMF_ALPHA)) != 0) continue;
    masks_.push_back(band.GetMaskBand());
    if ((flags & GMF_PER_DATASET) != 0) break;
  }
}

void RasterSource::ReadNoData() {
  const CPLStringList list(CSLTokenizeString2(dataset_->GetMetadataItem("NODATA_VALUES"), " ", 0));
  if (static_cast<std::size_t>(list.size()) == channels_.size()) {
    for (int i = 0; i < list.size(); ++i) noData_.push_back(std::strtod(list[i], nullptr));
    return;
  }
  for (const int number : channels_) {
    const std::optional<double> value = DeclaredNoData(*dataset_->GetRasterBand(number));
    if (value) noData_.push_back(*value);
  }
  if (!noData_.empty() && noData_.size() < channels_.size()) {
    Warn(name_ + " declares a no-data value for only " + std::to_string(noData_.size()) + " of " +
         std::to_string(channels_.size()) + " bands; none is used");
    noData_.clear();
  }
}

}  // namespace zarn::app
