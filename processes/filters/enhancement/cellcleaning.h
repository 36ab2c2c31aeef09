// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/enhancement/cellgrid.h"

namespace zarn::processes::filters {

/// Makes valid cells invalid that differ from the valid ones among the 5 x 5 cells around them. The
/// measure is the logarithm of the gain: in a channel the cell's lies more than four robust
/// standard deviations (of the median absolute deviation, and of at least a tenth) from their
/// median. Cells with fewer than six such neighbours stay. All are judged by the statuses from
/// before the pass.
void RunLocalFilter(CellGrid& grid);

/// Parts the logarithms of the valid cells' gains, all channels together, into two clusters (two
/// means) and makes the smaller cluster invalid when it has less than a tenth of the cells and its
/// mean lies more than four standard deviations of the clusters (at least a tenth) from the other.
void RunGlobalFilter(CellGrid& grid);

/// Gives invalid cells and those without data, and masked ones if asked for, the means of gain and
/// offset of the nearest valid cells in the eight directions of the compass, by the inverse of
/// their squared distances. A cell that sees none gets the values of the closest one, and the
/// host's debug messages tell of it. Throws `DataException` when there is no valid cell.
void InterpolateCells(CellGrid& grid, bool fillsMasked);

}  // namespace zarn::processes::filters
