// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "apps/zarn/mosaic/seampolygons.h"
#include "apps/zarn/outputgrid.h"

namespace zarn::app {

/// Writes a GeoPackage with one layer, `cutlines`: for each scene a MultiPolygon in the coordinate
/// system of `grid`, with the fields `scene` (its name) and `order` (1, 2, ... in the order of
/// `polygons`). A scene that shows nowhere has an empty one. The file appears at `target` when it
/// is whole.
///
/// Throws `RunError` when the target exists (unless `overwrite`) or cannot be written, and
/// `UsageError` when it is a file of a raster that is open.
void WriteCutlines(const std::string& target, bool overwrite, const OutputGrid& grid,
                   const std::vector<std::string>& sceneNames,
                   const std::vector<ScenePolygon>& polygons);

}  // namespace zarn::app
