// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdint>

#include "tests/support/windowfiltering.h"

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesOnScene;

template <typename T>
class WindowFilterScenes : public ::testing::Test {};
TYPED_TEST_SUITE(WindowFilterScenes, testsupport::HandledTypes, testsupport::TypeNames);

TYPED_TEST(WindowFilterScenes, AgreeWithTheReferences) {
  for (std::uint64_t seed = 0; seed < 1500; ++seed) {
    ASSERT_TRUE((AgreesOnScene<testsupport::TestedMedian, TypeParam>(seed)));
    ASSERT_TRUE((AgreesOnScene<testsupport::TestedNoise, TypeParam>(seed)));
    ASSERT_TRUE((AgreesOnScene<testsupport::TestedBlobs, TypeParam>(seed)));
  }
}

}  // namespace
}  // namespace zarn::processes::filters
