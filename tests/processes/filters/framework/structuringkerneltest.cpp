// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "processes/filters/framework/structuringkernel.h"

namespace zarn::processes::filters {
namespace {

std::vector<int> Kernel(float size, KernelShape shape) {
  std::vector<int> offsets = {7, 7, 7};
  SetupKernelSE(size, offsets, shape);
  return offsets;
}

// The cells as rows of text; the order of the list is checked apart.
std::vector<std::string> Draw(const std::vector<int>& offsets, int half) {
  const auto side = static_cast<std::size_t>(2 * half + 1);
  std::vector<std::string> rows(side, std::string(side, '.'));
  for (std::size_t k = 0; k < offsets.size(); k += 2) {
    rows.at(static_cast<std::size_t>(offsets[k + 1] + half))
        .at(static_cast<std::size_t>(offsets[k] + half)) = '#';
  }
  return rows;
}

using Rows = std::vector<std::string>;

TEST(StructuringKernel, HasTheCellsOfItsShape) {
  const struct {
    float size;
    KernelShape shape;
    int half;
    Rows cells;
  } cases[] = {
      {1, KernelShape::kSquare, 0, {"#"}},
      {0.1F, KernelShape::kDisc, 0, {"#"}},
      {1.5F, KernelShape::kDisc, 1, {"...", ".#.", "..."}},
      {2, KernelShape::kSquare, 1, {"###", "###", "###"}},
      {2, KernelShape::kDisc, 1, {".#.", "###", ".#."}},
      {2.5F, KernelShape::kDisc, 1, {".#.", "###", ".#."}},
      {3, KernelShape::kDisc, 1, {"###", "###", "###"}},
      {4, KernelShape::kDisc, 2, {"..#..", ".###.", "#####", ".###.", "..#.."}},
      {5, KernelShape::kDisc, 2, {".###.", "#####", "#####", "#####", ".###."}},
      {5, static_cast<KernelShape>(2), 2, Rows(5, "#####")},
      {5, static_cast<KernelShape>(-1), 2, Rows(5, "#####")},
  };
  for (const auto& expected : cases) {
    const std::vector<int> offsets = Kernel(expected.size, expected.shape);
    EXPECT_EQ(Draw(offsets, expected.half), expected.cells) << expected.size;
  }
}

TEST(StructuringKernel, ListsColumnAfterColumn) {
  EXPECT_EQ(Kernel(2, KernelShape::kDisc), (std::vector<int>{-1, 0, 0, -1, 0, 0, 0, 1, 1, 0}));
  EXPECT_EQ(Kernel(3, KernelShape::kSquare),
            (std::vector<int>{-1, -1, -1, 0, -1, 1, 0, -1, 0, 0, 0, 1, 1, -1, 1, 0, 1, 1}));
}

TEST(StructuringKernel, IsEmptyWithoutSizeAndRefusesHugeOnes) {
  for (const float size : {0.0F, -0.0F, -1.0F, std::nanf("")}) {
    EXPECT_EQ(Kernel(size, KernelShape::kDisc), std::vector<int>());
  }
  for (const float size : {16384.002F, 1e30F, std::numeric_limits<float>::infinity()}) {
    std::vector<int> offsets = {1, 2};
    EXPECT_THROW(SetupKernelSE(size, offsets, KernelShape::kDisc), std::length_error);
    EXPECT_EQ(offsets, (std::vector<int>{1, 2}));
  }
}

TEST(StructuringKernel, IsCopiedIntoAnArray) {
  for (const std::vector<int>& offsets : {std::vector<int>{}, {3, -4, 5}}) {
    int* array = nullptr;
    int count = -1;
    Vec2ArrSE(offsets, array, count);
    const std::unique_ptr<int[]> owned(array);
    ASSERT_NE(array, nullptr);
    EXPECT_EQ(std::vector<int>(array, array + count), offsets);
  }
}

}  // namespace
}  // namespace zarn::processes::filters
