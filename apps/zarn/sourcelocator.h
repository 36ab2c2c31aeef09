// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/outputgrid.h"

namespace zarn::app {

/// Finds the places of a raster that belong to places of another grid: through the raster's
/// geotransform, control points, geolocation arrays or RPC model, and from one coordinate system to
/// another. For one thread at a time.
class SourceLocator {
 public:
  /// `crs` is the coordinate system of the output; null: that of the source.
  /// `rpcDem` is a raster of heights for the RPC model, or empty. Throws `UsageError` for
  /// heights that the source does not ask for, `RunError` for a source that does not say where it
  /// lies, or not in which coordinate system although another one is asked for.
  SourceLocator(const RasterSource& source, const OGRSpatialReference* crs,
                const std::string& rpcDem);

  /// The grid that covers the source, with about as many pixels along its diagonal.
  OutputGrid SuggestGrid() const;
  /// The coordinate system of the output; empty when the source has none.
  const OGRSpatialReference& Crs() const { return crs_; }
  /// Chooses the grid that `Locate` refers to.
  void SetGrid(const OutputGrid& grid);
  /// Turns positions in the grid, counted from the corner of its first pixel, into positions in the
  /// source. Those that have none become NaN.
  void Locate(std::vector<double>& x, std::vector<double>& y) const;

 private:
  struct Destroyer {
    void operator()(void* transformer) const;
  };

  const RasterSource& source_;
  OGRSpatialReference crs_;
  std::unique_ptr<void, Destroyer> transformer_;
};

}  // namespace zarn::app
