// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gdal_priv.h>

#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/outputgrid.h"

namespace zarn::app {

/// Whether an output like `source` tells pixels without data by a mask: where the source does, and
/// where there is nothing else to tell them by.
bool NeedsMask(const RasterSource& source, const std::vector<double>& noData);

/// Gives `output`, whose bands are those of `source` in the same order, the georeference, metadata,
/// band descriptions and colours of `source`, and declares `noData` (one value per channel, or
/// none). With `grid` the output lies on it; what places the pixels of `source` is not carried over
/// then.
void Describe(const RasterSource& source, const std::vector<double>& noData, GDALDataset& output,
              const OutputGrid* grid = nullptr);

/// Besides describing it gives `output` a mask band if `source` has one, or if it is to be
/// `masked`. To be done before the first pixel is written, because formats place it all in front of
/// the pixels.
void CarryOver(const RasterSource& source, const std::vector<double>& noData, GDALDataset& output,
               const OutputGrid* grid = nullptr, bool masked = false);

}  // namespace zarn::app
