// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

#include "tests/support/vectortargets.h"
#include "tests/support/windowfiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesOnScene;
using testsupport::AgreesWithReference;
using testsupport::ForEachVectorTarget;
using testsupport::Shape;
using testsupport::TestBlock;
using testsupport::TestedBlobs;
using testsupport::TestedMedian;
using testsupport::TestedNoise;
using testsupport::WindowParameters;

template <typename T>
class WindowFilterScenes : public ::testing::Test {};
TYPED_TEST_SUITE(WindowFilterScenes, testsupport::HandledTypes, testsupport::TypeNames);

TYPED_TEST(WindowFilterScenes, AgreeWithTheReferencesOnEveryVectorTarget) {
  std::uint64_t first = 0;
  ForEachVectorTarget([&] {
    for (std::uint64_t seed = first; seed < first + 400; ++seed) {
      ASSERT_TRUE((AgreesOnScene<TestedMedian, TypeParam>(seed)));
      ASSERT_TRUE((AgreesOnScene<TestedNoise, TypeParam>(seed)));
      ASSERT_TRUE((AgreesOnScene<TestedBlobs, TypeParam>(seed)));
    }
    first += 400;
  });
}

// All widths up to twice the lanes of the widest vector and three more, and rows so long that they
// are taken in pieces.
TYPED_TEST(WindowFilterScenes, AgreeAtAllWidths) {
  std::vector<std::uint32_t> widths = {1030, 1371, 4099};
  for (std::uint32_t width = 1; width <= 131; ++width) widths.push_back(width);
  ForEachVectorTarget([&] {
    for (const std::uint32_t width : widths) {
      const std::uint32_t channels = 1 + width % 5;
      const auto half = 1 + width % 3;
      const TestBlock<TypeParam> input(
          {.width = width, .height = 3, .channels = channels, .marginX = half, .marginY = half});
      const TestBlock<TypeParam> output({.width = width, .height = 3, .channels = channels});
      for (const double noData : {-1.0, 41.0}) {
        const WindowParameters parameters{.kernelSize = static_cast<int>(2 * half + 1),
                                          .background = 73 + noData,
                                          .inputNoData = std::vector<double>(channels, noData),
                                          .outputNoData = std::vector<double>(channels, 56)};
        ASSERT_TRUE(AgreesWithReference<TestedMedian>(parameters, input, {}, output)) << width;
        ASSERT_TRUE(AgreesWithReference<TestedNoise>(parameters, input, {}, output)) << width;
        ASSERT_TRUE(AgreesWithReference<TestedBlobs>(parameters, input, {}, output)) << width;
      }
    }
  });
}

}  // namespace
}  // namespace zarn::processes::filters
