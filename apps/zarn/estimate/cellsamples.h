// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/estimate/pixelscan.h"

namespace zarn::app {

/// What lies in one cell of an image: positions are pixels of that image.
struct CellSummary {
  std::size_t cell;  ///< the cell's number
  double column;     ///< of the mean valid sample
  double row;
  std::vector<double> medians;     ///< per channel
  std::vector<double> deviations;  ///< per channel, robust
};

/// Cells that an image is cut into, and samples spread evenly over each of them: some hundreds,
/// however large the cell. Medians of cells ignore what is small (houses, cars, outliers).
class CellSamples {
 public:
  /// Samples an image whose pixels lie at `own` in the cells of the image at `frame`.
  CellSamples(const Ground& frame, const WindowSize& frameSize, const Ground& own,
              std::size_t channels);

  void Add(const PixelRun& run);
  /// Of the cells of which at least half is valid.
  std::vector<CellSummary> Summaries() const;

 private:
  struct Cell {
    double columns = 0;  // sums
    double rows = 0;
    std::vector<float> samples;
  };

  Ground frame_;
  Ground own_;
  std::size_t channels_;
  std::int64_t side_;
  std::int64_t columns_;
  std::int64_t rows_;
  std::int64_t stride_;
  std::size_t whole_;  ///< samples of a cell that is valid everywhere
  std::vector<Cell> cells_;
};

}  // namespace zarn::app
