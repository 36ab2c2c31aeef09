// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <vector>

#include "host/core/exception.h"
#include "host/mosaic/griddodgingsurface.h"

namespace {

DodgingGrid Grid(unsigned columns, unsigned rows, double originX, double stepX) {
  DodgingGrid grid{.columns = columns,
                   .rows = rows,
                   .channels = 2,
                   .originX = originX,
                   .originY = -3.5,
                   .stepX = stepX,
                   .stepY = 20.25,
                   .values = {}};
  for (unsigned i = 0; i < columns * rows * 2; ++i) {
    grid.values.push_back(static_cast<float>((i * 37 + 11) % 53) * 0.3F);
  }
  return grid;
}

// Plain bilinear interpolation, node by node.
double Expected(const DodgingGrid& g, unsigned column, unsigned row, unsigned channel) {
  const double u = std::clamp((column - g.originX) / g.stepX, 0.0, g.columns - 1.0);
  const double v = std::clamp((row - g.originY) / g.stepY, 0.0, g.rows - 1.0);
  double sum = 0.0;
  for (unsigned r = 0; r < g.rows; ++r) {
    for (unsigned c = 0; c < g.columns; ++c) {
      const double weight =
          std::max(0.0, 1.0 - std::fabs(u - c)) * std::max(0.0, 1.0 - std::fabs(v - r));
      sum += weight * static_cast<double>(g.values[(r * g.columns + c) * g.channels + channel]);
    }
  }
  return sum;
}

TEST(GridDodgingSurface, IsBilinearAndItsRunsEqualItsValues) {
  for (const DodgingGrid& grid :
       {Grid(5, 4, 10.0, 31.7), Grid(1, 1, 0.0, 1.0), Grid(1, 3, 20.0, 40.0),
        Grid(2, 3, -50.0, 400.0), Grid(9, 2, 250.0, -30.5), Grid(90, 3, 0.0, 0.75),
        Grid(4, 4, 4294967200.0, 50.0)}) {
    const GridDodgingSurface surface(grid);
    EXPECT_GE(surface.ByteSize(), grid.values.size() * sizeof(float));
    // The last one passes 2^32.
    for (const unsigned first : {0U, 7U, 4294967100U}) {
      constexpr unsigned kCount = 300;
      constexpr unsigned kPitch = 310;
      std::vector<float> run(2 * kPitch, -1.0F);
      surface.GetBilinearRun(first, 40, kCount, run.data(), kPitch);
      for (unsigned k = 0; k < kCount; ++k) {
        float pixel[2];
        surface.GetBilinearValue(first + k, 40, pixel);
        for (unsigned c = 0; c < 2; ++c) {
          ASSERT_EQ(run[c * kPitch + k], pixel[c]) << first << " + " << k;
          ASSERT_NEAR(static_cast<double>(pixel[c]), Expected(grid, first + k, 40, c), 1e-5);
        }
      }
      EXPECT_EQ(run[kCount], -1.0F) << "wrote past the run";
    }
  }
}

TEST(GridDodgingSurface, RefusesInconsistentGrids) {
  DodgingGrid grid = Grid(2, 2, 0, 1);
  grid.values.pop_back();
  EXPECT_THROW(GridDodgingSurface{grid}, zarn::DataException);
  EXPECT_THROW(GridDodgingSurface{Grid(2, 2, 0, 0)}, zarn::DataException);
  EXPECT_THROW(GridDodgingSurface{Grid(2, 0, 0, 1)}, zarn::DataException);
}

}  // namespace
