// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/enhancement/cellcleaning.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <sstream>
#include <string>
#include <vector>

#include "host/core/exception.h"
#include "host/nspio/debugger.h"

namespace zarn::processes::filters {
namespace {

constexpr double kLeastSpread = 0.1;  // of the logarithms: cells alike to a tenth are alike
constexpr double kMostSpreads = 4;

// Gains that rise have one; all others are infinitely far from any.
double LogOfGain(const CellGrid& grid, std::size_t cell, int channel) {
  const double gain = grid.Gain(cell, channel);
  return gain > 0 ? std::log(gain) : -std::numeric_limits<double>::infinity();
}

std::vector<std::size_t> ValidCells(const CellGrid& grid) {
  std::vector<std::size_t> cells;
  for (std::size_t cell = 0; cell < grid.CellCount(); ++cell) {
    if (grid.IsValid(cell)) cells.push_back(cell);
  }
  return cells;
}

void Invalidate(CellGrid& grid, const std::vector<std::size_t>& cells) {
  for (const std::size_t cell : cells) grid.SetStatus(cell, CellStatus::kInvalid);
}

double Median(std::vector<double>& values) {
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

std::vector<std::size_t> ValidNeighbours(const CellGrid& grid, std::size_t cell) {
  constexpr int kReach = 2;
  const int row = grid.RowOf(cell);
  const int column = grid.ColumnOf(cell);
  std::vector<std::size_t> neighbours;
  for (int r = std::max(0, row - kReach); r <= std::min(grid.Rows() - 1, row + kReach); ++r) {
    for (int c = std::max(0, column - kReach); c <= std::min(grid.Columns() - 1, column + kReach);
         ++c) {
      const std::size_t neighbour = grid.Cell(r, c);
      if (neighbour != cell && grid.IsValid(neighbour)) neighbours.push_back(neighbour);
    }
  }
  return neighbours;
}

bool DiffersFrom(const CellGrid& grid, std::size_t cell, const std::vector<std::size_t>& others) {
  constexpr double kSigmasOfDeviation = 1.4826;  // of a normal distribution
  for (int c = 0; c < grid.Channels(); ++c) {
    std::vector<double> logs(others.size());
    std::transform(others.begin(), others.end(), logs.begin(),
                   [&](std::size_t other) { return LogOfGain(grid, other, c); });
    const double median = Median(logs);
    for (double& value : logs) value = std::abs(value - median);
    const double spread = std::max(kSigmasOfDeviation * Median(logs), kLeastSpread);
    if (!(std::abs(LogOfGain(grid, cell, c) - median) <= kMostSpreads * spread)) return true;
  }
  return false;
}

// Points of as many dimensions as there are channels.
struct Cluster {
  std::vector<double> mean;
  std::size_t count = 0;
};

double SquaredDistance(const double* a, const double* b, std::size_t dimensions) {
  double sum = 0;
  for (std::size_t i = 0; i < dimensions; ++i) sum += (a[i] - b[i]) * (a[i] - b[i]);
  return sum;
}

class TwoMeans {
 public:
  TwoMeans(std::vector<double> points, std::size_t dimensions)
      : points_(std::move(points)),
        dimensions_(dimensions),
        sides_(points_.size() / dimensions),
        clusters_{Cluster{.mean = Extreme(std::less<>())},
                  Cluster{.mean = Extreme(std::greater<>())}} {
    constexpr int kMostRounds = 100;
    for (int round = 0; round < kMostRounds && Assign(); ++round) MoveMeans();
  }

  std::size_t Count(int side) const { return clusters_[static_cast<std::size_t>(side)].count; }
  int SideOf(std::size_t point) const { return sides_[point]; }
  double Distance() const {
    return std::sqrt(
        SquaredDistance(clusters_[0].mean.data(), clusters_[1].mean.data(), dimensions_));
  }
  // Root of the mean squared distance of the points to the mean of their cluster.
  double Spread() const {
    double sum = 0;
    for (std::size_t i = 0; i < sides_.size(); ++i) {
      sum += SquaredDistance(Point(i), MeanOf(sides_[i]), dimensions_);
    }
    return std::sqrt(sum / static_cast<double>(sides_.size()));
  }

 private:
  const double* Point(std::size_t i) const { return points_.data() + i * dimensions_; }
  const double* MeanOf(int side) const {
    return clusters_[static_cast<std::size_t>(side)].mean.data();
  }

  // The point with the least or the greatest sum.
  template <typename Order>
  std::vector<double> Extreme(Order before) const {
    std::size_t best = 0;
    double bestSum = 0;
    for (std::size_t i = 0; i < sides_.size(); ++i) {
      double sum = 0;
      for (std::size_t c = 0; c < dimensions_; ++c) sum += Point(i)[c];
      if (i == 0 || before(sum, bestSum)) {
        best = i;
        bestSum = sum;
      }
    }
    return {Point(best), Point(best) + dimensions_};
  }

  // Whether any point went to the other side.
  bool Assign() {
    bool anyMoved = false;
    for (Cluster& cluster : clusters_) cluster.count = 0;
    for (std::size_t i = 0; i < sides_.size(); ++i) {
      const bool second = SquaredDistance(Point(i), MeanOf(1), dimensions_) <
                          SquaredDistance(Point(i), MeanOf(0), dimensions_);
      const int side = second ? 1 : 0;
      anyMoved |= side != sides_[i];
      sides_[i] = side;
      ++clusters_[second ? 1 : 0].count;
    }
    return anyMoved;
  }

  void MoveMeans() {
    for (Cluster& cluster : clusters_) {
      if (cluster.count > 0) std::fill(cluster.mean.begin(), cluster.mean.end(), 0.0);
    }
    for (std::size_t i = 0; i < sides_.size(); ++i) {
      Cluster& cluster = clusters_[static_cast<std::size_t>(sides_[i])];
      for (std::size_t c = 0; c < dimensions_; ++c) {
        cluster.mean[c] += Point(i)[c] / static_cast<double>(cluster.count);
      }
    }
  }

  std::vector<double> points_;
  std::size_t dimensions_;
  std::vector<int> sides_;
  std::array<Cluster, 2> clusters_;
};

// The nearest valid cell in one direction from every cell, or `kNone`.
constexpr std::size_t kNone = std::numeric_limits<std::size_t>::max();
std::vector<std::size_t> NearestAlong(const CellGrid& grid, int dx, int dy) {
  std::vector<std::size_t> nearest(grid.CellCount(), kNone);
  const auto visit = [&](int row, int column) {
    if (!grid.Contains(row + dy, column + dx)) return;
    const std::size_t next = grid.Cell(row + dy, column + dx);
    nearest[grid.Cell(row, column)] = grid.IsValid(next) ? next : nearest[next];
  };
  // From the side on which the direction ends, so that the next cell is always known.
  for (int i = 0; i < grid.Rows(); ++i) {
    const int row = dy > 0 ? grid.Rows() - 1 - i : i;
    for (int j = 0; j < grid.Columns(); ++j) visit(row, dx > 0 ? grid.Columns() - 1 - j : j);
  }
  return nearest;
}

double SquaredDistance(const CellGrid& grid, std::size_t a, std::size_t b) {
  const double rows = grid.RowOf(a) - grid.RowOf(b);
  const double columns = grid.ColumnOf(a) - grid.ColumnOf(b);
  return rows * rows + columns * columns;
}

void TellOfClosest(const CellGrid& grid, std::size_t cell, double distance) {
  if (nspio::Debugger::moDebugLevel <= 0) return;
  std::ostringstream text;
  text << "There were no valid GeoLUTs found from point " << grid.ColumnOf(cell) << ", "
       << grid.RowOf(cell) << ". (Distance of closest Valid GeoLUT was " << distance << ")";
  nspio::Debugger::Debug(text.str(), 1, "zarn_filters",
                         "processes/filters/enhancement/cellcleaning", __LINE__);
}

class WeightedCells {
 public:
  explicit WeightedCells(int channels) : sums_(static_cast<std::size_t>(channels)) {}

  void Clear() {
    std::fill(sums_.begin(), sums_.end(), Sum{});
    weights_ = 0;
  }
  bool Empty() const { return weights_ == 0; }
  void Add(const CellGrid& grid, std::size_t cell, double weight) {
    for (int c = 0; c < grid.Channels(); ++c) {
      sums_[static_cast<std::size_t>(c)].gain += weight * grid.Gain(cell, c);
      sums_[static_cast<std::size_t>(c)].offset += weight * grid.Offset(cell, c);
    }
    weights_ += weight;
  }
  void SetMean(CellGrid& grid, std::size_t cell) const {
    for (int c = 0; c < grid.Channels(); ++c) {
      const Sum& sum = sums_[static_cast<std::size_t>(c)];
      grid.Set(cell, c, static_cast<float>(sum.gain / weights_),
               static_cast<float>(sum.offset / weights_));
    }
  }

 private:
  struct Sum {
    double gain = 0;
    double offset = 0;
  };
  std::vector<Sum> sums_;
  double weights_ = 0;
};

}  // namespace

void RunLocalFilter(CellGrid& grid) {
  constexpr std::size_t kLeastNeighbours = 6;
  std::vector<std::size_t> outliers;
  for (const std::size_t cell : ValidCells(grid)) {
    const std::vector<std::size_t> neighbours = ValidNeighbours(grid, cell);
    if (neighbours.size() >= kLeastNeighbours && DiffersFrom(grid, cell, neighbours)) {
      outliers.push_back(cell);
    }
  }
  Invalidate(grid, outliers);
}

void RunGlobalFilter(CellGrid& grid) {
  constexpr std::size_t kLeastShare = 10;  // the smaller cluster has one in so many cells
  const auto dimensions = static_cast<std::size_t>(grid.Channels());
  if (dimensions == 0) return;
  std::vector<std::size_t> cells;
  std::vector<double> points;
  for (const std::size_t cell : ValidCells(grid)) {
    std::vector<double> logs(dimensions);
    for (std::size_t c = 0; c < dimensions; ++c) {
      logs[c] = LogOfGain(grid, cell, static_cast<int>(c));
    }
    if (!std::all_of(logs.begin(), logs.end(), [](double v) { return std::isfinite(v); })) continue;
    cells.push_back(cell);
    points.insert(points.end(), logs.begin(), logs.end());
  }
  if (cells.empty()) return;
  const TwoMeans clusters(std::move(points), dimensions);
  const int smaller = clusters.Count(1) < clusters.Count(0) ? 1 : 0;
  const bool isFar = clusters.Distance() > kMostSpreads * std::max(clusters.Spread(), kLeastSpread);
  if (!isFar || clusters.Count(smaller) * kLeastShare >= cells.size()) return;
  for (std::size_t i = 0; i < cells.size(); ++i) {
    if (clusters.SideOf(i) == smaller) grid.SetStatus(cells[i], CellStatus::kInvalid);
  }
}

void InterpolateCells(CellGrid& grid, bool fillsMasked) {
  const std::vector<std::size_t> valid = ValidCells(grid);
  if (valid.empty()) throw DataException("There are no Valid GeoLUTs in this image!");
  std::vector<std::vector<std::size_t>> nearest;
  for (int dy = -1; dy <= 1; ++dy) {
    for (int dx = -1; dx <= 1; ++dx) {
      if (dx != 0 || dy != 0) nearest.push_back(NearestAlong(grid, dx, dy));
    }
  }
  WeightedCells mean(grid.Channels());
  for (std::size_t cell = 0; cell < grid.CellCount(); ++cell) {
    if (grid.IsValid(cell)) continue;
    if (grid.Status(cell) == CellStatus::kMasked && !fillsMasked) continue;
    mean.Clear();
    for (const std::vector<std::size_t>& along : nearest) {
      if (along[cell] != kNone) {
        mean.Add(grid, along[cell], 1 / SquaredDistance(grid, cell, along[cell]));
      }
    }
    if (mean.Empty()) {
      const std::size_t closest =
          *std::min_element(valid.begin(), valid.end(), [&](std::size_t a, std::size_t b) {
            return SquaredDistance(grid, cell, a) < SquaredDistance(grid, cell, b);
          });
      TellOfClosest(grid, cell, std::sqrt(SquaredDistance(grid, cell, closest)));
      mean.Add(grid, closest, 1);
    }
    mean.SetMean(grid, cell);
  }
}

}  // namespace zarn::processes::filters
