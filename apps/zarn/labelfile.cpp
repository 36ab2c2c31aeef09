// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/labelfile.h"

#include <cpl_error.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstring>
#include <limits>
#include <optional>
#include <sstream>
#include <type_traits>

#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/nodata.h"
#include "host/gobs/datatypeadapter.h"
#include "processes/filters/framework/sampletypes.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;
using gobs::NativeDataTypeCode;

constexpr std::int64_t kPartPixels = 1 << 20;  // of the file, read at a time

using GeoTransform = std::array<double, 6>;

std::optional<GeoTransform> GeoTransformOf(GDALDataset& dataset) {
  GeoTransform transform;
  if (dataset.GetGeoTransform(transform.data()) != CE_None) return std::nullopt;
  return transform;
}

std::string ToText(const GeoTransform& transform) {
  std::ostringstream text;
  text.precision(15);
  for (std::size_t i = 0; i < transform.size(); ++i) {
    text << (i == 0 ? "[" : ", ") << transform[i];
  }
  return text.str() + "]";
}

std::string SizeText(std::int64_t width, std::int64_t height) {
  return std::to_string(width) + " x " + std::to_string(height);
}

struct Sizes {
  std::int64_t imageWidth;
  std::int64_t imageHeight;
  std::int64_t width;
  std::int64_t height;
};

bool Covers(const CoarserGrid& grid, const Sizes& sizes) {
  return grid.offsetX >= 0 && grid.offsetY >= 0 &&
         grid.offsetX + sizes.imageWidth <= grid.factor * sizes.width &&
         grid.offsetY + sizes.imageHeight <= grid.factor * sizes.height;
}

// The grid on which the pixels of both rasters lie, to a tenth of a pixel of the image at every
// corner of it.
std::optional<CoarserGrid> FindGrid(const GeoTransform& image, GeoTransform labels,
                                    const Sizes& sizes) {
  GeoTransform toLabels;
  if (GDALInvGeoTransform(labels.data(), toLabels.data()) == 0) return std::nullopt;
  GeoTransform place;  // where a pixel of the image lies in the labels
  GDALComposeGeoTransforms(image.data(), toLabels.data(), place.data());
  const double factor = std::round(1 / place[1]);
  constexpr double kMost = 1 << 30;
  const double offsetX = std::round(place[0] * factor);
  const double offsetY = std::round(place[3] * factor);
  const bool inRange = factor >= 1 && factor < kMost && std::abs(offsetX) < kMost &&
                       std::abs(offsetY) < kMost;  // (not so for NaN)
  if (!inRange) return std::nullopt;
  for (const auto x : {0.0, static_cast<double>(sizes.imageWidth)}) {
    for (const auto y : {0.0, static_cast<double>(sizes.imageHeight)}) {
      const double errorX = (place[0] + place[1] * x + place[2] * y) * factor - (x + offsetX);
      const double errorY = (place[3] + place[4] * x + place[5] * y) * factor - (y + offsetY);
      if (!(std::abs(errorX) <= 0.1 && std::abs(errorY) <= 0.1)) return std::nullopt;
    }
  }
  return CoarserGrid{static_cast<std::int64_t>(factor), static_cast<std::int64_t>(offsetX),
                     static_cast<std::int64_t>(offsetY)};
}

// Without georeference the sizes must tell: both rasters begin at the same corner, and only the
// last row and column of the labels may reach beyond the image.
std::optional<CoarserGrid> FindGrid(const Sizes& sizes) {
  const auto ceilDivide = [](std::int64_t a, std::int64_t b) { return (a + b - 1) / b; };
  const CoarserGrid grid{std::max(ceilDivide(sizes.imageWidth, sizes.width),
                                  ceilDivide(sizes.imageHeight, sizes.height))};
  const bool fits = ceilDivide(sizes.imageWidth, grid.factor) == sizes.width &&
                    ceilDivide(sizes.imageHeight, grid.factor) == sizes.height;
  return fits ? std::optional(grid) : std::nullopt;
}

