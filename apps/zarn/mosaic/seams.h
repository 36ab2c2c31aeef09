// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "apps/zarn/windows.h"
#include "host/nspio/counter.h"

namespace zarn::app {

/// A scene as the search for seams sees it: one value per cell of a lattice that covers the mosaic.
struct SceneView {
  Window area;                      ///< the cells that the view holds, within the lattice
  std::size_t channels = 0;         ///< the same for all scenes
  std::vector<float> colours;       ///< [row][column][channel] of `area`; anything where not valid
  std::vector<std::uint8_t> valid;  ///< [row][column] of `area`; 0: the scene has no data there
};

struct SeamOptions {
  /// Cells that both scenes should reach beyond a seam, where their common area is wide enough.
  double feather = 0;
  /// Islands of fewer cells go to the scene around them, if that has data there.
  std::size_t smallestIsland = 8;
  /// Common areas of more cells are solved on coarser cells first and then refined in a band around
  /// that seam.
  std::size_t exactCells = 1 << 13;
};

/// Which scene (its index) shows in each cell, [row][column] of the lattice.
///
/// The scenes are inserted one after the other. Where both the mosaic so far and the new scene are
/// valid, a minimum cut decides between them, so that a sum over the seam is as small as possible.
/// A unit of the seam's length costs the mean of what the cells on its two sides cost:
///  - the difference of the two scenes there: of each channel, in units of the median difference
///    in the common area, at most 16; averaged over the channels;
///  - a constant, so that seams over equal ground are short;
///  - more the nearer the edge of the common area is, so that there is room for a feather.
/// A cell of the common area does not pass to one scene right beside a cell in which only the
/// other is valid, unless all else is dearer.
///
/// No scene vanishes because others cover its ground: a new scene with nothing (less than a
/// hundredth) of its own gets the core of its area, the cells that are at least half as far from
/// its edge as the innermost one; and a scene whose part lies wholly within the new one's area
/// keeps the core of that part (beside the new one's core, unless it lies wholly within that). But
/// a scene with the area of an earlier one gets nothing, as the least visible seam is none.
///
/// Cells in which no scene is valid get the scene that shows in the nearest cell with data, so that
/// an area ends well outside the data. Ties go to the lower index. Without any data all cells are
/// 0. `scenes` must not be empty. The result depends on nothing but the arguments.
std::vector<std::uint32_t> FindSeams(const std::vector<SceneView>& scenes, WindowSize lattice,
                                     const SeamOptions& options, nspio::Counter& progress);

/// How well two scenes agree along their common seam.
struct SeamResidual {
  std::uint32_t first = 0;  ///< the scenes, first < second
  std::uint32_t second = 0;
  std::int64_t length = 0;  ///< edges of cells that have one scene on either side
  std::int64_t cells =
      0;  ///< within 2 cells of the seam (across at most two edges) with both valid
  /// Per channel, over those cells, of `second` - `first`; 0 where there are none.
  std::vector<double> meanDifference;
  std::vector<double> rootMeanSquare;
};

/// One for each pair of scenes that have a seam, in the order of the pairs. `labels` as `FindSeams`
/// returns them; cells with `kNoLabel` have no seams.
std::vector<SeamResidual> SeamResiduals(const std::vector<std::uint32_t>& labels,
                                        WindowSize lattice, const std::vector<SceneView>& scenes);

}  // namespace zarn::app
