// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/enhancement/classfile.h"

#include <cpl_error.h>
#include <cpl_string.h>

#include <algorithm>
#include <array>
#include <string>
#include <vector>

#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/stagedoutput.h"

namespace zarn::app {
namespace {

CPLErr SetClasses(GDALRasterBand& band, const std::vector<datasources::RasterClass>& classes) {
  if (classes.empty()) return CE_None;
  GDALColorTable colours;
  CPLStringList names;
  for (const datasources::RasterClass& each : classes) {
    const GDALColorEntry colour{each.red, each.green, each.blue, 255};
    colours.SetColorEntry(names.Count(), &colour);
    names.AddString(each.name.c_str());
  }
  return std::max(band.SetColorTable(&colours), band.SetCategoryNames(names.List()));
}

CPLErr Place(GDALDataset& output, GDALDataset& image, const ogc::cs::GeocodingInfo& geocoding) {
  CPLErr state = CE_None;
  std::array<double, 6> transform{geocoding.xOffset, geocoding.xPerColumn, geocoding.xPerRow,
                                  geocoding.yOffset, geocoding.yPerColumn, geocoding.yPerRow};
  std::array<double, 6> ofImage;
  if (image.GetGeoTransform(ofImage.data()) == CE_None) {
    state = output.SetGeoTransform(transform.data());
  }
  if (const OGRSpatialReference* const system = image.GetSpatialRef()) {
    state = std::max(state, output.SetSpatialRef(system));
  }
  return state;
}

}  // namespace

void ClassFile::Write(const gobs::Raster& raster, const datasources::AuxiliaryData& auxiliary) {
  const std::string name = file_.Target().string();
  const auto width = static_cast<int>(raster.Width());
  const auto height = static_cast<int>(raster.Height());
  CPLErrorReset();
  DatasetPtr dataset(GetGDALDriverManager()->GetDriverByName("GTiff")->Create(
      file_.StagedFile().c_str(), width, height, 1, GDT_Byte, nullptr));
  if (!dataset) FailWriting(name, LastGdalMessage(file_.StagedFile().string()));
  GDALRasterBand& band = *dataset->GetRasterBand(1);
  CPLErr state = Place(*dataset, image_.Dataset(), auxiliary.geocoding);
  state = std::max(state, SetClasses(band, auxiliary.classes));
  for (const auto& [key, value] : auxiliary.metadata) {
    state = std::max(state, dataset->SetMetadataItem(key.c_str(), value.c_str()));
  }
  state = std::max(state, band.RasterIO(GF_Write, 0, 0, width, height,
                                        const_cast<void*>(raster.Data()),  // only read
                                        width, height, GDT_Byte, 0, 0, nullptr));
  if (state != CE_None) FailWriting(name, LastGdalMessage(file_.StagedFile().string()));
  CloseChecked(std::move(dataset), name);
}

}  // namespace zarn::app
