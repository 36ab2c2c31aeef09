// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/robust.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <numeric>
#include <utility>

namespace zarn::app {

double Median(std::vector<double> values) {
  if (values.empty()) return 0;
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

double Mean(const std::vector<double>& values) {
  return std::accumulate(values.begin(), values.end(), 0.0) / static_cast<double>(values.size());
}

double RootMeanSquare(const std::vector<double>& values) {
  return std::sqrt(std::inner_product(values.begin(), values.end(), values.begin(), 0.0) /
                   static_cast<double>(values.size()));
}

double RobustDeviation(std::vector<double> values) {
  constexpr double kNormalDeviationOverMad = 1.4826;
  const double median = Median(values);
  for (double& value : values) value = std::abs(value - median);
  return kNormalDeviationOverMad * Median(std::move(values));
}

double TukeyWeight(double residual, double deviation) {
  const double share = residual / (4.685 * deviation);
  const double inside = 1 - share * share;
  return inside > 0 ? inside * inside : 0.0;
}

double HuberWeight(double residual, double deviation) {
  const double limit = 1.345 * deviation;
  return std::abs(residual) <= limit ? 1.0 : limit / std::abs(residual);
}

Moments WeightedMoments(std::span<const double> x, std::span<const double> y,
                        std::span<const double> weights) {
  Moments m;
  for (std::size_t i = 0; i < x.size(); ++i) {
    m.weight += weights[i];
    m.meanX += weights[i] * x[i];
    m.meanY += weights[i] * y[i];
  }
  if (m.weight <= 0) return {};
  m.meanX /= m.weight;
  m.meanY /= m.weight;
  double xx = 0;
  double yy = 0;
  double xy = 0;
  for (std::size_t i = 0; i < x.size(); ++i) {
    const double dx = x[i] - m.meanX;
    const double dy = y[i] - m.meanY;
    xx += weights[i] * dx * dx;
    yy += weights[i] * dy * dy;
    xy += weights[i] * dx * dy;
  }
  m.deviationX = std::sqrt(xx / m.weight);
  m.deviationY = std::sqrt(yy / m.weight);
  if (xx > 0 && yy > 0) m.correlation = xy / std::sqrt(xx * yy);
  return m;
}

double SignalToNoise(const Moments& m) {
  constexpr double kMost = 1e4;
  if (!(m.correlation > 0) || m.deviationX <= 0 || m.deviationY <= 0) return 0;
  const double explained = m.correlation * m.correlation;
  return explained < 1 ? std::min(explained / (1 - explained), kMost) : kMost;
}

}  // namespace zarn::app
