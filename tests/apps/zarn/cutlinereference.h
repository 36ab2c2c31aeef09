// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <ogr_spatialref.h>

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tests/apps/zarn/image.h"

namespace zarn::testsupport {

using Point = std::pair<double, double>;
using Ring = std::vector<Point>;
using Polygon = std::vector<Ring>;

// The map of the tests: pixels of 32 metres. A power of two keeps vertices exact on their way to
// the map and back.
inline constexpr double kEast = 500000;
inline constexpr double kNorth = 5100000;
inline constexpr double kSize = 32;

OGRSpatialReference System(int epsg);
/// Places a raster `left` columns and `top` rows from the corner of the map.
Decorate Georeference(int left, int top, std::optional<double> noData = std::nullopt);
Point OnMap(const Point& p);
Polygon OnMap(Polygon polygon);

Ring Rectangle(double left, double top, double right, double bottom);
/// Near `value`, and exact; never the centre of a pixel.
double Sixteenth(double value);

struct Feature {
  Polygon polygon;
  std::string name = {};
};

/// Writes a layer "areas" with a field `field` for the names.
void WriteFeatures(const std::vector<Feature>& features, const std::string& file,
                   const char* driver = "GPKG", int epsg = 32633, const char* field = "name");

/// The weight of a pixel by its definition: all edges, one by one.
double Weight(const Polygon& polygon, double x, double y, int feather);

std::string BytesOf(const std::string& file);

}  // namespace zarn::testsupport
