// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <Eigen/Dense>
#include <cstddef>
#include <vector>

namespace zarn::app {

/// Least squares of differences between the members of a network: minimises the sum of
/// weight * (value[first] - value[second] - target)^2 and of damping * value^2, value[0] being 0.
class DifferenceSystem {
 public:
  DifferenceSystem(std::size_t members, double damping)
      : matrix_(Eigen::MatrixXd::Identity(Unknowns(members), Unknowns(members)) * damping),
        right_(Eigen::VectorXd::Zero(Unknowns(members))) {}

  void Add(std::size_t first, std::size_t second, double target, double weight) {
    const Eigen::Index i = Unknowns(first);
    const Eigen::Index j = Unknowns(second);
    if (i >= 0) {
      matrix_(i, i) += weight;
      right_(i) += weight * target;
    }
    if (j >= 0) {
      matrix_(j, j) += weight;
      right_(j) -= weight * target;
    }
    if (i >= 0 && j >= 0) {
      matrix_(i, j) -= weight;
      matrix_(j, i) -= weight;
    }
  }

  /// One value per member, 0 for member 0.
  std::vector<double> Solve() const {
    const Eigen::VectorXd solution = matrix_.ldlt().solve(right_);
    std::vector<double> values{0};
    values.insert(values.end(), solution.begin(), solution.end());
    return values;
  }

 private:
  static Eigen::Index Unknowns(std::size_t members) {
    return static_cast<Eigen::Index>(members) - 1;
  }

  Eigen::MatrixXd matrix_;
  Eigen::VectorXd right_;
};

}  // namespace zarn::app
