// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/maskfile.h"

#include <cpl_error.h>

#include <cmath>
#include <string>

#include "apps/zarn/errors.h"
#include "apps/zarn/gdalsession.h"

namespace zarn::app {
namespace {

// Whether two rasters of one size cover the same ground, to a tenth of a pixel at every corner.
bool SamePlace(GDALDataset& a, GDALDataset& b) {
  double first[6];
  double second[6];
  if (a.GetGeoTransform(first) != CE_None || b.GetGeoTransform(second) != CE_None) return true;
  const double tolerance = 0.1 * std::hypot(first[1], first[4]);
  for (const double x : {0.0, static_cast<double>(a.GetRasterXSize())}) {
    for (const double y : {0.0, static_cast<double>(a.GetRasterYSize())}) {
      for (const int axis : {0, 3}) {
        const double difference = first[axis] - second[axis] +
                                  (first[axis + 1] - second[axis + 1]) * x +
                                  (first[axis + 2] - second[axis + 2]) * y;
        if (std::abs(difference) > tolerance) return false;
      }
    }
  }
  return true;
}

std::string SizeText(GDALDataset& dataset) {
  return std::to_string(dataset.GetRasterXSize()) + " x " +
         std::to_string(dataset.GetRasterYSize());
}

}  // namespace

MaskFile::MaskFile(const std::string& name, const RasterSource& image)
    : name_(name), dataset_(OpenRaster(name)) {
  GDALDataset& other = image.Dataset();
  if (dataset_->GetRasterCount() != 1) {
    throw RunError("the mask " + name + " has " + std::to_string(dataset_->GetRasterCount()) +
                   " bands; give a mask of one band");
  }
  if (GDALDataTypeIsComplex(dataset_->GetRasterBand(1)->GetRasterDataType()) != FALSE) {
    throw RunError("the mask " + name + " has complex samples; give a mask of real ones");
  }
  if (SizeText(*dataset_) != SizeText(other)) {
    throw RunError("the mask " + name + " is " + SizeText(*dataset_) + " pixels, but " +
                   image.Name() + " is " + SizeText(other) + "; give a mask of the same size");
  }
  if (!SamePlace(other, *dataset_)) {
    throw RunError("the mask " + name + " lies elsewhere on the ground than " + image.Name() +
                   "; bring it onto the same grid with gdalwarp");
  }
}

void MaskFile::Exclude(const Window& area, std::uint8_t* valid, std::size_t stride) {
  row_.resize(static_cast<std::size_t>(area.width));
  const int width = static_cast<int>(area.width);
  for (std::int64_t y = 0; y < area.height; ++y) {
    // As doubles, because a byte would round a mask value of 0.3 to 0.
    if (dataset_->GetRasterBand(1)->RasterIO(GF_Read, static_cast<int>(area.x),
                                             static_cast<int>(area.y + y), width, 1, row_.data(),
                                             width, 1, GDT_Float64, 0, 0, nullptr) != CE_None) {
      throw RunError("cannot read the mask " + name_ + ": " + LastGdalMessage(name_));
    }
    std::uint8_t* const bytes = valid + static_cast<std::size_t>(y) * stride;
    for (std::size_t x = 0; x < row_.size(); ++x) {
      const bool processed = row_[x] < 0 || row_[x] > 0;
      bytes[x] = processed ? bytes[x] : std::uint8_t{0};
    }
  }
}

}  // namespace zarn::app
