// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/imagefilter.h"
#include "apps/zarn/mosaic/mosaicplan.h"
#include "apps/zarn/outputgrid.h"
#include "apps/zarn/windows.h"
#include "host/nspio/counter.h"

namespace zarn::app {

/// A scene on a coarse lattice: one pixel for each cell, the one in its middle.
struct SurveyedScene {
  std::string name;
  Window area;                      ///< cells of the lattice
  std::vector<std::byte> samples;   ///< pixel-interleaved, of the scene's type
  std::vector<std::uint8_t> valid;  ///< 0: no data
};

/// The scenes of a mosaic on one lattice, small enough to be held in memory: what corrections and
/// seams are derived from. Only hot spots are removed.
struct Survey {
  OutputGrid lattice;
  int step = 1;  ///< pixels of the mosaic along a cell
  SampleType type;
  std::size_t channels = 0;
  std::vector<SurveyedScene> scenes;

  /// A scene as a raster in memory on the mosaic's map, with a mask.
  RasterSource Raster(std::size_t scene) const;
};

/// A lattice over a grid with at most some millions of cells.
Survey LaySurvey(const OutputGrid& grid, const RasterSource& like);

/// The cells that a window of the mosaic touches.
Window CellsOf(const Survey& survey, const Window& pixels);

/// Reads the scenes, some of them at a time, and appends them to `survey` in their order. Scenes
/// are placed on the lattice by their georeference. Throws `RunError`.
void TakeSurvey(const std::vector<ScenePlan>& scenes, const WorkOptions& work, Survey& survey,
                nspio::Counter& progress);

}  // namespace zarn::app
