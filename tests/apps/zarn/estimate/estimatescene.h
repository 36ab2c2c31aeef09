// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <nlohmann/json.hpp>
#include <string>

#include "tests/apps/zarn/image.h"

namespace zarn::testsupport {

/// A place of a raster on the map, in UTM zone 33 north unless `epsg` says otherwise.
struct Place {
  double left = 0;
  double top = 0;
  double pixel = 1;
  int epsg = 32633;
};

/// Sets georeference and no-data value 0.
Decorate PutAt(const Place& place);

/// Smooth ground with detail of some metres, -1 .. 1; the bands differ.
double GroundAt(double x, double y, int band);

/// A raster at `place` whose samples are `value(x, y, band)` at the pixels' centres.
Image Paint(int width, int height, int bands, GDALDataType type, const Place& place,
            const std::function<double(double x, double y, int band)>& value);

nlohmann::json ReadJson(const std::string& file);

}  // namespace zarn::testsupport
