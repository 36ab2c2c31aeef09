// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <span>
#include <vector>

namespace zarn::app {

/// The middle value (of an even number of values the upper one of the two); 0 for none.
double Median(std::vector<double> values);

/// The arithmetic mean; the values must not be empty.
double Mean(const std::vector<double>& values);

/// Root of the mean square; the values must not be empty.
double RootMeanSquare(const std::vector<double>& values);

/// Standard deviation as the median absolute deviation from the median tells it: half of the values
/// may be anything.
double RobustDeviation(std::vector<double> values);

/// Tukey's biweight: 1 for a residual of 0, falling to 0 at 4.685 deviations and beyond. What lies
/// that far off (a cloud, a field harvested since) loses all its influence; with normal residuals
/// the estimate still has 95 % of the efficiency of least squares.
double TukeyWeight(double residual, double deviation);

/// Huber's weight: 1 up to 1.345 deviations, then falling as the reciprocal. Large residuals keep a
/// bounded influence, which suits a model that does not hold everywhere.
double HuberWeight(double residual, double deviation);

/// Weighted moments of two variables.
struct Moments {
  double weight = 0;
  double meanX = 0;
  double meanY = 0;
  double deviationX = 0;
  double deviationY = 0;
  double correlation = 0;  ///< 0 where one of the two is constant
};
Moments WeightedMoments(std::span<const double> x, std::span<const double> y,
                        std::span<const double> weights);

/// r^2 / (1 - r^2), the ratio of signal to noise that goes with a correlation r; 0 unless the two
/// are positively correlated.
double SignalToNoise(const Moments& m);

}  // namespace zarn::app
