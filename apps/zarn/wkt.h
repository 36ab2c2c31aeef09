// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <ogr_spatialref.h>

#include <string>

namespace zarn::app {

/// A coordinate system as WKT of 2018; empty when there is none.
std::string WktOf(const OGRSpatialReference& crs);

}  // namespace zarn::app
