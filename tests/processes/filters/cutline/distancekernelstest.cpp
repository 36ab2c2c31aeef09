// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <hwy/highway.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <vector>

#include "processes/filters/cutline/distancerows_simd.h"
#include "tests/support/randomnumbers.h"

namespace zarn::processes::filters {
namespace {

class DistanceKernels : public ::testing::TestWithParam<std::int64_t> {
 protected:
  void SetUp() override { Choose(GetParam()); }
  void TearDown() override { Choose(0); }

 private:
  static void Choose(std::int64_t target) {
    hwy::SetSupportedTargetsForTest(target);
    hwy::GetChosenTarget().DeInit();
  }
};

TEST_P(DistanceKernels, GiveTheBitsOfTheDefinition) {
  testsupport::RandomNumbers random(5);
  constexpr std::size_t kColumns = 128;
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  for (int round = 0; round < 3000; ++round) {
    // On centres, tiny, huge or anywhere; lying, standing, without length.
    const double scale = random.Pick<double>({0.5, 1e-170, 1e9, 40.123, 3.7});
    std::vector<PolygonEdge> edges(1 + random.Below(random.Percent(30) ? kMostGrouped : 5));
    const DistanceRow at{.squared = nullptr, .left = 1000, .row = 77};
    double minX = kInfinity;
    double maxX = -kInfinity;
    double above = kInfinity;
    for (PolygonEdge& edge : edges) {
      const auto somewhere = [&] { return scale * std::round(40 * random.Fraction()); };
      edge.x0 = 1064.5 + somewhere();
      edge.y0 = 77.5 + somewhere();
      edge.x1 = random.Percent(20) ? edge.x0 : 1064.5 + somewhere();
      edge.y1 = random.Percent(20) ? edge.y0 : 77.5 + somewhere();
      edge.firstBand = random.Percent(10) ? 78 : 0;
      edge.lastBand = 100;
      minX = std::min({minX, edge.x0, edge.x1});
      maxX = std::max({maxX, edge.x0, edge.x1});
      above = std::min(above, std::max({std::min(edge.y0, edge.y1) - 77.5,
                                        77.5 - std::max(edge.y0, edge.y1), 0.0}));
    }
    std::vector<double> known(kColumns, kInfinity);
    if (random.Percent(70)) {
      for (double& squared : known) squared = 400 * scale * scale * (1 + random.Fraction());
    }
    const std::size_t first = random.Below(64);
    const std::size_t end = first + random.Below(64);
    const double slack = 1e-6 + 1e-13 * 1e11;
    std::vector<double> lowered = known;
    const NearEdges near{.edges = edges.data(),
                         .count = edges.size(),
                         .minX = minX - slack,
                         .maxX = maxX + slack,
                         .above = std::max(above - slack, 0.0)};
    LowerDistances(near, first, end, {.squared = lowered.data(), .left = at.left, .row = at.row});
    std::vector<double> together = known;
    const bool isShared = std::ranges::all_of(
        edges, [&](const PolygonEdge& edge) { return edge.firstBand <= at.row; });
    if (isShared && edges.size() > 1) {
      GroupedEdges grouped(GroupedEdges::kPart + GroupedEdges::PlacesFor(edges.size()));
      NearEdges inParts = near;
      inParts.grouped = &grouped;
      inParts.place = GroupedEdges::kPart * random.Below(2);
      grouped.Put(edges.data(), edges.size(), slack, inParts.place);
      LowerDistances(inParts, first, end,
                     {.squared = together.data(), .left = at.left, .row = at.row});
    } else {
      together = lowered;
    }
    std::vector<NarrowEdge> narrow;
    for (const PolygonEdge& e : edges) {
      narrow.push_back({e.x0, e.y0, e.x1, e.y1, e.firstBand, e.lastBand,
                        static_cast<std::uint32_t>(first), static_cast<std::uint32_t>(end)});
    }
    std::vector<double> narrowed = known;
    LowerNarrowDistances(narrow.data(), narrow.size(),
                         {.squared = narrowed.data(), .left = at.left, .row = at.row});
    for (std::size_t i = 0; i < kColumns; ++i) {
      double smallest = known[i];
      for (const PolygonEdge& edge : edges) {
        if (edge.firstBand > at.row) continue;
        smallest = std::min(smallest, SquaredDistance(edge, 1000.5 + static_cast<double>(i), 77.5));
      }
      if (i < first || i >= end) {
        ASSERT_TRUE(lowered[i] == known[i] || lowered[i] == smallest);
        ASSERT_TRUE(narrowed[i] == known[i] || narrowed[i] == smallest);
        ASSERT_TRUE(together[i] == known[i] || together[i] == smallest);
      } else {
        ASSERT_EQ(lowered[i], smallest) << "round " << round << " column " << i;
        ASSERT_EQ(narrowed[i], smallest) << "round " << round << " column " << i;
        ASSERT_EQ(together[i], smallest) << "round " << round << " column " << i;
      }
    }
    const std::uint64_t inside = random.Next();
    const double blend = random.Pick<double>({1, 7, 20});
    std::vector<double> weights = lowered;
    const std::uint64_t band = WeighDistances(weights.data(), inside, blend);
    for (std::size_t i = 0; i < kWordColumns; ++i) {
      const double weight = std::sqrt(lowered[i]) / blend;
      ASSERT_EQ(weights[i], (inside >> i & 1) != 0 ? weight : -weight);
      ASSERT_EQ((band >> i & 1) != 0, weight < 1);
    }
    BoundBelow(weights.data(), blend, 1.5, blend + 0.5);
    for (std::size_t i = 0; i < kWordColumns; ++i) {
      const double bound = std::min(std::sqrt(lowered[i]) + 1.5, blend + 0.5);
      ASSERT_NEAR(weights[i], bound * bound, 1e-12 * bound * bound);
    }
  }
}

INSTANTIATE_TEST_SUITE_P(AllOfThisCPU, DistanceKernels,
                         ::testing::ValuesIn(hwy::SupportedAndGeneratedTargets()),
                         [](const auto& target) {
                           return std::string(hwy::TargetName(target.param));
                         });

}  // namespace
}  // namespace zarn::processes::filters
