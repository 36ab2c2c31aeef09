// SPDX-License-Identifier: Apache-2.0
#include "host/utils/affinepostfm.h"

#include "host/sys/vectorised.h"

namespace zarn::utils {
namespace {

struct Line {
  double start;
  double slope;
};

// Both coordinates at once, because they share the column.
ZARN_VECTORISED
void Step(const Line& alongX, const Line& alongY, int column, int count, double* x, double* y) {
  const Line lineX = alongX;
  const Line lineY = alongY;
  for (int i = 0; i < count; ++i) {
    const double u = static_cast<double>(column + i) + 0.5;
    x[i] = lineX.start + lineX.slope * u;
    y[i] = lineY.start + lineY.slope * u;
  }
}

}  // namespace

AffinePosTfm::AffinePosTfm(const std::array<double, 6>& coefficients)
    : coefficients_(coefficients) {}

AffinePosTfm::~AffinePosTfm() = default;

void AffinePosTfm::Transform(int column, int row, int count, double* x, double* y) {
  const std::array<double, 6>& c = coefficients_;
  const double v = static_cast<double>(row) + 0.5;
  Step({c[0] + c[2] * v, c[1]}, {c[3] + c[5] * v, c[4]}, column, count, x, y);
}

}  // namespace zarn::utils