CoarserGrid GridOf(GDALDataset& labels, const std::string& name, const RasterSource& image) {
  const Sizes sizes{image.Width(), image.Height(), labels.GetRasterXSize(),
                    labels.GetRasterYSize()};
  const std::string sizeTexts = SizeText(sizes.width, sizes.height) + " pixels, and " +
                                image.Name() + " " + SizeText(sizes.imageWidth, sizes.imageHeight);
  const auto imagePlace = GeoTransformOf(image.Dataset());
  const auto labelPlace = GeoTransformOf(labels);
  if (!imagePlace || !labelPlace) {
    if (const auto grid = FindGrid(sizes)) return *grid;
    throw RunError("the labels " + name + " are " + sizeTexts +
                   ": not the same size, nor coarser by a whole number");
  }
  const std::string places = "geotransforms " + ToText(*labelPlace) + " and " +
                             ToText(*imagePlace) + " of " + image.Name();
  const auto grid = FindGrid(*imagePlace, *labelPlace, sizes);
  if (!grid) {
    throw RunError("the labels " + name +
                   " do not lie on the pixels of the image, one on one or "
                   "one on a square of them (" +
                   places + "); bring them onto its grid with gdalwarp -r near");
  }
  if (!Covers(*grid, sizes)) {
    throw RunError("the labels " + name + " do not cover the image (they are " + sizeTexts + "; " +
                   places + ")");
  }
  return *grid;
}

// A signed type that holds all labels of a type, their differences, and a value that is none of
// them; other types stay.
template <typename Sample>
struct Wider : std::type_identity<Sample> {};
template <>
struct Wider<std::uint8_t> : std::type_identity<std::int16_t> {};
template <>
struct Wider<std::int8_t> : std::type_identity<std::int16_t> {};
template <>
struct Wider<std::uint16_t> : std::type_identity<std::int32_t> {};
template <>
struct Wider<std::int16_t> : std::type_identity<std::int32_t> {};
template <>
struct Wider<std::uint32_t> : std::type_identity<double> {};
template <>
struct Wider<std::int32_t> : std::type_identity<double> {};

NativeDataTypeCode WiderCode(NativeDataTypeCode code) {
  using enum NativeDataTypeCode;
  switch (code) {
    case kUInt8:
    case kInt8:
      return kInt16;
    case kUInt16:
    case kInt16:
      return kInt32;
    case kUInt32:
    case kInt32:
      return kFloat64;
    default:
      return code;
  }
}

}  // namespace

LabelFile::LabelFile(const std::string& name, const RasterSource& image, const std::string& noData,
                     LabelComparison comparison)
    : name_(name),
      dataset_(OpenRaster(name)),
      fileType_(SampleTypeOf(*dataset_->GetRasterBand(1))) {
  if (dataset_->GetRasterCount() != 1) {
    throw RunError("the labels " + name + " have " + std::to_string(dataset_->GetRasterCount()) +
                   " bands; give labels of one band");
  }
  if (GDALDataTypeIsComplex(fileType_.gdal) != FALSE ||
      fileType_.code == NativeDataTypeCode::kUnknown) {
    throw RunError("the labels " + name + " are " + fileType_.Name() + "; give real numbers");
  }
  grid_ = GridOf(*dataset_, name, image);
  SettleNoData(noData, comparison);
}

