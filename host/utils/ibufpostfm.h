// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/hostexport.h"

namespace zarn::utils {

/// Tells where in a source buffer the pixels of a destination buffer come from.
///
/// Positions count from the corner of a buffer's first pixel, in both buffers: pixel (column, row)
/// covers [column, column + 1) x [row, row + 1) and has its centre at (column + 0.5, row + 0.5).
class ZARN_HOST_EXPORT IBufPosTfm {
 public:
  IBufPosTfm() = default;
  IBufPosTfm(const IBufPosTfm&) = delete;
  IBufPosTfm& operator=(const IBufPosTfm&) = delete;
  virtual ~IBufPosTfm();

  /// Writes to `x` and `y` the source positions of the centres of `count` destination pixels of
  /// `row`, from `column` on. A pixel that has no position gets NaN in either of them. What it
  /// throws ends the resampling and reaches its caller, with part of the destination written.
  virtual void Transform(int column, int row, int count, double* x, double* y) = 0;

  /// Whether several threads may call `Transform` at a time. Where not, resampling uses one thread.
  virtual bool IsConcurrent() const { return false; }
};

}  // namespace zarn::utils
