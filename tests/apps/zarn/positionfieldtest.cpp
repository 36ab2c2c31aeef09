// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <limits>
#include <vector>

#include "apps/zarn/positionfield.h"

namespace zarn::app {
namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

// Bent more and more to the right, with a step, and without positions in a disc and beyond a line.
void Bend(std::vector<double>& x, std::vector<double>& y) {
  for (std::size_t i = 0; i < x.size(); ++i) {
    const double u = x[i];
    const double v = y[i];
    x[i] = 0.9 * u + 0.1 * v + u * u / 3000 + (v > 333 ? 40 : 0);
    y[i] = v - 0.1 * u + 3 * std::sin(u / 90) * std::cos(v / 70);
    if (std::hypot(u - 300, v - 120) < 37.3 || u > 590) x[i] = y[i] = kNaN;
  }
}

TEST(PositionField, KeepsItsBoundAndDoesNotDependOnTheWindow) {
  constexpr std::int64_t kWidth = 600;
  constexpr std::int64_t kHeight = 400;
  std::size_t asked = 0;
  PositionField field(
      [&](std::vector<double>& x, std::vector<double>& y) {
        asked += x.size();
        Bend(x, y);
      },
      0.125);
  std::vector<double> x;
  std::vector<double> y;
  field.Fill({0, 0, kWidth, kHeight}, x, y);
  EXPECT_LT(asked, static_cast<std::size_t>(kWidth * kHeight / 4));
  std::vector<double> exactX;
  std::vector<double> exactY;
  for (std::int64_t row = 0; row < kHeight; ++row) {
    for (std::int64_t column = 0; column < kWidth; ++column) {
      exactX.push_back(static_cast<double>(column) + 0.5);
      exactY.push_back(static_cast<double>(row) + 0.5);
    }
  }
  Bend(exactX, exactY);
  for (std::size_t i = 0; i < x.size(); ++i) {
    ASSERT_EQ(std::isnan(x[i]), std::isnan(exactX[i])) << i % kWidth << ", " << i / kWidth;
    if (std::isnan(x[i])) continue;
    ASSERT_LE(std::abs(x[i] - exactX[i]) + std::abs(y[i] - exactY[i]), 0.13) << i;
  }
  for (const Window& window : {Window{0, 0, 64, 64}, Window{17, 300, 1, 100},
                               Window{570, 399, 30, 1}, Window{250, 70, 101, 99}}) {
    std::vector<double> partX;
    std::vector<double> partY;
    field.Fill(window, partX, partY);
    for (std::int64_t i = 0; i < window.width * window.height; ++i) {
      const auto at = static_cast<std::size_t>(i);
      const auto whole = static_cast<std::size_t>((window.y + i / window.width) * kWidth +
                                                  window.x + i % window.width);
      ASSERT_TRUE(partX[at] == x[whole] || (std::isnan(partX[at]) && std::isnan(x[whole]))) << i;
      ASSERT_TRUE(partY[at] == y[whole] || (std::isnan(partY[at]) && std::isnan(y[whole]))) << i;
    }
  }
}

TEST(PositionField, AsksForEveryPixelWithoutAThreshold) {
  PositionField field(Bend, 0);
  std::vector<double> x;
  std::vector<double> y;
  field.Fill({320, 320, 70, 70}, x, y);
  std::vector<double> exactX{389.5};
  std::vector<double> exactY{389.5};
  Bend(exactX, exactY);
  EXPECT_NEAR(x.back(), exactX[0], 1e-6);
  EXPECT_NEAR(y.back(), exactY[0], 1e-6);
  EXPECT_NEAR(x[20 * 70] - x[0], 42, 3);
}

}  // namespace
}  // namespace zarn::app
