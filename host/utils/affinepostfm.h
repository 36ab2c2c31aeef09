// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>

#include "host/utils/ibufpostfm.h"

namespace zarn::utils {

/// Positions by an affine map. With (u, v) the centre of a destination pixel, its source position
/// is (c[0] + c[1] u + c[2] v, c[3] + c[4] u + c[5] v).
class ZARN_HOST_EXPORT AffinePosTfm : public IBufPosTfm {
 public:
  explicit AffinePosTfm(const std::array<double, 6>& coefficients);
  ~AffinePosTfm() override;

  void Transform(int column, int row, int count, double* x, double* y) override;
  bool IsConcurrent() const override { return true; }

 private:
  std::array<double, 6> coefficients_;
};

}  // namespace zarn::utils
