// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/gainoffsetnetwork.h"

#include <algorithm>
#include <cmath>

#include "apps/zarn/estimate/differencesystem.h"

namespace zarn::app {
namespace {

// One channel of the cells, as the statistics want it.
struct Series {
  std::vector<double> x;
  std::vector<double> y;

  Series(const std::vector<CellPair>& cells, std::size_t channel) {
    for (const CellPair& cell : cells) {
      x.push_back(cell.first[channel]);
      y.push_back(cell.second[channel]);
    }
  }

  // How far apart the standardised values are.
  std::vector<double> Differences(const Moments& m) const {
    std::vector<double> differences(x.size());
    for (std::size_t i = 0; i < x.size(); ++i) {
      differences[i] =
          Standardised(y[i], m.meanY, m.deviationY) - Standardised(x[i], m.meanX, m.deviationX);
    }
    return differences;
  }

 private:
  static double Standardised(double value, double mean, double deviation) {
    return deviation > 0 ? (value - mean) / deviation : value - mean;
  }
};

// Exact copies of one another leave no residual; a scale of 0 would throw out every cell.
constexpr double kLeastDeviation = 1e-6;

Moments MomentsFromMedians(const Series& series) {
  Moments m;
  m.meanX = Median(series.x);
  m.meanY = Median(series.y);
  m.deviationX = RobustDeviation(series.x);
  m.deviationY = RobustDeviation(series.y);
  return m;
}

bool Settled(const Moments& before, const Moments& after) {
  constexpr double kPrecision = 1e-6;
  const auto close = [](double a, double b, double scale) {
    return std::abs(a - b) <= kPrecision * scale;
  };
  return close(before.meanX, after.meanX, after.deviationX) &&
         close(before.meanY, after.meanY, after.deviationY) &&
         close(before.deviationX, after.deviationX, after.deviationX) &&
         close(before.deviationY, after.deviationY, after.deviationY);
}

}  // namespace

std::vector<Moments> RobustMoments(const std::vector<CellPair>& cells, std::size_t channels) {
  constexpr int kMostRounds = 50;
  std::vector<Series> series;
  std::vector<Moments> moments;
  for (std::size_t c = 0; c < channels; ++c) {
    series.emplace_back(cells, c);
    moments.push_back(MomentsFromMedians(series.back()));
  }
  for (int round = 0; round < kMostRounds; ++round) {
    std::vector<double> weights(cells.size(), 1.0);
    for (std::size_t c = 0; c < channels; ++c) {
      const std::vector<double> differences = series[c].Differences(moments[c]);
      const double deviation = std::max(RobustDeviation(differences), kLeastDeviation);
      for (std::size_t i = 0; i < weights.size(); ++i) {
        weights[i] = std::min(weights[i], TukeyWeight(differences[i], deviation));
      }
    }
    bool settled = true;
    for (std::size_t c = 0; c < channels; ++c) {
      const Moments next = WeightedMoments(series[c].x, series[c].y, weights);
      settled = settled && Settled(moments[c], next);
      moments[c] = next;
    }
    if (settled) break;
  }
  return moments;
}

double LogGainOntoFirst(const Moments& m, const GainLimits& limits) {
  return std::log(m.deviationX / m.deviationY) + (1 - limits.contrast) * std::log(m.correlation);
}

std::vector<std::vector<GainOffset>> SolveGainOffsets(std::size_t scenes,
                                                      const std::vector<SceneOverlap>& overlaps,
                                                      std::size_t channels,
                                                      const GainLimits& limits) {
  std::vector<std::vector<GainOffset>> result(scenes, std::vector<GainOffset>(channels));
  // Where nothing at all is known of a gain, it is 1 even without damping.
  const double held = std::max(limits.damping, 1e-9);
  for (std::size_t c = 0; c < channels; ++c) {
    double meanCells = 0;
    for (const SceneOverlap& overlap : overlaps) meanCells += overlap.moments[c].weight;
    meanCells /= static_cast<double>(overlaps.size());

    DifferenceSystem logGains(scenes, held);
    for (const SceneOverlap& overlap : overlaps) {
      const Moments& m = overlap.moments[c];
      const double weight = m.weight / meanCells * SignalToNoise(m);
      if (weight <= 0) continue;
      // Of two scenes to be corrected neither is the truth; the reference is.
      const double target =
          overlap.first == 0 ? -LogGainOntoFirst(m, limits) : std::log(m.deviationY / m.deviationX);
      logGains.Add(overlap.first, overlap.second, target, weight);
    }
    const std::vector<double> logs = logGains.Solve();
    for (std::size_t scene = 0; scene < scenes; ++scene) {
      result[scene][c].gain = std::exp(logs[scene]);
    }

    DifferenceSystem offsets(scenes, 0);
    for (const SceneOverlap& overlap : overlaps) {
      const Moments& m = overlap.moments[c];
      offsets.Add(
          overlap.first, overlap.second,
          result[overlap.second][c].gain * m.meanY - result[overlap.first][c].gain * m.meanX,
          m.weight / meanCells);
    }
    const std::vector<double> solved = offsets.Solve();
    for (std::size_t scene = 0; scene < scenes; ++scene) {
      result[scene][c].offset = solved[scene];
    }
  }
  return result;
}

std::vector<bool> TiedScenes(std::size_t scenes, const std::vector<SceneOverlap>& overlaps) {
  std::vector<bool> tied(scenes, false);
  tied[0] = true;
  for (bool grown = true; grown;) {
    grown = false;
    for (const SceneOverlap& overlap : overlaps) {
      if (tied[overlap.first] == tied[overlap.second]) continue;
      tied[overlap.first] = tied[overlap.second] = true;
      grown = true;
    }
  }
  return tied;
}

}  // namespace zarn::app
