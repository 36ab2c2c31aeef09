// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <utility>
#include <vector>

#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/estimate/pixelscan.h"

namespace zarn::app {

/// Cells of equal size on the map, on which images of different grids are compared. A mean over
/// many pixels hardly changes when an image is a fraction of a pixel out of place, and its noise is
/// small.
struct CellLattice {
  double left = 0;
  double top = 0;
  double cellWidth = 1;
  double cellHeight = 1;

  std::int64_t Column(double x) const;
  std::int64_t Row(double y) const;
  double CentreX(std::int64_t column) const {
    return left + (static_cast<double>(column) + 0.5) * cellWidth;
  }
  double CentreY(std::int64_t row) const {
    return top - (static_cast<double>(row) + 0.5) * cellHeight;
  }
};

/// The means of one image in the cells of a part of a lattice.
class CellMeans {
 public:
  CellMeans(const CellLattice& lattice, const Ground& ground, const Extent& part,
            std::size_t channels);

  /// Pixels belong to the cell in which their centre lies.
  void Add(const PixelRun& run);
  /// To be called after the last `Add`: gives up cells of which less than half was valid.
  void Finish();

  const CellLattice& Lattice() const { return lattice_; }
  std::int64_t FirstColumn() const { return firstColumn_; }
  std::int64_t FirstRow() const { return firstRow_; }
  std::int64_t Columns() const { return columns_; }
  std::int64_t Rows() const { return rows_; }
  /// The channels' means in a cell of the lattice, or null where there are none.
  const double* At(std::int64_t column, std::int64_t row) const;

 private:
  std::size_t Index(std::int64_t column, std::int64_t row) const {
    return static_cast<std::size_t>((row - firstRow_) * columns_ + column - firstColumn_);
  }
  bool Holds(std::int64_t column, std::int64_t row) const {
    return column >= firstColumn_ && column - firstColumn_ < columns_ && row >= firstRow_ &&
           row - firstRow_ < rows_;
  }

  CellLattice lattice_;
  Ground ground_;
  std::size_t channels_;
  std::int64_t firstColumn_;
  std::int64_t firstRow_;
  std::int64_t columns_;
  std::int64_t rows_;
  std::vector<double> sums_;  // after `Finish` means
  std::vector<std::uint32_t> counts_;
};

/// The lattice for comparing images where they overlap, and the part of it that each of them needs.
struct OverlapLattice {
  CellLattice lattice;
  double side;                ///< of a cell, in pixels of the coarsest image
  std::vector<Extent> parts;  ///< empty for an image that overlaps no other
};

/// A cell is 8 pixels of the coarsest image wide and high, or `side` where it is not 0; fewer where
/// the smallest overlap would have few cells, more where all cells would not fit into memory.
OverlapLattice ChooseLattice(const std::vector<Ground>& grounds, std::size_t channels, int side);

/// The means of two images in a cell that both have: channel by channel.
struct CellPair {
  double x;  ///< centre, map coordinates
  double y;
  const double* first;
  const double* second;
};
std::vector<CellPair> CommonCells(const CellMeans& a, const CellMeans& b);

}  // namespace zarn::app
