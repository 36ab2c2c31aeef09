// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "host/ogc/cs/geocodinginfo.h"

namespace zarn::datasources {

/// One class of a raster whose samples are classes: the entry's index is the sample.
struct RasterClass {
  std::string name;
  std::uint8_t red = 0;
  std::uint8_t green = 0;
  std::uint8_t blue = 0;

  bool operator==(const RasterClass&) const = default;
};

/// What goes with the samples of a raster.
struct AuxiliaryData {
  ogc::cs::GeocodingInfo geocoding;
  std::map<std::string, std::string> metadata;
  std::vector<RasterClass> classes;  ///< empty unless the samples are classes

  bool operator==(const AuxiliaryData&) const = default;
};

}  // namespace zarn::datasources
