// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/cellmeans.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace zarn::app {

std::int64_t CellLattice::Column(double x) const {
  return static_cast<std::int64_t>(std::floor((x - left) / cellWidth));
}

std::int64_t CellLattice::Row(double y) const {
  return static_cast<std::int64_t>(std::floor((top - y) / cellHeight));
}

CellMeans::CellMeans(const CellLattice& lattice, const Ground& ground, const Extent& part,
                     std::size_t channels)
    : lattice_(lattice),
      ground_(ground),
      channels_(channels),
      firstColumn_(lattice.Column(part.left)),
      firstRow_(lattice.Row(part.top)),
      columns_(part.Empty() ? 0 : lattice.Column(part.right) - firstColumn_ + 1),
      rows_(part.Empty() ? 0 : lattice.Row(part.bottom) - firstRow_ + 1),
      counts_(static_cast<std::size_t>(columns_ * rows_)) {
  sums_.resize(counts_.size() * channels_);
}

void CellMeans::Add(const PixelRun& run) {
  const double row = static_cast<double>(run.y) + 0.5;
  for (std::size_t i = 0; i < run.count; ++i) {
    if (run.valid[i] == 0) continue;
    const double column = static_cast<double>(run.x) + static_cast<double>(i) + 0.5;
    const std::int64_t cellColumn = lattice_.Column(ground_.X(column, row));
    const std::int64_t cellRow = lattice_.Row(ground_.Y(column, row));
    if (!Holds(cellColumn, cellRow)) continue;
    const std::size_t cell = Index(cellColumn, cellRow);
    ++counts_[cell];
    for (std::size_t c = 0; c < channels_; ++c) {
      sums_[cell * channels_ + c] += run.samples[i * channels_ + c];
    }
  }
}

void CellMeans::Finish() {
  const double whole = lattice_.cellWidth * lattice_.cellHeight / ground_.PixelArea();
  for (std::size_t cell = 0; cell < counts_.size(); ++cell) {
    if (counts_[cell] < 0.5 * whole) counts_[cell] = 0;
    for (std::size_t c = 0; c < channels_ && counts_[cell] > 0; ++c) {
      sums_[cell * channels_ + c] /= counts_[cell];
    }
  }
}

const double* CellMeans::At(std::int64_t column, std::int64_t row) const {
  if (!Holds(column, row)) return nullptr;
  const std::size_t cell = Index(column, row);
  return counts_[cell] > 0 ? &sums_[cell * channels_] : nullptr;
}

OverlapLattice ChooseLattice(const std::vector<Ground>& grounds, std::size_t channels, int side) {
  constexpr double kUsualSide = 8;
  constexpr double kEnoughCells = 4000;
  constexpr double kMostBytes = 64 << 20;
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  constexpr Extent kNowhere{kInfinity, kInfinity, -kInfinity, -kInfinity};

  OverlapLattice result{{}, 0, std::vector<Extent>(grounds.size(), kNowhere)};
  double smallest = kInfinity;
  for (std::size_t i = 0; i < grounds.size(); ++i) {
    for (std::size_t j = 0; j < i; ++j) {
      const Extent common = Intersection(grounds[i].Bounds(), grounds[j].Bounds());
      if (common.Empty()) continue;
      smallest = std::min(smallest, common.Area());
      result.parts[i] = Union(result.parts[i], common);
      result.parts[j] = Union(result.parts[j], common);
    }
  }
  double pixelWidth = 0;
  double pixelHeight = 0;
  double needed = 0;
  for (std::size_t i = 0; i < grounds.size(); ++i) {
    pixelWidth = std::max(pixelWidth, grounds[i].PixelWidth());
    pixelHeight = std::max(pixelHeight, grounds[i].PixelHeight());
    needed += result.parts[i].Area();
  }
  const double pixel = pixelWidth * pixelHeight;
  const double usual = std::floor(std::sqrt(smallest / pixel / kEnoughCells));
  const double cellBytes = static_cast<double>(channels + 1) * sizeof(double);
  const double least = std::ceil(std::sqrt(needed / pixel * cellBytes / kMostBytes));
  result.side = std::max(side > 0 ? side : std::clamp(usual, 1.0, kUsualSide), least);
  result.lattice = {grounds.front().Bounds().left, grounds.front().Bounds().top,
                    result.side * pixelWidth, result.side * pixelHeight};
  return result;
}

std::vector<CellPair> CommonCells(const CellMeans& a, const CellMeans& b) {
  std::vector<CellPair> pairs;
  const std::int64_t right = std::min(a.FirstColumn() + a.Columns(), b.FirstColumn() + b.Columns());
  const std::int64_t bottom = std::min(a.FirstRow() + a.Rows(), b.FirstRow() + b.Rows());
  for (std::int64_t row = std::max(a.FirstRow(), b.FirstRow()); row < bottom; ++row) {
    for (std::int64_t column = std::max(a.FirstColumn(), b.FirstColumn()); column < right;
         ++column) {
      const CellPair pair{a.Lattice().CentreX(column), a.Lattice().CentreY(row), a.At(column, row),
                          b.At(column, row)};
      if (pair.first != nullptr && pair.second != nullptr) pairs.push_back(pair);
    }
  }
  return pairs;
}

}  // namespace zarn::app
