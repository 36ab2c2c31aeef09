// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <hwy/targets.h>

#include <cstdint>
#include <string>

#include "tests/support/attributefiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesOnAttributeScene;

/// Runs the loops of one vector target, whatever the CPU would choose.
class AttributeFilterTargets : public ::testing::TestWithParam<std::int64_t> {
 protected:
  void SetUp() override { Choose(GetParam()); }
  void TearDown() override { Choose(0); }

  template <typename... Types>
  static void CompareScenes(std::uint64_t first, std::uint64_t end) {
    for (std::uint64_t seed = first; seed < end; ++seed) {
      (AssertAgrees<Types>(seed), ...);
      if (HasFatalFailure()) return;
    }
  }

 private:
  template <typename T>
  static void AssertAgrees(std::uint64_t seed) {
    ASSERT_TRUE(AgreesOnAttributeScene<T>(seed));
  }
  static void Choose(std::int64_t target) {
    hwy::SetSupportedTargetsForTest(target);
    hwy::GetChosenTarget().DeInit();
  }
};

TEST_P(AttributeFilterTargets, AgreeWithTheReference) {
  CompareScenes<std::uint8_t, std::int8_t, std::uint16_t, std::int16_t, std::uint32_t, std::int32_t,
                float, double>(50000, 50150);
}

INSTANTIATE_TEST_SUITE_P(AllOfThisCPU, AttributeFilterTargets,
                         ::testing::ValuesIn(hwy::SupportedAndGeneratedTargets()),
                         [](const auto& target) {
                           return std::string(hwy::TargetName(target.param));
                         });

}  // namespace
}  // namespace zarn::processes::filters
