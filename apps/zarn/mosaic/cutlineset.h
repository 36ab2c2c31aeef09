// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/mosaic/mosaicplan.h"

namespace zarn::app {

/// Gives each scene its polygons of a vector file: those whose field `field` (empty: "scene") holds
/// the scene's label, the name of its file or its path. They are brought into the coordinate system
/// of `mosaic` and into its pixels. Throws `UsageError` when there is no such field, `RunError`
/// when a scene has no polygon, or one that misses it.
void AssignCutlines(const std::string& file, const std::string& field, const RasterSource& mosaic,
                    std::vector<ScenePlan>& scenes);

}  // namespace zarn::app
