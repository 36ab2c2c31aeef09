// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/dodgingfit.h"

#include <algorithm>
#include <cmath>

#include "apps/zarn/estimate/differencesystem.h"

namespace zarn::app {
namespace {

// How strongly neighbouring nodes are tied, where a node with the mean number of cells weighs 1
// (times the ratio of signal to noise, for gains).
constexpr double kGainTie = 0.5;
constexpr double kOffsetTie = 0.05;
constexpr std::size_t kLeastCells = 12;

struct Node {
  std::vector<Moments>
      moments;  // per channel, x the reference; empty where there are too few cells
};

std::vector<CellPair> CellsAround(const std::vector<CellPair>& cells, const Ground& ground,
                                  const DodgingGrid& grid, unsigned column, unsigned row) {
  std::vector<CellPair> near;
  for (const CellPair& cell : cells) {
    const double dx = ground.Column(cell.x, cell.y) - 0.5 - grid.originX - column * grid.stepX;
    const double dy = ground.Row(cell.x, cell.y) - 0.5 - grid.originY - row * grid.stepY;
    if (std::abs(dx) <= grid.stepX && std::abs(dy) <= grid.stepY) near.push_back(cell);
  }
  return near;
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
  std::vector<Node> nodes;
  double meanCells = 0;
  for (unsigned row = 0; row < grid.rows; ++row) {
    for (unsigned column = 0; column < grid.columns; ++column) {
      const std::vector<CellPair> near = CellsAround(cells, ground, grid, column, row);
      nodes.emplace_back();
      if (near.size() >= kLeastCells) nodes.back().moments = RobustMoments(near, grid.channels);
      meanCells += static_cast<double>(near.size());
    }
  }
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
