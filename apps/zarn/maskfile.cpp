// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/maskfile.h"

#include <cpl_error.h>

#include <algorithm>
#include <cmath>
#include <string>

#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"

namespace zarn::app {
namespace {

constexpr std::int64_t kPartPixels = 1 << 20;  // read at a time

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
  // Any other type as doubles, because a byte would round a mask value of 0.3 to 0.
  const bool bytes = dataset_->GetRasterBand(1)->GetRasterDataType() == GDT_Byte;
  const std::int64_t rows = std::max<std::int64_t>(1, kPartPixels / area.width);
  for (std::int64_t y = 0; y < area.height; y += rows) {
    const Window part{area.x, area.y + y, area.width, std::min(rows, area.height - y)};
    std::uint8_t* const partValid = valid + static_cast<std::size_t>(y) * stride;
    if (bytes) {
      ExcludeRows(part, GDT_Byte, bytes_, partValid, stride);
    } else {
      ExcludeRows(part, GDT_Float64, doubles_, partValid, stride);
    }
  }
}

template <typename Sample>
void MaskFile::ExcludeRows(const Window& part, GDALDataType type, std::vector<Sample>& samples,
                           std::uint8_t* valid, std::size_t stride) {
  const auto width = static_cast<std::size_t>(part.width);
  const auto height = static_cast<std::size_t>(part.height);
  samples.resize(width * height);
  CPLErrorReset();
  if (dataset_->GetRasterBand(1)->RasterIO(
          GF_Read, static_cast<int>(part.x), static_cast<int>(part.y), static_cast<int>(part.width),
          static_cast<int>(part.height), samples.data(), static_cast<int>(part.width),
          static_cast<int>(part.height), type, 0, 0, nullptr) != CE_None) {
    throw RunError("cannot read the mask " + name_ + ": " + LastGdalMessage(name_));
  }
  for (std::size_t y = 0; y < height; ++y) {
    for (std::size_t x = 0; x < width; ++x) {
      const Sample sample = samples[y * width + x];
      const bool processed = sample < Sample{0} || sample > Sample{0};  // not so for NaN
      valid[y * stride + x] = processed ? valid[y * stride + x] : std::uint8_t{0};
    }
  }
}

}  // namespace zarn::app
