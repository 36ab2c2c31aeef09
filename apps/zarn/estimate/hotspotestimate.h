// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/estimate/hotspotfit.h"
#include "host/nspio/counter.h"

namespace zarn::app {

struct HotSpotEstimate {
  std::size_t cells = 0;           ///< that it rests on
  std::vector<QuadraticFit> fits;  ///< per channel, the mean over the valid pixels being 0
};

/// The hot spot of the first of `sources`, in its own columns and rows divided by its size. A
/// second source is a reference without the hot spot; without one, up to `classes` kinds of land
/// cover are told apart. Reads the image once. Throws `RunError` when there are too few cells for a
/// fit.
HotSpotEstimate EstimateHotSpot(const std::vector<RasterSource>& sources,
                                const std::string& srcNoData, std::size_t classes,
                                nspio::Counter& progress);

}  // namespace zarn::app
