// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/ground.h"

#include <gdal.h>
#include <ogr_spatialref.h>

#include <algorithm>
#include <cmath>
#include <sstream>
#include <string>

#include "apps/zarn/errors.h"

namespace zarn::app {
namespace {

std::string NameOf(const OGRSpatialReference& system) {
  const char* const name = system.GetName();
  const char* const authority = system.GetAuthorityName(nullptr);
  const char* const code = system.GetAuthorityCode(nullptr);
  const bool coded = authority != nullptr && code != nullptr;
  return coded ? std::string(authority) + ":" + code : name != nullptr ? name : "unnamed";
}

}  // namespace

bool SameSystem(const OGRSpatialReference& a, const OGRSpatialReference& b) {
  const char* const kOptions[] = {"IGNORE_DATA_AXIS_TO_SRS_AXIS_MAPPING=YES",
                                  "CRITERION=EQUIVALENT_EXCEPT_AXIS_ORDER_GEOGCRS", nullptr};
  return a.IsSame(&b, kOptions) != FALSE;
}

void RequireSameSystem(const RasterSource& first, const RasterSource& other) {
  const OGRSpatialReference* const a = first.Dataset().GetSpatialRef();
  const OGRSpatialReference* const b = other.Dataset().GetSpatialRef();
  if (a == nullptr && b == nullptr) return;
  if (a == nullptr || b == nullptr) {
    throw RunError((a == nullptr ? first : other).Name() + " names no coordinate system, " +
                   (a == nullptr ? other : first).Name() +
                   " does; add it with gdal_edit.py -a_srs");
  }
  if (!SameSystem(*a, *b)) {
    throw RunError(other.Name() + " lies in another coordinate system (" + NameOf(*b) + ") than " +
                   first.Name() + " (" + NameOf(*a) + "); reproject it first with gdalwarp -t_srs");
  }
}

void RequireSameSamples(const RasterSource& first, const RasterSource& other) {
  if (other.Type() != first.Type()) {
    throw RunError(other.Name() + " is " + other.Type().Name() + ", but " + first.Name() + " is " +
                   first.Type().Name() + "; bring it to one type with gdal_translate -ot");
  }
  if (other.Channels().size() != first.Channels().size()) {
    throw RunError(other.Name() + " has " + std::to_string(other.Channels().size()) +
                   " bands besides alpha, but " + first.Name() + " has " +
                   std::to_string(first.Channels().size()) +
                   "; choose the same ones with gdal_translate -b");
  }
}

void RequireComparable(const RasterSource& first, const RasterSource& other) {
  RequireSameSamples(first, other);
  RequireSameSystem(first, other);
}

Extent Intersection(const Extent& a, const Extent& b) {
  return {std::max(a.left, b.left), std::max(a.bottom, b.bottom), std::min(a.right, b.right),
          std::min(a.top, b.top)};
}

Extent Union(const Extent& a, const Extent& b) {
  return {std::min(a.left, b.left), std::min(a.bottom, b.bottom), std::max(a.right, b.right),
          std::max(a.top, b.top)};
}

Ground::Ground(const RasterSource& source)
    : transform_{0, 1, 0, 0, 0, 1},
      inverse_{},
      georeferenced_(source.Dataset().GetGeoTransform(transform_.data()) == CE_None),
      size_{source.Width(), source.Height()},
      bounds_{} {
  if (GDALInvGeoTransform(transform_.data(), inverse_.data()) == FALSE) {
    throw RunError(source.Name() +
                   " has a georeference that no pixel can be found by; repair it "
                   "with gdal_edit.py -a_ullr");
  }
  const auto width = static_cast<double>(size_.width);
  const auto height = static_cast<double>(size_.height);
  const auto [left, right] = std::minmax({X(0, 0), X(width, 0), X(0, height), X(width, height)});
  const auto [bottom, top] = std::minmax({Y(0, 0), Y(width, 0), Y(0, height), Y(width, height)});
  bounds_ = {left, bottom, right, top};
}

double Ground::PixelWidth() const { return std::abs(transform_[1]) + std::abs(transform_[2]); }

double Ground::PixelHeight() const { return std::abs(transform_[4]) + std::abs(transform_[5]); }

double Ground::PixelArea() const {
  return std::abs(transform_[1] * transform_[5] - transform_[2] * transform_[4]);
}

Window Ground::PixelsIn(const Extent& extent) const {
  if (extent.Empty()) return {};
  const auto [left, right] =
      std::minmax({Column(extent.left, extent.top), Column(extent.right, extent.top),
                   Column(extent.left, extent.bottom), Column(extent.right, extent.bottom)});
  const auto [top, bottom] =
      std::minmax({Row(extent.left, extent.top), Row(extent.right, extent.top),
                   Row(extent.left, extent.bottom), Row(extent.right, extent.bottom)});
  const auto inside = [](double value, std::int64_t limit) {
    return static_cast<std::int64_t>(std::clamp(value, 0.0, static_cast<double>(limit)));
  };
  const std::int64_t x = inside(std::floor(left), size_.width);
  const std::int64_t y = inside(std::floor(top), size_.height);
  return {x, y, inside(std::ceil(right), size_.width) - x,
          inside(std::ceil(bottom), size_.height) - y};
}

namespace {

std::vector<Ground> GroundsOf(const std::vector<const RasterSource*>& sources) {
  std::vector<Ground> grounds;
  grounds.reserve(sources.size());
  const RasterSource& first = *sources.front();
  for (const RasterSource* const source : sources) {
    RequireSameSystem(first, *source);
    grounds.emplace_back(*source);
    if (grounds.back().Georeferenced() != grounds.front().Georeferenced()) {
      throw RunError((grounds.back().Georeferenced() ? first : *source).Name() +
                     " is not georeferenced; it cannot be laid over the others");
    }
    const bool sameSize = source->Width() == first.Width() && source->Height() == first.Height();
    if (!grounds.back().Georeferenced() && !sameSize) {
      throw RunError(source->Name() + " and " + first.Name() +
                     " are not georeferenced and differ in size; georeference them with "
                     "gdal_edit.py -a_ullr");
    }
  }
  return grounds;
}

std::string TransformText(const RasterSource& source) {
  std::array<double, 6> transform{};
  source.Dataset().GetGeoTransform(transform.data());
  std::ostringstream text;
  text.precision(15);
  for (const double& value : transform) text << (&value == transform.data() ? "(" : ", ") << value;
  return text.str() + ")";
}

}  // namespace

std::optional<GridPlace> FindOnGrid(const Ground& first, const Ground& other) {
  const auto columnOf = [&](double x, double y) {
    return first.Column(other.X(x, y), other.Y(x, y));
  };
  const auto rowOf = [&](double x, double y) { return first.Row(other.X(x, y), other.Y(x, y)); };
  const double column = std::floor(columnOf(0, 0) + 0.5);
  const double row = std::floor(rowOf(0, 0) + 0.5);
  for (const double x : {0.0, static_cast<double>(other.Size().width)}) {
    for (const double y : {0.0, static_cast<double>(other.Size().height)}) {
      constexpr double kTolerance = 0.1;
      const double off =
          std::max(std::abs(columnOf(x, y) - x - column), std::abs(rowOf(x, y) - y - row));
      const bool fits = off <= kTolerance && std::abs(column) < 0x1p40 && std::abs(row) < 0x1p40;
      if (!fits) return std::nullopt;
    }
  }
  return GridPlace{static_cast<std::int64_t>(column), static_cast<std::int64_t>(row)};
}

GridPlace PlaceOnGrid(const RasterSource& first, const RasterSource& other) {
  const std::vector<Ground> grounds = GroundsOf({&first, &other});
  const std::optional<GridPlace> place = FindOnGrid(grounds.front(), grounds.back());
  if (place) return *place;
  throw RunError(other.Name() + " does not lie on the pixels of " + first.Name() +
                 ": its geotransform is " + TransformText(other) + ", the other one " +
                 TransformText(first) + "; bring it there with zarn resample --like");
}

std::vector<Ground> ComparableGrounds(const std::vector<RasterSource>& sources) {
  std::vector<const RasterSource*> pointers;
  for (const RasterSource& source : sources) {
    RequireComparable(sources.front(), source);
    pointers.push_back(&source);
  }
  return GroundsOf(pointers);
}

}  // namespace zarn::app
