// SPDX-License-Identifier: Apache-2.0
#include "tests/apps/zarn/estimate/estimatescene.h"

#include <ogr_spatialref.h>

#include <cmath>
#include <fstream>

namespace zarn::testsupport {

Decorate PutAt(const Place& place) {
  return [place](GDALDataset& dataset) {
    double transform[6] = {place.left, place.pixel, 0, place.top, 0, -place.pixel};
    dataset.SetGeoTransform(transform);
    OGRSpatialReference system;
    if (place.epsg != 0 && system.importFromEPSG(place.epsg) == OGRERR_NONE) {
      dataset.SetSpatialRef(&system);
    }
    for (int band = 1; band <= dataset.GetRasterCount(); ++band) {
      dataset.GetRasterBand(band)->SetNoDataValue(0);
    }
  };
}

double GroundAt(double x, double y, int band) {
  return 0.5 * std::sin(x / 17 + band) * std::cos(y / 13 - band) +
         0.5 * std::sin((x + 2 * y) / 41 + 2 * band);
}

Image Paint(int width, int height, int bands, GDALDataType type, const Place& place,
            const std::function<double(double x, double y, int band)>& value) {
  Image image(width, height, bands, type);
  for (int row = 0; row < height; ++row) {
    for (int column = 0; column < width; ++column) {
      const double x = place.left + (column + 0.5) * place.pixel;
      const double y = place.top - (row + 0.5) * place.pixel;
      for (int band = 0; band < bands; ++band) image.At(column, row, band) = value(x, y, band);
    }
  }
  return image;
}

nlohmann::json ReadJson(const std::string& file) {
  std::ifstream stream(file);
  return nlohmann::json::parse(stream);
}

}  // namespace zarn::testsupport
