// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "apps/zarn/mosaic/labellattice.h"
#include "apps/zarn/mosaic/seams.h"

namespace zarn::app {
namespace {

class NoProgress : public nspio::Counter {
  void Report(double, const std::string&) override {}
};

using Labels = std::vector<std::uint32_t>;
using Rows = std::vector<std::string>;

std::size_t Cell(WindowSize lattice, std::int64_t x, std::int64_t y) {
  return static_cast<std::size_t>(y * lattice.width + x);
}

// A scene of one channel from a picture of its area: digits are values, anything else no data.
SceneView Scene(const Rows& rows, std::int64_t x = 0, std::int64_t y = 0) {
  SceneView view;
  view.area = {x, y, static_cast<std::int64_t>(rows[0].size()),
               static_cast<std::int64_t>(rows.size())};
  view.channels = 1;
  for (const std::string& row : rows) {
    for (const char value : row) {
      view.valid.push_back(value >= '0' && value <= '9' ? 1 : 0);
      view.colours.push_back(static_cast<float>(value - '0'));
    }
  }
  return view;
}

SceneView Block(const Window& area,
                const std::function<double(std::int64_t, std::int64_t)>& value) {
  SceneView view{area, 1, {}, {}};
  for (std::int64_t y = area.y; y < area.y + area.height; ++y) {
    for (std::int64_t x = area.x; x < area.x + area.width; ++x) {
      view.colours.push_back(static_cast<float>(value(x, y)));
      view.valid.push_back(1);
    }
  }
  return view;
}

bool IsValid(const SceneView& view, std::int64_t x, std::int64_t y) {
  const Window& area = view.area;
  if (x < area.x || y < area.y || x >= area.x + area.width || y >= area.y + area.height) {
    return false;
  }
  return view.valid[static_cast<std::size_t>((y - area.y) * area.width + x - area.x)] != 0;
}

Labels Find(const std::vector<SceneView>& scenes, WindowSize lattice, SeamOptions options = {}) {
  NoProgress progress;
  return FindSeams(scenes, lattice, options, progress);
}

Rows Picture(const Labels& labels, WindowSize lattice) {
  Rows rows;
  for (std::size_t i = 0; i < labels.size(); ++i) {
    if (i % static_cast<std::size_t>(lattice.width) == 0) rows.emplace_back();
    rows.back() += static_cast<char>('0' + labels[i]);
  }
  return rows;
}

TEST(FindSeams, SharesOutSmallLattices) {
  struct Case {
    const char* name;
    std::vector<SceneView> scenes;
    Rows expected;
  };
  const Case cases[] = {
      {"one scene, data missing", {Scene({"5.5", ".5."})}, {"000", "000"}},
      {"no data at all", {Scene({"..."}), Scene({"..."})}, {"000"}},
      {"only touching", {Scene({"11", "11"}), Scene({"22", "22"}, 2)}, {"0011", "0011"}},
      {"apart: the nearer one", {Scene({"1"}), Scene({"2"}, 5)}, {"000111"}},
      {"apart: the lower of two as near", {Scene({"1"}, 4), Scene({"2"})}, {"11000"}},
      {"the same area", {Scene({"123", "456"}), Scene({"999", "999"})}, {"000", "000"}},
      {"two common areas, equal ground",
       {Scene({"1111", "1111", "1111", "....", "1111", "1111", "1111"}),
        Scene({"1111", "1111", "1111", "1111", "1111", "1111", "1111"}, 2)},
       {"000111", "000111", "001111", "001111", "001111", "000111", "000111"}},
      {"an area within another keeps its core",
       {Scene(Rows(7, "111111111")), Scene(Rows(5, "2222222"), 1, 1)},
       {"000000000", "000000000", "001111100", "001111100", "001111100", "000000000", "000000000"}},
      {"so it does when it comes first",
       {Scene(Rows(5, "2222222"), 1, 1), Scene(Rows(7, "111111111"))},
       {"111111111", "111111111", "110000011", "110000011", "110000011", "111111111", "111111111"}},
  };
  SeamOptions options;
  options.smallestIsland = 1;
  for (const Case& c : cases) {
    const WindowSize lattice{static_cast<std::int64_t>(c.expected[0].size()),
                             static_cast<std::int64_t>(c.expected.size())};
    EXPECT_EQ(Picture(Find(c.scenes, lattice, options), lattice), c.expected) << c.name;
  }
}

// Whether the seam of a lattice of two scenes passes the cell.
bool IsAtSeam(const Labels& labels, WindowSize lattice, std::int64_t x, std::int64_t y) {
  const std::uint32_t here = labels[Cell(lattice, x, y)];
  return (x + 1 < lattice.width && labels[Cell(lattice, x + 1, y)] != here) ||
         (y + 1 < lattice.height && labels[Cell(lattice, x, y + 1)] != here);
}

constexpr WindowSize kPair{160, 90};
constexpr Window kLeft{0, 0, 110, 90};
constexpr Window kRight{50, 0, 110, 90};

TEST(FindSeams, FollowsThePathWithoutDifferenceInEveryUnit) {
  const auto ground = [](std::int64_t x, std::int64_t y) {
    return 20.0 + static_cast<double>((x * 7 + y * 3) % 11);
  };
  const auto isPath = [](std::int64_t x, std::int64_t y) {
    return std::abs(static_cast<double>(x) - 80 - 18 * std::sin(static_cast<double>(y) / 14)) <= 3;
  };
  const auto scenes = [&](double scale) {
    return std::vector<SceneView>{
        Block(kLeft, [&](auto x, auto y) { return scale * ground(x, y); }),
        Block(kRight, [&](auto x, auto y) {
          return scale * (ground(x, y) + (isPath(x, y) ? 0 : 5 + static_cast<double>(y % 2)));
        })};
  };
  const Labels bytes = Find(scenes(1), kPair);
  EXPECT_EQ(bytes, Find(scenes(256), kPair));
  for (std::int64_t y = 0; y < kPair.height; ++y) {
    for (std::int64_t x = 0; x < kPair.width; ++x) {
      ASSERT_TRUE(!IsAtSeam(bytes, kPair, x, y) || isPath(x, y)) << x << ' ' << y;
    }
  }
}

TEST(FindSeams, LeavesRoomForTheFeatherOverEqualGround) {
  const auto flat = [](auto, auto) { return 9.0; };
  const std::vector<SceneView> scenes{Block(kLeft, flat), Block(kRight, flat)};
  for (const double feather : {0.0, 12.0}) {
    SeamOptions options;
    options.feather = feather;
    const Labels labels = Find(scenes, kPair, options);
    std::int64_t length = 0;
    for (std::int64_t y = 0; y < kPair.height; ++y) {
      for (std::int64_t x = 0; x < kPair.width; ++x) {
        if (!IsAtSeam(labels, kPair, x, y)) continue;
        ++length;
        EXPECT_NEAR(static_cast<double>(x), 79.5, 28 - feather);
      }
    }
    EXPECT_EQ(length, kPair.height) << "straight down";
  }
}

TEST(FindSeams, KeepsOffTheEdgeEvenWhereItDiffersLeast) {
  // Equal right beside the edge of the first scene, hardly different further in.
  const std::vector<SceneView> scenes{Block(kLeft, [](auto, auto) { return 10.0; }),
                                      Block(kRight, [](std::int64_t x, std::int64_t y) {
                                        return x >= 108 ? 10.0
                                                        : 11.0 + 0.1 * static_cast<double>(y % 3);
                                      })};
  SeamOptions options;
  options.feather = 6;
  const Labels labels = Find(scenes, kPair, options);
  for (std::int64_t y = 0; y < kPair.height; ++y) {
    EXPECT_EQ(labels[Cell(kPair, 56, y)], 0u);
    EXPECT_EQ(labels[Cell(kPair, 103, y)], 1u);
  }
}

// Rectangles with holes and specks without data, over each other in any way.
std::vector<SceneView> RandomScenes(WindowSize lattice, std::mt19937& random) {
  const auto draw = [&](std::int64_t low, std::int64_t high) {
    return low + static_cast<std::int64_t>(random() % static_cast<unsigned>(high - low + 1));
  };
  std::vector<SceneView> scenes;
  const std::int64_t count = draw(2, 5);
  for (std::int64_t i = 0; i < count; ++i) {
    Window area{draw(0, lattice.width - 2), draw(0, lattice.height - 2), 0, 0};
    area.width = draw(1, lattice.width - area.x);
    area.height = draw(1, lattice.height - area.y);
    SceneView view = Block(area, [&](auto, auto) { return static_cast<double>(draw(0, 40)); });
    const Window hole{draw(0, area.width), draw(0, area.height), draw(0, 9), draw(0, 9)};
    for (std::size_t cell = 0; cell < view.valid.size(); ++cell) {
      const std::int64_t x = static_cast<std::int64_t>(cell) % area.width - hole.x;
      const std::int64_t y = static_cast<std::int64_t>(cell) / area.width - hole.y;
      const bool inHole = x >= 0 && y >= 0 && x < hole.width && y < hole.height;
      if (inHole || draw(0, 99) == 0) {
        view.valid[cell] = 0;
        view.colours[cell] = std::nanf("");
      }
    }
    scenes.push_back(std::move(view));
  }
  return scenes;
}

TEST(FindSeams, ShowsDataWhereverThereIsSome) {
  std::mt19937 random(3);
  for (int run = 0; run < 60; ++run) {
    const WindowSize lattice{35, 27};
    const std::vector<SceneView> scenes = RandomScenes(lattice, random);
    SeamOptions options;
    options.feather = run % 4;
    options.exactCells = run % 2 == 0 ? 20 : 100000;
    const Labels labels = Find(scenes, lattice, options);
    for (std::int64_t y = 0; y < lattice.height; ++y) {
      for (std::int64_t x = 0; x < lattice.width; ++x) {
        const std::uint32_t label = labels[Cell(lattice, x, y)];
        ASSERT_LT(label, scenes.size());
        const bool someValid = std::any_of(scenes.begin(), scenes.end(),
                                           [&](const SceneView& s) { return IsValid(s, x, y); });
        ASSERT_EQ(IsValid(scenes[label], x, y), someValid) << run << ": " << x << ' ' << y;
      }
    }
  }
}

TEST(FindSeams, LetsNoneOfThreeNestedScenesVanish) {
  const WindowSize lattice{40, 40};
  const auto noise = [](std::int64_t x, std::int64_t y) {
    return static_cast<double>((x * 131 + y * 71) % 17);
  };
  const std::vector<Window> areas{{2, 2, 36, 36}, {10, 10, 20, 20}, {14, 14, 12, 12}};
  std::vector<std::size_t> order{0, 1, 2};
  do {
    std::vector<SceneView> scenes;
    for (const std::size_t i : order) scenes.push_back(Block(areas[i], noise));
    const Labels labels = Find(scenes, lattice);
    for (std::uint32_t label = 0; label < 3; ++label) {
      EXPECT_GE(std::count(labels.begin(), labels.end(), label), 20)
          << order[0] << order[1] << label;
    }
  } while (std::next_permutation(order.begin(), order.end()));
}

TEST(FillFromNearest, FindsTheNearestLabelAndTheLowerOfTwo) {
  std::mt19937 random(5);
  for (int run = 0; run < 40; ++run) {
    const WindowSize lattice{23, 17};
    Labels labels(23 * 17, kNoLabel);
    for (int i = 0; i < 1 + run / 2; ++i) labels[random() % labels.size()] = random() % 4;
    Labels filled(labels);
    FillFromNearest(filled, lattice);
    for (std::size_t cell = 0; cell < labels.size(); ++cell) {
      std::pair<std::size_t, std::uint32_t> best{labels.size() * labels.size(), 0};
      for (std::size_t other = 0; other < labels.size(); ++other) {
        if (labels[other] == kNoLabel) continue;
        const std::size_t dx = std::max(cell % 23, other % 23) - std::min(cell % 23, other % 23);
        const std::size_t dy = std::max(cell / 23, other / 23) - std::min(cell / 23, other / 23);
        best = std::min(best, {dx * dx + dy * dy, labels[other]});
      }
      ASSERT_EQ(filled[cell], best.second) << run << ": " << cell;
    }
  }
}

TEST(MergeIslands, GivesThemToTheLargestNeighbourThatCanTakeThem) {
  const Rows before{"00002222", "01202112", "00002222", "33333333"};
  const WindowSize lattice{8, 4};
  Labels labels;
  for (const std::string& row : before) {
    for (const char c : row) labels.push_back(static_cast<std::uint32_t>(c - '0'));
  }
  // The 1 and the 2 in the left half are one after the other an island in 0.
  MergeIslands(labels, lattice, 3,
               [](std::size_t cell, std::uint32_t label) { return label != 2 || cell != 8 + 6; });
  EXPECT_EQ(Picture(labels, lattice), (Rows{"00002222", "00002112", "00002222", "33333333"}));
}

TEST(SeamResiduals, MeasuresBesideTheSeamOnly) {
  // Two channels; the second scene is 3 more in one, 5 more or less in the other, within 2 cells of
  // the seam, and quite different elsewhere.
  const WindowSize lattice{12, 6};
  SceneView first{{0, 0, 10, 6}, 2, {}, {}};
  SceneView second{{3, 0, 9, 6}, 2, {}, {}};
  Labels labels;
  for (std::int64_t y = 0; y < 6; ++y) {
    for (std::int64_t x = 0; x < 12; ++x) {
      const auto value = static_cast<float>(10 * x + y);
      labels.push_back(x < 6 ? 0 : 1);
      const bool isNear = x >= 4 && x < 8;
      const float noise = y % 2 == 0 ? 5.0f : -5.0f;
      if (x < 10) {
        first.valid.push_back(x == 5 && y < 2 ? 0 : 1);
        first.colours.insert(first.colours.end(), {value, value});
      }
      if (x >= 3) {
        second.valid.push_back(1);
        second.colours.insert(second.colours.end(),
                              {value + (isNear ? 3.0f : 90.0f), value + (isNear ? noise : 90.0f)});
      }
    }
  }
  const auto residuals = SeamResiduals(labels, lattice, {first, second});
  ASSERT_EQ(residuals.size(), 1u);
  EXPECT_EQ(residuals[0].first, 0u);
  EXPECT_EQ(residuals[0].second, 1u);
  EXPECT_EQ(residuals[0].length, 6);
  EXPECT_EQ(residuals[0].cells, 4 * 6 - 2);
  EXPECT_EQ(residuals[0].meanDifference, (std::vector<double>{3, 0}));
  EXPECT_EQ(residuals[0].rootMeanSquare, (std::vector<double>{3, 5}));
}

}  // namespace
}  // namespace zarn::app
