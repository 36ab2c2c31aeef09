// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <limits>
#include <vector>

#include "apps/zarn/windows.h"

namespace zarn::app {

/// A cell that has no label yet.
inline constexpr std::uint32_t kNoLabel = std::numeric_limits<std::uint32_t>::max();

/// How far each marked cell is from the nearest cell that is not, in fifths of a cell: chains of
/// steps to the sides (5) and over corners (7), within 5 % of the straight way. Beyond the lattice
/// everything counts as marked; where all cells are, the distance is more than any real one. 0 for
/// cells that are not marked.
std::vector<std::int32_t> DistanceToUnmarked(const std::vector<std::uint8_t>& marked,
                                             WindowSize lattice);

/// Gives each cell without label that of the nearest cell with one, the lower of two that are
/// equally near; all get 0 when none has a label.
void FillFromNearest(std::vector<std::uint32_t>& labels, WindowSize lattice);

/// Gives islands (cells of a label that hang together by their sides) of fewer than `smallest`
/// cells to the label with which they share most of their border, if `canTake(cell, label)` for all
/// their cells, otherwise to the next.
void MergeIslands(std::vector<std::uint32_t>& labels, WindowSize lattice, std::size_t smallest,
                  const std::function<bool(std::size_t cell, std::uint32_t label)>& canTake);

}  // namespace zarn::app
