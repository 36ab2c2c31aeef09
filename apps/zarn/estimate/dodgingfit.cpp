// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/dodgingfit.h"

#include <algorithm>
#include <cmath>

#include "apps/zarn/estimate/differencesystem.h"
#include "host/sys/parallel.h"

namespace zarn::app {
namespace {

// How strongly neighbouring nodes are tied, where a node with the mean number of cells weighs 1
// (times the ratio of signal to noise, for gains).
constexpr double kGainTie = 0.5;
constexpr double kOffsetTie = 0.05;
constexpr std::size_t kLeastCells = 12;

struct Node {
  std::size_t cells = 0;
  std::vector<Moments>
      moments;  // per channel, x the reference; empty where there are too few cells
};

struct Position {
  double x;
  double y;
};

/// The common cells, and where they lie in pixels from the first node.
struct PlacedCells {
  PlacedCells(const std::vector<CellPair>& all, const Ground& ground, const DodgingGrid& grid)
      : cells(all) {
    positions.reserve(all.size());
    for (const CellPair& cell : all) {
      positions.push_back({ground.Column(cell.x, cell.y) - 0.5 - grid.originX,
                           ground.Row(cell.x, cell.y) - 0.5 - grid.originY});
    }
  }

  const std::vector<CellPair>& cells;
  std::vector<Position> positions;
};

std::vector<CellPair> CellsAround(const PlacedCells& placed, const DodgingGrid& grid,
                                  std::size_t node) {
  const auto column = static_cast<double>(node % grid.columns);
  const auto row = static_cast<double>(node / grid.columns);
  std::vector<CellPair> near;
  for (std::size_t i = 0; i < placed.cells.size(); ++i) {
    const double dx = placed.positions[i].x - column * grid.stepX;
    const double dy = placed.positions[i].y - row * grid.stepY;
    if (std::abs(dx) <= grid.stepX && std::abs(dy) <= grid.stepY) near.push_back(placed.cells[i]);
  }
  return near;
}

std::vector<Node> MeasureNodes(const PlacedCells& placed, const DodgingGrid& grid) {
  namespace parallel = sys::parallel;
  std::vector<Node> nodes(std::size_t{grid.columns} * grid.rows);
  const auto count = static_cast<std::ptrdiff_t>(nodes.size());
  parallel::ForEachRowBandRethrowing(
      count, parallel::BandCount(count),
      [&](std::ptrdiff_t, std::ptrdiff_t begin, std::ptrdiff_t end) {
        for (auto n = static_cast<std::size_t>(begin); n < static_cast<std::size_t>(end); ++n) {
          const std::vector<CellPair> near = CellsAround(placed, grid, n);
          nodes[n].cells = near.size();
          if (near.size() >= kLeastCells) nodes[n].moments = RobustMoments(near, grid.channels);
        }
      });
  return nodes;
}

// The values at all nodes, from targets with weights and ties between neighbours.
class NodeSystem {
 public:
  NodeSystem(const DodgingGrid& grid, double tie, double damping)
      : system_(std::size_t{grid.columns} * grid.rows + 1, damping) {
    for (unsigned row = 0; row < grid.rows; ++row) {
      for (unsigned column = 0; column < grid.columns; ++column) {
        const std::size_t node = std::size_t{row} * grid.columns + column + 1;
        if (column > 0) system_.Add(node, node - 1, 0, tie);
        if (row > 0) system_.Add(node, node - grid.columns, 0, tie);
      }
    }
  }

  void Aim(std::size_t node, double target, double weight) {
    system_.Add(node + 1, 0, target, weight);
  }

  std::vector<double> Solve() const {
    std::vector<double> values = system_.Solve();
    values.erase(values.begin());
    return values;
  }

 private:
  DifferenceSystem system_;
};

}  // namespace

DodgingGrid LayGrid(const WindowSize& image, std::size_t channels, int nodes) {
  const auto width = static_cast<double>(image.width);
  const auto height = static_cast<double>(image.height);
  const double step = std::max(width, height) / nodes;
  const auto count = [&](double side) {
    return static_cast<unsigned>(std::max(1.0, std::round(side / step)));
  };
  DodgingGrid grid;
  grid.columns = count(width);
  grid.rows = count(height);
  grid.channels = static_cast<unsigned>(channels);
  grid.stepX = width / grid.columns;
  grid.stepY = height / grid.rows;
  // A pixel's number is the place of its centre.
  grid.originX = 0.5 * grid.stepX - 0.5;
  grid.originY = 0.5 * grid.stepY - 0.5;
  grid.values.assign(std::size_t{grid.columns} * grid.rows * channels, 0.0F);
  return grid;
}

DodgingFit FitDodging(const std::vector<CellPair>& cells, const Ground& ground,
                      const DodgingGrid& grid, const GainLimits& limits) {
  DodgingFit fit{{}, grid, grid};
  const std::vector<Node> nodes = MeasureNodes(PlacedCells(cells, ground, grid), grid);
  double meanCells = 0;
  for (const Node& node : nodes) meanCells += static_cast<double>(node.cells);
  meanCells /= static_cast<double>(nodes.size());

  for (std::size_t c = 0; c < grid.channels; ++c) {
    double pivot = 0;
    for (const CellPair& cell : cells) pivot += cell.second[c];
    pivot /= static_cast<double>(cells.size());
    fit.pivots.push_back(pivot);

    NodeSystem gains(grid, kGainTie, std::max(limits.damping, 1e-9));
    for (std::size_t n = 0; n < nodes.size(); ++n) {
      if (nodes[n].moments.empty()) continue;
      const Moments& m = nodes[n].moments[c];
      const double weight = m.weight / meanCells * SignalToNoise(m);
      if (weight > 0) gains.Aim(n, LogGainOntoFirst(m, limits), weight);
    }
    const std::vector<double> logs = gains.Solve();

    NodeSystem offsets(grid, kOffsetTie, 1e-9);
    for (std::size_t n = 0; n < nodes.size(); ++n) {
      const double gain = std::exp(logs[n]);
      fit.gains.values[n * grid.channels + c] = static_cast<float>(gain);
      if (nodes[n].moments.empty()) continue;
      const Moments& m = nodes[n].moments[c];
      offsets.Aim(n, m.meanX - pivot - gain * (m.meanY - pivot), m.weight / meanCells);
    }
    const std::vector<double> solved = offsets.Solve();
    for (std::size_t n = 0; n < nodes.size(); ++n) {
      fit.offsets.values[n * grid.channels + c] = static_cast<float>(solved[n]);
    }
  }
  return fit;
}

}  // namespace zarn::app
