// SPDX-License-Identifier: Apache-2.0
#include "tests/apps/zarn/cutlinereference.h"

#include <gtest/gtest.h>
#include <ogrsf_frmts.h>

#include <algorithm>
#include <cmath>
#include <fstream>
#include <iterator>
#include <limits>

namespace zarn::testsupport {
namespace {

double SquaredDistance(const Point& p, const Point& a, const Point& b) {
  const auto from = [](const Point& u, const Point& v) {
    return Point{v.first - u.first, v.second - u.second};
  };
  const auto dot = [](const Point& u, const Point& v) {
    return u.first * v.first + u.second * v.second;
  };
  const Point d = from(a, b);
  const Point fromA = from(a, p);
  const Point toB = from(p, b);
  if (dot(d, fromA) < 0) return dot(fromA, fromA);
  if (dot(d, toB) < 0) return dot(toB, toB);
  const double cross = d.first * fromA.second - d.second * fromA.first;
  return cross * cross / dot(d, d);
}

}  // namespace

OGRSpatialReference System(int epsg) {
  OGRSpatialReference system;
  system.importFromEPSG(epsg);
  system.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
  return system;
}

Decorate Georeference(int left, int top, std::optional<double> noData) {
  return [=](GDALDataset& dataset) {
    double transform[] = {kEast + left * kSize, kSize, 0, kNorth - top * kSize, 0, -kSize};
    dataset.SetGeoTransform(transform);
    const OGRSpatialReference system = System(32633);
    dataset.SetSpatialRef(&system);
    if (noData) dataset.GetRasterBand(1)->SetNoDataValue(*noData);
  };
}

Point OnMap(const Point& p) { return {kEast + p.first * kSize, kNorth - p.second * kSize}; }

Polygon OnMap(Polygon polygon) {
  for (Ring& ring : polygon) {
    for (Point& p : ring) p = OnMap(p);
  }
  return polygon;
}

Ring Rectangle(double left, double top, double right, double bottom) {
  return {{left, top}, {right, top}, {right, bottom}, {left, bottom}, {left, top}};
}

double Sixteenth(double value) { return (std::floor(value * 8) + 0.5) / 8; }

void WriteFeatures(const std::vector<Feature>& features, const std::string& file,
                   const char* driver, int epsg, const char* field) {
  GDALAllRegister();
  OpenDataset dataset(GetGDALDriverManager()->GetDriverByName(driver)->Create(
      file.c_str(), 0, 0, 0, GDT_Unknown, nullptr));
  OGRSpatialReference system = System(epsg);
  OGRLayer* const layer = dataset->CreateLayer("areas", &system, wkbUnknown);
  OGRFieldDefn names(field, OFTString);
  layer->CreateField(&names);
  for (const Feature& f : features) {
    OGRFeature feature(layer->GetLayerDefn());
    feature.SetField(field, f.name.c_str());
    OGRPolygon polygon;
    for (const Ring& ring : f.polygon) {
      OGRLinearRing line;
      for (const auto& [x, y] : ring) line.addPoint(x, y);
      polygon.addRing(&line);
    }
    feature.SetGeometry(&polygon);
    ASSERT_EQ(layer->CreateFeature(&feature), OGRERR_NONE);
  }
}

double Weight(const Polygon& polygon, double x, double y, int feather) {
  bool inside = false;
  double nearest = std::numeric_limits<double>::infinity();
  for (const Ring& ring : polygon) {
    for (std::size_t i = 0; i + 1 < ring.size(); ++i) {
      const auto [x0, y0] = ring[i];
      const auto [x1, y1] = ring[i + 1];
      if ((y0 > y) != (y1 > y) && (x1 - x0) * (y - y0) / (y1 - y0) + x0 > x) inside = !inside;
      nearest = std::min(nearest, SquaredDistance({x, y}, ring[i], ring[i + 1]));
    }
  }
  if (feather == 0) return inside ? 1 : -1;
  const double weight = std::sqrt(nearest) / feather;
  return std::clamp(inside ? weight : -weight, -1.0, 1.0);
}

std::string BytesOf(const std::string& file) {
  std::ifstream stream(file, std::ios::binary);
  return {std::istreambuf_iterator<char>(stream), {}};
}

}  // namespace zarn::testsupport
