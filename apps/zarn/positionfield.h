// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <functional>
#include <vector>

#include "apps/zarn/windows.h"

namespace zarn::app {

/// Turns positions of one grid into those of another, in place; what has none becomes NaN.
using LocateFunction = std::function<void(std::vector<double>& x, std::vector<double>& y)>;

/// The source positions of all pixels of an output, from a costly function that is evaluated only
/// here and there and interpolated in between.
///
/// The output is cut into patches that are fixed in the whole image, and each patch is halved until
/// interpolation between its corners is right in its middle and in those of its sides. So neither a
/// pixel's position nor its error depends on the window in which it is asked for.
class PositionField {
 public:
  /// `threshold` is the error allowed, in source pixels along both axes together; with 0 the
  /// function is evaluated for every pixel.
  PositionField(LocateFunction locate, double threshold);

  /// Writes the positions of the pixels' centres, row by row; NaN for those that have none.
  void Fill(const Window& window, std::vector<double>& x, std::vector<double>& y);

 private:
  struct Lattice;
  struct Square;

  void FillPatch(const Lattice& lattice, const Square& square, const Window& window, double* x,
                 double* y);
  Lattice Evaluate(std::int64_t left, std::int64_t top, std::int64_t columns, std::int64_t rows,
                   std::int64_t step) const;
  bool IsFlat(const Lattice& lattice, const Square& square) const;

  LocateFunction locate_;
  double threshold_;
};

}  // namespace zarn::app
