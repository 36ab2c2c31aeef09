// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <utility>
#include <vector>

#include "host/utils/ibufpostfm.h"

namespace zarn::testsupport {

struct Position {
  double x;
  double y;
};

/// Positions from a list, row by row.
class TableTransform : public utils::IBufPosTfm {
 public:
  TableTransform(int width, std::vector<Position> positions)
      : width_(width), positions_(std::move(positions)) {}

  void Transform(int column, int row, int count, double* x, double* y) override {
    for (int i = 0; i < count; ++i) {
      const Position& position =
          positions_[static_cast<std::size_t>(row) * static_cast<std::size_t>(width_) +
                     static_cast<std::size_t>(column + i)];
      x[i] = position.x;
      y[i] = position.y;
    }
  }
  bool IsConcurrent() const override { return true; }

 private:
  int width_;
  std::vector<Position> positions_;
};

}  // namespace zarn::testsupport
