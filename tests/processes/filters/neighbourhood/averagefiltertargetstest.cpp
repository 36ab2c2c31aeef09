// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <hwy/targets.h>

#include <cstdint>
#include <string>

#include "tests/support/windowfiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesOnScene;
using testsupport::AgreesWithReference;
using testsupport::Shape;
using testsupport::TestBlock;
using testsupport::TestedAverage;
using testsupport::WindowParameters;

/// Runs the kernels of one vector target, whatever the CPU would choose.
class AverageTargetsTest : public ::testing::TestWithParam<std::int64_t> {
 protected:
  void SetUp() override { Choose(GetParam()); }
  void TearDown() override { Choose(0); }

  template <typename T>
  static void CompareScenes() {
    for (std::uint64_t seed = 50000; seed < 50600; ++seed) {
      ASSERT_TRUE((AgreesOnScene<TestedAverage, T>(seed)));
    }
  }

  // All widths up to twice the lanes of the widest vector and three more.
  template <typename T>
  static void CompareWidths() {
    for (std::uint32_t width = 1; width <= 131; ++width) {
      const std::uint32_t channels = 1 + width % 3;
      const Shape shape{
          .width = width, .height = 2, .channels = channels, .marginX = 2, .marginY = 2};
      const TestBlock<T> input(shape);
      const TestBlock<T> output({.width = width, .height = 2, .channels = channels});
      for (const double noData : {-1.0, 41.0}) {
        const WindowParameters parameters{.kernelSize = 5,
                                          .background = 73 + noData,
                                          .inputNoData = std::vector<double>(channels, noData),
                                          .outputNoData = std::vector<double>(channels, 56)};
        ASSERT_TRUE(AgreesWithReference<TestedAverage>(parameters, input, {}, output))
            << width << " wide";
      }
    }
  }

  template <typename... Types>
  static void CompareTypes() {
    (CompareScenes<Types>(), ...);
    (CompareWidths<Types>(), ...);
  }

 private:
  static void Choose(std::int64_t target) {
    hwy::SetSupportedTargetsForTest(target);
    hwy::GetChosenTarget().DeInit();
  }
};

TEST_P(AverageTargetsTest, AgreesWithTheReference) {
  CompareTypes<std::uint8_t, std::int8_t, std::uint16_t, std::int16_t, std::uint32_t, std::int32_t,
               float, double>();
}

INSTANTIATE_TEST_SUITE_P(AllOfThisCPU, AverageTargetsTest,
                         ::testing::ValuesIn(hwy::SupportedAndGeneratedTargets()),
                         [](const auto& target) {
                           return std::string(hwy::TargetName(target.param));
                         });

}  // namespace
}  // namespace zarn::processes::filters
