// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

#include "apps/zarn/estimate/cellmeans.h"
#include "apps/zarn/estimate/gainoffsetnetwork.h"
#include "apps/zarn/estimate/ground.h"
#include "host/mosaic/griddodgingsurface.h"

namespace zarn::app {

/// Corrections that vary over an image: value -> (value - pivot) * gain + pivot + offset, gain and
/// offset being surfaces.
struct DodgingFit {
  std::vector<double> pivots;  ///< per channel
  DodgingGrid gains;
  DodgingGrid offsets;
};

/// An empty grid of about `nodes` nodes along the longer side of an image, each in the middle of
/// its share of the image.
DodgingGrid LayGrid(const WindowSize& image, std::size_t channels, int nodes);

/// Surfaces that bring an image onto a reference. Around every node, as far as its neighbours, the
/// robust means of the common cells are made to agree, and the contrasts as `GainLimits` say.
/// Neighbouring nodes are tied to each other, which evens out chance and carries the correction to
/// where nothing is known. In `cells` the reference comes first; `ground` is that of the image.
DodgingFit FitDodging(const std::vector<CellPair>& cells, const Ground& ground,
                      const DodgingGrid& grid, const GainLimits& limits);

}  // namespace zarn::app
