// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/hotspotfit.h"

#include <Eigen/Dense>
#include <algorithm>
#include <cmath>
#include <limits>
#include <numeric>

#include "apps/zarn/estimate/robust.h"

namespace zarn::app {
namespace {

std::array<double, 5> QuadraticTerms(double x, double y) { return {x * x, x * y, y * y, x, y}; }

// Columns of mean 0 and deviation 1, or all 0.
void Standardise(Eigen::MatrixXd& features) {
  for (auto column : features.colwise()) {
    column.array() -= column.mean();
    const double deviation = std::sqrt(column.squaredNorm() / static_cast<double>(column.size()));
    if (deviation > 0) column /= deviation;
  }
}

Eigen::MatrixXd Features(const std::vector<CellSummary>& cells) {
  const std::size_t channels = cells.front().medians.size();
  const auto rows = static_cast<Eigen::Index>(cells.size());
  Eigen::MatrixXd features(rows, static_cast<Eigen::Index>(2 * channels - 1));
  Eigen::Index feature = 0;
  for (std::size_t c = 0; c < channels; ++c) {
    std::vector<double> deviations;
    deviations.reserve(cells.size());
    for (const CellSummary& cell : cells) deviations.push_back(cell.deviations[c]);
    // Roughness counts by ratios, but those of the smoothest cells are chance.
    const double floor = 0.1 * Median(std::move(deviations)) + std::numeric_limits<double>::min();
    for (Eigen::Index i = 0; i < rows; ++i) {
      const CellSummary& cell = cells[static_cast<std::size_t>(i)];
      features(i, feature) = std::log(cell.deviations[c] + floor);
      if (c > 0) features(i, feature + 1) = cell.medians[c] - cell.medians[c - 1];
    }
    feature += c > 0 ? 2 : 1;
  }
  Standardise(features);
  return features;
}

// Lloyd's algorithm from centres at equal ranks of the features' sum, so that every run and machine
// finds the same classes.
std::vector<std::size_t> Cluster(const Eigen::MatrixXd& features, std::size_t classes) {
  constexpr int kRounds = 30;
  const auto count = static_cast<std::size_t>(features.rows());
  std::vector<Eigen::Index> order(count);
  std::iota(order.begin(), order.end(), Eigen::Index{0});
  const Eigen::VectorXd ranks = features.rowwise().sum();
  std::stable_sort(order.begin(), order.end(),
                   [&](Eigen::Index a, Eigen::Index b) { return ranks(a) < ranks(b); });
  Eigen::MatrixXd centres(static_cast<Eigen::Index>(classes), features.cols());
  for (std::size_t k = 0; k < classes; ++k) {
    centres.row(static_cast<Eigen::Index>(k)) =
        features.row(order[(2 * k + 1) * count / (2 * classes)]);
  }
  std::vector<std::size_t> labels(count);
  for (int round = 0; round < kRounds; ++round) {
    Eigen::MatrixXd sums = Eigen::MatrixXd::Zero(centres.rows(), centres.cols());
    Eigen::VectorXd members = Eigen::VectorXd::Zero(centres.rows());
    for (Eigen::Index i = 0; i < features.rows(); ++i) {
      Eigen::Index nearest = 0;
      (centres.rowwise() - features.row(i)).rowwise().squaredNorm().minCoeff(&nearest);
      labels[static_cast<std::size_t>(i)] = static_cast<std::size_t>(nearest);
      sums.row(nearest) += features.row(i);
      members(nearest) += 1;
    }
    for (Eigen::Index k = 0; k < centres.rows(); ++k) {
      if (members(k) > 0) centres.row(k) = sums.row(k) / members(k);
    }
  }
  return labels;
}

struct LeastSquares {
  Eigen::VectorXd solution;
  double rootMeanSquare = 0;  // of the residuals, outliers included
};

LeastSquares SolveRobustly(const Eigen::MatrixXd& terms, const Eigen::VectorXd& values) {
  constexpr int kRounds = 30;
  LeastSquares result;
  Eigen::VectorXd roots = Eigen::VectorXd::Ones(values.size());
  for (int round = 0; round < kRounds; ++round) {
    // Terms that depend on each other (an empty class) are no obstacle to this decomposition.
    result.solution =
        (roots.asDiagonal() * terms).colPivHouseholderQr().solve(roots.cwiseProduct(values));
    const Eigen::VectorXd residuals = values - terms * result.solution;
    const std::vector<double> list(residuals.begin(), residuals.end());
    result.rootMeanSquare = RootMeanSquare(list);
    const double deviation = RobustDeviation(list);
    if (deviation <= 0) break;
    roots = residuals.unaryExpr(
        [&](double residual) { return std::sqrt(HuberWeight(residual, deviation)); });
  }
  return result;
}

}  // namespace

void PositionMoments::Add(const PixelRun& run) {
  const double y = static_cast<double>(run.y) / rowDivisor_;
  for (std::size_t i = 0; i < run.count; ++i) {
    if (run.valid[i] == 0) continue;
    const double x = (static_cast<double>(run.x) + static_cast<double>(i)) / columnDivisor_;
    const std::array<double, 5> terms = QuadraticTerms(x, y);
    for (std::size_t t = 0; t < terms.size(); ++t) sums_[t] += terms[t];
    count_ += 1;
  }
}

void PositionMoments::CentreOn(QuadraticCoefficients& p) const {
  p[5] = 0;
  for (std::size_t t = 0; t < sums_.size(); ++t) p[5] -= p[t] * sums_[t] / count_;
}

LandModel LandModel::FromClasses(const std::vector<CellSummary>& cells, std::size_t classes) {
  LandModel model;
  model.terms_ = classes;
  model.classes_ = Cluster(Features(cells), classes);
  return model;
}

LandModel LandModel::FromReference(std::vector<std::vector<double>> reference) {
  LandModel model;
  model.terms_ = 2;
  model.reference_ = std::move(reference);
  return model;
}

double LandModel::Term(std::size_t term, std::size_t cell, std::size_t channel) const {
  if (reference_.empty()) return classes_[cell] == term ? 1.0 : 0.0;
  return term == 0 ? 1.0 : reference_[channel][cell];
}

QuadraticFit FitQuadratic(const std::vector<CellSummary>& cells, const LandModel& land,
                          std::size_t channel, double columnDivisor, double rowDivisor) {
  const auto count = static_cast<Eigen::Index>(cells.size());
  const auto landTerms = static_cast<Eigen::Index>(land.Terms());
  Eigen::MatrixXd terms(count, landTerms + 5);
  Eigen::VectorXd values(count);
  for (Eigen::Index i = 0; i < count; ++i) {
    const auto cell = static_cast<std::size_t>(i);
    values(i) = cells[cell].medians[channel];
    for (Eigen::Index t = 0; t < landTerms; ++t) {
      terms(i, t) = land.Term(static_cast<std::size_t>(t), cell, channel);
    }
    const auto quadratic =
        QuadraticTerms(cells[cell].column / columnDivisor, cells[cell].row / rowDivisor);
    for (std::size_t t = 0; t < quadratic.size(); ++t) {
      terms(i, landTerms + static_cast<Eigen::Index>(t)) = quadratic[t];
    }
  }
  const LeastSquares fit = SolveRobustly(terms, values);
  QuadraticFit result;
  for (std::size_t t = 0; t < 5; ++t) {
    result.coefficients[t] = fit.solution(landTerms + static_cast<Eigen::Index>(t));
  }
  result.before = SolveRobustly(terms.leftCols(landTerms), values).rootMeanSquare;
  result.after = fit.rootMeanSquare;
  return result;
}

}  // namespace zarn::app
