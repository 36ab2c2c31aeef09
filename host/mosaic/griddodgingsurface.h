// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

#include "host/hostexport.h"
#include "host/mosaic/mosdodgingsurface.h"

/// Nodes of a surface and where they lie in the mosaic.
struct DodgingGrid {
  unsigned columns = 1;  ///< at least 1
  unsigned rows = 1;     ///< at least 1
  unsigned channels = 1;
  double originX = 0.0;  ///< pixel column of the first node
  double originY = 0.0;  ///< pixel row of the first node
  double stepX = 1.0;    ///< pixels from node to node, not 0
  double stepY = 1.0;
  std::vector<float> values;  ///< row by row, channels interleaved
};

/// A surface that is bilinear between the nodes of a grid and continues its border outwards.
///
/// With (u, v) the position in steps from the first node, held within the grid, i and j their whole
/// and s and t their fractional parts: two interpolations along the column, `a + (b - a) * t`, and
/// one between their results with s, all in double.
class ZARN_HOST_EXPORT GridDodgingSurface : public MOSDodgingSurface {
 public:
  /// Throws `DataException` when the grid has no nodes, a step is 0 or not finite, or the number of
  /// values does not match.
  explicit GridDodgingSurface(DodgingGrid grid);

  std::size_t ByteSize() const override;
  unsigned Channels() const override;
  void GetBilinearValue(unsigned column, unsigned row, float* values) const override;
  void GetBilinearRun(unsigned column, unsigned row, unsigned count, float* values,
                      unsigned pitch) const override;

 private:
  unsigned EndOfCell(unsigned column, unsigned k, unsigned count, std::size_t node) const;

  DodgingGrid grid_;
};
