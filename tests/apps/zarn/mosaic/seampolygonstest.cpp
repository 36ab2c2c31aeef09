// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <random>
#include <string>
#include <vector>

#include "apps/zarn/mosaic/seampolygons.h"

namespace zarn::app {
namespace {

using Labels = std::vector<std::uint32_t>;

struct Field {
  WindowSize lattice;
  std::size_t count = 0;
  Labels labels;

  std::uint32_t At(std::int64_t x, std::int64_t y) const {
    return labels[static_cast<std::size_t>(y * lattice.width + x)];
  }
};

Field FieldOf(const std::vector<std::string>& rows) {
  Field field{
      {static_cast<std::int64_t>(rows[0].size()), static_cast<std::int64_t>(rows.size())}, 4, {}};
  for (const std::string& row : rows) {
    for (const char c : row) field.labels.push_back(static_cast<std::uint32_t>(c - '0'));
  }
  return field;
}

// From noise, in which single cells meet at corners, to broad areas with ragged borders.
Field RandomField(WindowSize lattice, int roughness, std::mt19937& random) {
  Field field{lattice, 4, {}};
  const double slope = 0.1 * static_cast<double>(random() % 20);
  for (std::int64_t y = 0; y < lattice.height; ++y) {
    for (std::int64_t x = 0; x < lattice.width; ++x) {
      const auto jitter = static_cast<std::int64_t>(random() % static_cast<unsigned>(roughness));
      const double along = static_cast<double>(x) + slope * static_cast<double>(y + jitter);
      field.labels.push_back(static_cast<std::uint32_t>(along / 7) % 4);
    }
  }
  return field;
}

/// The polygons along a line y = const.
class Row {
 public:
  Row(const std::vector<ScenePolygon>& polygons, double y) : crossings_(polygons.size()) {
    for (std::size_t p = 0; p < polygons.size(); ++p) {
      for (const auto& ring : polygons[p].rings) {
        for (std::size_t i = 0; i + 1 < ring.size(); ++i) {
          const auto& [x0, y0] = ring[i];
          const auto& [x1, y1] = ring[i + 1];
          if ((y0 > y) != (y1 > y)) {
            crossings_[p].push_back(x0 + (x1 - x0) * (y - y0) / (y1 - y0));
          }
        }
      }
    }
  }

  // The polygons that hold the point by the even-odd rule, one digit each.
  std::string HoldersOf(double x) const {
    std::string holders;
    for (std::size_t p = 0; p < crossings_.size(); ++p) {
      const auto before = std::count_if(crossings_[p].begin(), crossings_[p].end(),
                                        [&](double crossing) { return crossing < x; });
      if (before % 2 != 0) holders += std::to_string(p);
    }
    return holders;
  }

 private:
  std::vector<std::vector<double>> crossings_;
};

std::size_t VertexCount(const ScenePolygon& polygon) {
  std::size_t count = 0;
  for (const auto& ring : polygon.rings) count += ring.size() - 1;
  return count;
}

const Field kFields[] = {
    FieldOf({"0"}),
    FieldOf({"01", "10"}),
    FieldOf({"0000", "0110", "0110", "0000"}),
    // A ring that closes over a corner, around an area of its own.
    FieldOf({"000000", "011100", "010010", "010010", "001110", "000000"}),
    FieldOf({"0123", "1230", "2301", "3012"}),
    FieldOf({"3333", "3113", "3133", "3331"}),
};

TEST(SeamPolygons, HoldTheCentresOfTheirCells) {
  constexpr double kCell = 2.5;
  std::mt19937 random(1);
  std::vector<Field> fields(std::begin(kFields), std::end(kFields));
  for (int i = 0; i < 60; ++i) fields.push_back(RandomField({14, 11}, 1 + i % 20, random));
  for (const Field& field : fields) {
    const auto polygons = SeamPolygons(field.labels, field.lattice, field.count, kCell, 0);
    for (std::int64_t y = 0; y < field.lattice.height; ++y) {
      const Row row(polygons, (static_cast<double>(y) + 0.5) * kCell);
      for (std::int64_t x = 0; x < field.lattice.width; ++x) {
        ASSERT_EQ(row.HoldersOf((static_cast<double>(x) + 0.5) * kCell),
                  std::to_string(field.At(x, y)))
            << x << ' ' << y;
      }
    }
  }
}

TEST(SeamPolygons, LeaveNoGapAndNoOverlapAtAnyTolerance) {
  std::mt19937 random(2);
  std::vector<Field> fields(std::begin(kFields), std::end(kFields));
  for (int i = 0; i < 60; ++i) fields.push_back(RandomField({31, 17}, 1 + i % 30, random));
  for (const Field& field : fields) {
    for (const double tolerance : {0.0, 0.3, 1.0, 6.0}) {
      const auto polygons = SeamPolygons(field.labels, field.lattice, field.count, 1, tolerance);
      double area = 0;
      for (const ScenePolygon& polygon : polygons) {
        for (const auto& ring : polygon.rings) area += RingArea(ring);
      }
      const auto width = static_cast<double>(field.lattice.width);
      const auto height = static_cast<double>(field.lattice.height);
      ASSERT_NEAR(area, width * height, 1e-9);
      // Off all vertices and diagonals.
      for (double y = 0.0631; y < height; y += 0.1937) {
        const Row row(polygons, y);
        for (double x = 0.0419; x < width; x += 0.2113) {
          const std::string holders = row.HoldersOf(x);
          ASSERT_EQ(holders.size(), 1u) << tolerance << ": " << x << ' ' << y << " in " << holders;
        }
      }
    }
  }
}

TEST(SeamPolygons, HaveFewVertices) {
  struct Case {
    const char* name;
    double (*border)(double y, double noise);
    double tolerance;
    std::size_t most;  ///< of each of the two polygons: two corners and what the border takes
  };
  const Case cases[] = {
      {"straight", [](double, double) { return 50.0; }, 0, 4},
      {"diagonal", [](double y, double) { return 10.5 + y; }, 0.5, 4},
      {"any slope", [](double y, double) { return 20.5 + 0.37 * y; }, 0.75, 6},
      {"ragged by a cell", [](double, double noise) { return 50.5 + noise; }, 1, 4 + 2},
      {"a bend", [](double y, double) { return 20 + std::abs(y - 50); }, 0.75, 8},
  };
  const WindowSize lattice{120, 100};
  std::mt19937 random(4);
  for (const Case& c : cases) {
    Labels labels;
    for (std::int64_t y = 0; y < lattice.height; ++y) {
      const double border = c.border(static_cast<double>(y), random() % 2 == 0 ? 0.0 : 1.0);
      for (std::int64_t x = 0; x < lattice.width; ++x) {
        labels.push_back(static_cast<double>(x) < border ? 0 : 1);
      }
    }
    const auto polygons = SeamPolygons(labels, lattice, 3, 4, c.tolerance);
    EXPECT_LE(VertexCount(polygons[0]), c.most) << c.name;
    EXPECT_LE(VertexCount(polygons[1]), c.most) << c.name;
    EXPECT_TRUE(polygons[2].rings.empty());
  }
}

}  // namespace
}  // namespace zarn::app
