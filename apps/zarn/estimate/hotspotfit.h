// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <vector>

#include "apps/zarn/estimate/cellsamples.h"

namespace zarn::app {

/// p0 x^2 + p1 x y + p2 y^2 + p3 x + p4 y + p5 with x = column / columnDivisor and
/// y = row / rowDivisor.
using QuadraticCoefficients = std::array<double, 6>;

/// Sums over pixels of the terms of a quadratic.
class PositionMoments {
 public:
  PositionMoments(double columnDivisor, double rowDivisor)
      : columnDivisor_(columnDivisor), rowDivisor_(rowDivisor) {}

  void Add(const PixelRun& run);
  /// Sets the constant so that the mean over all pixels added is 0.
  void CentreOn(QuadraticCoefficients& p) const;

 private:
  double columnDivisor_;
  double rowDivisor_;
  double count_ = 0;
  std::array<double, 5> sums_{};  ///< of x^2, x y, y^2, x, y
};

/// One channel's quadratic, its constant left at 0, and how far (root mean square) the cells are
/// from what explains them, without the quadratic and with it.
struct QuadraticFit {
  QuadraticCoefficients coefficients{};
  double before = 0;
  double after = 0;
};

/// What a cell would be without the hot spot, per channel: a constant for each class of cells, or
/// gain and offset on a reference.
class LandModel {
 public:
  /// Cells of the same land cover, by their colour (the differences between neighbouring channels)
  /// and their roughness, both of which a hot spot hardly changes, however bright it is.
  static LandModel FromClasses(const std::vector<CellSummary>& cells, std::size_t classes);
  /// Cells as a reference shows them, [channel][cell].
  static LandModel FromReference(std::vector<std::vector<double>> reference);

  /// Terms of the model: their number, and the value of one of them in a cell.
  std::size_t Terms() const { return terms_; }
  double Term(std::size_t term, std::size_t cell, std::size_t channel) const;

 private:
  std::size_t terms_ = 1;
  std::vector<std::size_t> classes_;
  std::vector<std::vector<double>> reference_;
};

/// Least squares of land model and quadratic together, per channel, with Huber's weights.
QuadraticFit FitQuadratic(const std::vector<CellSummary>& cells, const LandModel& land,
                          std::size_t channel, double columnDivisor, double rowDivisor);

}  // namespace zarn::app
