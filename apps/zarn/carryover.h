// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gdal_priv.h>

#include <vector>

#include "apps/zarn/dataset.h"

namespace zarn::app {

/// Gives `output`, whose bands are those of `source` in the same order, the georeference, metadata,
/// band descriptions, colours and mask band of `source`, and declares `noData` (one value per
/// channel, or none). To be done before the first pixel is written, because formats place it all in
/// front of the pixels.
void CarryOver(const RasterSource& source, const std::vector<double>& noData, GDALDataset& output);

}  // namespace zarn::app
