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
/// when a scene has no polygon, shares it with another one of the same name, or is missed by it,
/// which is nothing wrong where the mosaic shows only a part of the scenes (`partial`).
void AssignCutlines(const std::string& file, const std::string& field, const RasterSource& mosaic,
                    bool partial, std::vector<ScenePlan>& scenes);

}  // namespace zarn::app
