// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#if ZARN_SIMD
#include <hwy/targets.h>
#endif
#include <omp.h>

#include <climits>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "processes/filters/framework/morphology.h"
#include "processes/filters/framework/structuringkernel.h"
#include "tests/support/morphologyreference.h"
#include "tests/support/randomnumbers.h"

namespace zarn::processes::filters {
namespace {

using testsupport::MorphologyCase;
using testsupport::RandomNumbers;
using testsupport::ReferenceMorphology;
using Rows = std::vector<std::string>;

// Images as text: '#' is the value to match, '.' another one.
using Operation = void (*)(const std::uint8_t*, std::uint8_t*, int, int, std::uint8_t, std::uint8_t,
                           const std::vector<int>&);

Rows Apply(Operation operation, const Rows& image, const std::vector<int>& offsets) {
  const int width = static_cast<int>(image.front().size());
  const int height = static_cast<int>(image.size());
  std::string input;
  for (const std::string& row : image) input += row;
  std::string output(input.size(), ' ');
  operation(reinterpret_cast<const std::uint8_t*>(input.data()),
            reinterpret_cast<std::uint8_t*>(output.data()), width, height, '#', 'o', offsets);
  Rows rows;
  for (std::size_t i = 0; i < output.size(); i += image.front().size()) {
    rows.push_back(output.substr(i, image.front().size()));
  }
  return rows;
}

std::vector<int> Square(int size) {
  std::vector<int> offsets;
  SetupKernelSE(static_cast<float>(size), offsets, KernelShape::kSquare);
  return offsets;
}

TEST(Morphology, GrowsAndShrinksTheRegionOfAValue) {
  const Rows dot = {".....", ".....", "..#..", ".....", "....."};
  EXPECT_EQ(Apply(MorphDilation, dot, Square(3)),
            (Rows{"     ", " ooo ", " ooo ", " ooo ", "     "}));
  EXPECT_EQ(Apply(MorphErosion, dot, Square(3)), Rows(5, "     "));
  // Only the pixel itself.
  EXPECT_EQ(Apply(MorphErosion, dot, {0, 0}), Apply(MorphDilation, dot, {0, 0}));

  // The image border does not eat the region, and nothing grows in from outside.
  const Rows corner = {"###..", "###..", "###..", "....."};
  EXPECT_EQ(Apply(MorphErosion, corner, Square(3)), (Rows{"oo   ", "oo   ", "     ", "     "}));
  EXPECT_EQ(Apply(MorphDilation, {"....", "...."}, Square(9)), Rows(2, "    "));
  EXPECT_EQ(Apply(MorphErosion, {"####", "####"}, Square(9)), Rows(2, "oooo"));

  // One offset: (2, -1) looks to the right and up; the pixel itself always counts.
  const Rows mark = {".....", "...#.", "....."};
  EXPECT_EQ(Apply(MorphDilation, mark, {2, -1}), (Rows{"     ", "   o ", " o   "}));
  EXPECT_EQ(Apply(MorphErosion, {"#.###", "#####"}, {2, -1}), (Rows{"o ooo", "ooooo"}));
  EXPECT_EQ(Apply(MorphErosion, {"###.#", "#####"}, {2, -1}), (Rows{"ooo o", "o ooo"}));
}

TEST(Morphology, DoesNothingWithoutOffsetsOrPixels) {
  const Rows image = {"#.#", "###"};
  for (const std::vector<int>& offsets : {std::vector<int>{}, {0}}) {
    EXPECT_EQ(Apply(MorphDilation, image, offsets), Rows(2, "   "));
    EXPECT_EQ(Apply(MorphErosion, image, offsets), Rows(2, "   "));
  }
  // An entry without its partner is ignored.
  EXPECT_EQ(Apply(MorphDilation, {".#.", "..."}, {0, 1, 1}), (Rows{" o ", "   "}));
  for (const int size : {0, -1, INT_MIN}) {
    MorphDilation(nullptr, nullptr, size, 5, 1, Square(3));
    MorphErosion(nullptr, nullptr, 5, size, 1, Square(3));
  }
}

TEST(Morphology, MatchesAndSetsOneValueInTheShortForm) {
  const std::vector<std::uint8_t> input = {0, 9, 0, 0, 9, 9};
  std::vector<std::uint8_t> output = {1, 2, 3, 4, 5, 6};
  MorphDilation(input.data(), output.data(), 6, 1, 9, {-1, 0});
  EXPECT_EQ(output, (std::vector<std::uint8_t>{1, 9, 9, 4, 9, 9}));
  output = {1, 2, 3, 4, 5, 6};
  MorphErosion(input.data(), output.data(), 6, 1, 9, {-1, 0});
  EXPECT_EQ(output, (std::vector<std::uint8_t>{1, 2, 3, 4, 5, 9}));
}

// A kernel of one of the kinds that there are, and some that nobody would make.
std::vector<int> DrawOffsets(RandomNumbers& random, int width, int height) {
  std::vector<int> offsets;
  const auto around = [&](int reach) {
    return static_cast<int>(random.Below(static_cast<std::uint32_t>(2 * reach + 1))) - reach;
  };
  switch (random.Below(5)) {
    case 0:
    case 1: {
      const float size = static_cast<float>(random.Between(1, 60)) / 2;
      SetupKernelSE(size, offsets, random.Percent(50) ? KernelShape::kDisc : KernelShape::kSquare);
      break;
    }
    case 2:  // scattered, with repetitions, some beyond the image
      for (std::uint32_t k = random.Between(1, 40); k > 0; --k) {
        offsets.insert(offsets.end(), {around(width + 1), around(height + 1)});
      }
      break;
    case 3: {  // a block off the centre
      const int left = around(20);
      const int top = around(6);
      const int side = static_cast<int>(random.Between(1, 70));
      for (int dy = top; dy < top + 3; ++dy) {
        for (int dx = left; dx < left + side; ++dx) offsets.insert(offsets.end(), {dx, dy});
      }
      break;
    }
    default:  // as far as numbers go
      for (std::uint32_t k = random.Between(1, 4); k > 0; --k) {
        offsets.insert(offsets.end(),
                       {random.Pick<int>({INT_MIN, INT_MAX, -64, 64, 63, -1, 0, 128}),
                        random.Pick<int>({INT_MIN, INT_MAX, -1, 0, 1, 2})});
      }
  }
  if (random.Percent(20)) offsets.push_back(around(5));
  return offsets;
}

void CompareWithReference(std::uint64_t seed) {
  RandomNumbers random(seed);
  MorphologyCase c;
  c.width = static_cast<int>(random.Between(1, random.Percent(70) ? 70 : 300));
  c.height = static_cast<int>(random.Between(1, 40));
  if (seed % 32 == 0) {  // enough to be shared out among threads
    c.width = static_cast<int>(random.Between(900, 1100));
    c.height = static_cast<int>(random.Between(73, 90));
  }
  c.matchValue = random.Pick<std::uint8_t>({0, 1, 127, 128, 255});
  c.setValue = random.Percent(30) ? c.matchValue : static_cast<std::uint8_t>(random.Below(256));
  c.offsets = DrawOffsets(random, c.width, c.height);

  // Large kernels meet nothing but the border unless the image is nearly of one kind.
  const std::uint32_t others = random.Pick<std::uint32_t>({0, 1, 2, 50, 98, 100});
  const std::size_t pixels = static_cast<std::size_t>(c.width) * static_cast<std::size_t>(c.height);
  std::vector<std::uint8_t> input(pixels);
  for (std::uint8_t& pixel : input) {
    pixel = random.Percent(others) ? static_cast<std::uint8_t>(random.Below(256)) : c.matchValue;
  }
  // What lies beside the output must not change either; its place is no aligned one.
  constexpr std::size_t kGuard = 67;
  std::vector<std::uint8_t> prepared(pixels + 2 * kGuard);
  for (std::uint8_t& pixel : prepared) pixel = static_cast<std::uint8_t>(random.Below(256));
  for (const bool erode : {false, true}) {
    std::vector<std::uint8_t> expected = prepared;
    ReferenceMorphology(c, erode, input.data(), expected.data() + kGuard);
    std::vector<std::uint8_t> actual = prepared;
    (erode ? Operation(MorphErosion) : Operation(MorphDilation))(
        input.data(), actual.data() + kGuard, c.width, c.height, c.matchValue, c.setValue,
        c.offsets);
    ASSERT_EQ(actual, expected) << "seed " << seed << ", " << (erode ? "erosion" : "dilation")
                                << " of " << c.width << "x" << c.height;
  }
}

TEST(Morphology, EqualsTheReferenceForEveryThreadCount) {
  const int before = omp_get_max_threads();
  for (const int threads : {1, 2, 5}) {
    omp_set_num_threads(threads);
    int team = 0;
#pragma omp parallel
    {
#pragma omp single
      team = omp_get_num_threads();
    }
    ASSERT_EQ(team, threads);
    for (std::uint64_t seed = 0; seed < 400; ++seed) {
      ASSERT_NO_FATAL_FAILURE(CompareWithReference(seed));
    }
  }
  omp_set_num_threads(before);
}

#if ZARN_SIMD
TEST(Morphology, EqualsTheReferenceOnEveryTarget) {
  for (const std::int64_t target : hwy::SupportedAndGeneratedTargets()) {
    SCOPED_TRACE(hwy::TargetName(target));
    hwy::SetSupportedTargetsForTest(target);
    hwy::GetChosenTarget().DeInit();
    for (std::uint64_t seed = 1000; seed < 1300; ++seed) {
      ASSERT_NO_FATAL_FAILURE(CompareWithReference(seed));
    }
  }
  hwy::SetSupportedTargetsForTest(0);
  hwy::GetChosenTarget().DeInit();
}
#endif

}  // namespace
}  // namespace zarn::processes::filters
