// SPDX-License-Identifier: Apache-2.0
#include "host/utils/affinepostfm.h"

#include "host/sys/vectorised.h"

namespace zarn::utils {
namespace {

ZARN_VECTORISED
void Step(double start, double slope, int column, int count, double* positions) {
  for (int i = 0; i < count; ++i) {
    positions[i] = start + slope * (static_cast<double>(column + i) + 0.5);
  }
}

}  // namespace

AffinePosTfm::AffinePosTfm(const std::array<double, 6>& coefficients)
    : coefficients_(coefficients) {}

AffinePosTfm::~AffinePosTfm() = default;

void AffinePosTfm::Transform(int column, int row, int count, double* x, double* y) {
  const std::array<double, 6>& c = coefficients_;
  const double v = static_cast<double>(row) + 0.5;
  Step(c[0] + c[2] * v, c[1], column, count, x);
  Step(c[3] + c[5] * v, c[4], column, count, y);
}

}  // namespace zarn::utils
