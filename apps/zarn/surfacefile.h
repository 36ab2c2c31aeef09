// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>

#include "apps/zarn/dataset.h"
#include "host/mosaic/mosdodgingsurface.h"

namespace zarn::app {

/// Reads a dodging surface for the pixels of `image`: a raster whose pixel centres are the nodes,
/// placed by its georeference (in pixels of the image where the image has none), with a band for
/// each channel or one for all. Throws `RunError` when it does not fit the image, is turned against
/// it, or has nodes without a value.
std::unique_ptr<MOSDodgingSurface> ReadDodgingSurface(const std::string& name,
                                                      const RasterSource& image);

}  // namespace zarn::app
