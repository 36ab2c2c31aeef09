// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <limits>
#include <queue>
#include <random>
#include <utility>
#include <vector>

#include "apps/zarn/mosaic/gridcut.h"

namespace zarn::app {
namespace {

constexpr std::size_t kAlwaysExact = std::numeric_limits<std::size_t>::max();

int Draw(std::mt19937& random, int most) {
  return static_cast<int>(random() % static_cast<unsigned>(most + 1));
}

CutProblem RandomProblem(WindowSize size, std::mt19937& random, int openOfTen) {
  CutProblem problem(size);
  const auto width = static_cast<std::size_t>(size.width);
  for (auto& open : problem.open) open = Draw(random, 9) < openOfTen ? 1 : 0;
  for (std::size_t cell = 0; cell < problem.open.size(); ++cell) {
    if (problem.open[cell] == 0) continue;
    // Few different costs, so that there are ties.
    if (Draw(random, 1) == 0) problem.pull[cell] = Draw(random, 12) - 6;
    const std::size_t x = cell % width;
    const bool last = cell + width >= problem.open.size();
    const auto link = [&](CutProblem::Link to, bool exists, std::size_t other) {
      if (exists && problem.open[other] != 0) problem.links[cell][to] = Draw(random, 5);
    };
    link(CutProblem::kEast, x + 1 < width, cell + 1);
    link(CutProblem::kSouthWest, !last && x > 0, cell + width - 1);
    link(CutProblem::kSouth, !last, cell + width);
    link(CutProblem::kSouthEast, !last && x + 1 < width, cell + width + 1);
  }
  return problem;
}

TEST(MinimumCut, IsTheBestOfAllCuts) {
  std::mt19937 random(7);
  for (int run = 0; run < 300; ++run) {
    const WindowSize size{1 + Draw(random, 3), 1 + Draw(random, 2)};
    const CutProblem problem = RandomProblem(size, random, 9);
    const std::size_t cells = problem.open.size();
    // Cost, and cells of the second side.
    std::pair<std::int64_t, int> best{std::numeric_limits<std::int64_t>::max(), 0};
    std::vector<std::uint8_t> sides(cells);
    for (std::uint32_t bits = 0; bits < 1u << cells; ++bits) {
      bool fits = true;
      for (std::size_t i = 0; i < cells; ++i) {
        sides[i] = bits >> i & 1;
        fits = fits && (sides[i] == 0 || problem.open[i] != 0);
      }
      if (fits) best = std::min(best, {CutCost(problem, sides), std::popcount(bits)});
    }
    const auto cut = MinimumCut(problem, kAlwaysExact);
    ASSERT_EQ(CutCost(problem, cut), best.first) << run;
    ASSERT_EQ(std::count(cut.begin(), cut.end(), 1), best.second) << run;
  }
}

// Without links over corners the cut between the upper and the lower row is a path from left to
// right along the edges of the cells.
std::int64_t CheapestPath(const CutProblem& problem) {
  const std::int64_t width = problem.size.width;
  const std::int64_t height = problem.size.height;
  const auto linkAt = [&](std::int64_t x, std::int64_t y, CutProblem::Link link) {
    return problem.links[static_cast<std::size_t>(y * width + x)][link];
  };
  // Corners of cells, (x, y) being the upper left one of that cell; not on the frame above and
  // below.
  std::vector<std::int64_t> cost(static_cast<std::size_t>((width + 1) * (height + 1)),
                                 std::numeric_limits<std::int64_t>::max());
  using Entry = std::pair<std::int64_t, std::pair<std::int64_t, std::int64_t>>;
  std::priority_queue<Entry, std::vector<Entry>, std::greater<>> open;
  const auto reach = [&](std::int64_t x, std::int64_t y, std::int64_t total) {
    auto& known = cost[static_cast<std::size_t>(y * (width + 1) + x)];
    if (total >= known) return;
    known = total;
    open.push({total, {x, y}});
  };
  for (std::int64_t y = 1; y < height; ++y) reach(0, y, 0);
  while (true) {
    const auto [total, corner] = open.top();
    const auto [x, y] = corner;
    open.pop();
    if (x == width) return total;
    reach(x + 1, y, total + linkAt(x, y - 1, CutProblem::kSouth));
    if (x == 0) continue;
    reach(x - 1, y, total + linkAt(x - 1, y - 1, CutProblem::kSouth));
    if (y + 1 < height) reach(x, y + 1, total + linkAt(x - 1, y, CutProblem::kEast));
    if (y > 1) reach(x, y - 1, total + linkAt(x - 1, y - 1, CutProblem::kEast));
  }
}

CutProblem Strip(WindowSize size, const std::function<int(std::int64_t, std::int64_t)>& costAt) {
  CutProblem problem(size);
  for (std::int64_t y = 0; y < size.height; ++y) {
    for (std::int64_t x = 0; x < size.width; ++x) {
      const auto cell = static_cast<std::size_t>(y * size.width + x);
      problem.open[cell] = 1;
      if (x + 1 < size.width) problem.links[cell][CutProblem::kEast] = costAt(x, y);
      if (y + 1 < size.height) problem.links[cell][CutProblem::kSouth] = costAt(x, y);
      if (y == 0) problem.pull[cell] = 1 << 27;
      if (y + 1 == size.height) problem.pull[cell] = -(1 << 27);
    }
  }
  return problem;
}

TEST(MinimumCut, IsTheCheapestPathThroughAStrip) {
  std::mt19937 random(11);
  for (const WindowSize size : {WindowSize{90, 70}, WindowSize{7, 130}, WindowSize{200, 3}}) {
    const CutProblem strip =
        Strip(size, [&](std::int64_t, std::int64_t) { return 1 + Draw(random, 30); });
    EXPECT_EQ(CutCost(strip, MinimumCut(strip, kAlwaysExact)), CheapestPath(strip)) << size.width;
  }
}

TEST(MinimumCut, FindsTheSameValleyOnCoarserCells) {
  // A valley of 6 cells that winds through noise, in a lattice that no square divides evenly.
  std::mt19937 random(13);
  const WindowSize size{301, 187};
  const CutProblem strip = Strip(size, [&](std::int64_t x, std::int64_t y) {
    const std::int64_t middle = 90 + (x % 120 < 60 ? x % 60 : 60 - x % 60);
    return (std::abs(y - middle) <= 3 ? 1 : 40) + Draw(random, 4);
  });
  const auto exact = CutCost(strip, MinimumCut(strip, kAlwaysExact));
  EXPECT_EQ(exact, CheapestPath(strip));
  EXPECT_EQ(CutCost(strip, MinimumCut(strip, 1000)), exact);
}

TEST(MinimumCut, SeesWhatSquaresHide) {
  // Two cells of the same square that must go to different sides, far from any other cut.
  CutProblem problem = Strip({64, 64}, [](std::int64_t, std::int64_t) { return 1; });
  problem.pull[20 * 64 + 20] = -(1 << 27);
  problem.pull[20 * 64 + 21] = 1 << 27;
  const auto cut = MinimumCut(problem, 16);
  EXPECT_EQ(cut[20 * 64 + 20], 1);
  EXPECT_EQ(CutCost(problem, cut), 64 + 4);
}

}  // namespace
}  // namespace zarn::app