void LabelFile::SettleNoData(const std::string& option, LabelComparison comparison) {
  std::optional<double> value;
  if (option.empty()) {
    int declared = FALSE;
    const double own = dataset_->GetRasterBand(1)->GetNoDataValue(&declared);
    if (declared != FALSE) value = own;
  } else if (option != "none") {
    value = ParseNumber("--label-nodata", option);
  }
  if (value && !CanHold(fileType_.code, *value)) {
    std::ostringstream text;
    text << "no label of " << name_ << " can be " << *value << " (" << fileType_.Name()
         << "): every pixel has a label";
    Warn(text.str());
    value.reset();
  }
  // Without such a label, one that no pixel can have stands in.
  isWidened_ = !value || comparison == LabelComparison::kDifference;
  type_ = isWidened_ ? WiderCode(fileType_.code) : fileType_.code;
  bytes_ = gobs::NativeDataType(type_).Description().BytesPerSample();
  if (value) {
    noData_ = *value;
  } else if (type_ == NativeDataTypeCode::kFloat32 || type_ == NativeDataTypeCode::kFloat64) {
    noData_ = std::numeric_limits<double>::quiet_NaN();
  } else {
    noData_ = gobs::DataTypeAdapter::MinValue(type_);
  }
}

void LabelFile::Read(const Window& area, std::byte* labels, std::size_t stride) {
  const std::int64_t left = (area.x + grid_.offsetX) / grid_.factor;
  const std::int64_t right = (area.x + area.width - 1 + grid_.offsetX) / grid_.factor + 1;
  const std::int64_t top = (area.y + grid_.offsetY) / grid_.factor;
  const std::int64_t bottom = (area.y + area.height - 1 + grid_.offsetY) / grid_.factor + 1;
  const std::int64_t rows = std::max<std::int64_t>(1, kPartPixels / (right - left));
  std::int64_t y = 0;
  for (std::int64_t first = top; first < bottom; first += rows) {
    const Window part{left, first, right - left, std::min(rows, bottom - first)};
    ReadPart(part);
    for (; y < area.height; ++y) {
      const std::int64_t row = (area.y + y + grid_.offsetY) / grid_.factor - first;
      if (row >= part.height) break;
      std::byte* const to = labels + static_cast<std::size_t>(y) * stride;
      filters::VisitSampleType(
          fileType_.code, "", [&]<typename Sample>(std::type_identity<Sample>) {
            if (isWidened_) {
              RepeatRow<Sample, typename Wider<Sample>::type>(row, left, area, to);
            } else {
              RepeatRow<Sample, Sample>(row, left, area, to);
            }
            return filters::FilterResult::Success();
          });
    }
  }
}

void LabelFile::ReadPart(const Window& coarse) {
  const auto count = static_cast<std::size_t>(coarse.width * coarse.height);
  scratch_.resize(count * fileType_.Bytes());
  CPLErrorReset();
  if (dataset_->GetRasterBand(1)->RasterIO(
          GF_Read, static_cast<int>(coarse.x), static_cast<int>(coarse.y),
          static_cast<int>(coarse.width), static_cast<int>(coarse.height), scratch_.data(),
          static_cast<int>(coarse.width), static_cast<int>(coarse.height), fileType_.gdal, 0, 0,
          nullptr) != CE_None) {
    throw RunError("cannot read the labels " + name_ + ": " + LastGdalMessage(name_));
  }
}

template <typename Sample, typename Label>
void LabelFile::RepeatRow(std::int64_t coarseRow, std::int64_t coarseLeft, const Window& area,
                          std::byte* labels) const {
  const std::int64_t first = area.x + grid_.offsetX;
  const std::int64_t coarseWidth = (first + area.width - 1) / grid_.factor + 1 - coarseLeft;
  const auto* const row =
      reinterpret_cast<const Sample*>(scratch_.data()) + coarseRow * coarseWidth;
  auto* const to = reinterpret_cast<Label*>(labels);
  if (grid_.factor == 1) {
    std::transform(row, row + coarseWidth, to, [](Sample s) { return static_cast<Label>(s); });
    return;
  }
  std::int64_t x = 0;
  for (std::int64_t column = 0; column < coarseWidth; ++column) {
    const std::int64_t end = std::min((coarseLeft + column + 1) * grid_.factor - first, area.width);
    std::fill(to + x, to + end, static_cast<Label>(row[column]));
    x = end;
  }
}

}  // namespace zarn::app
