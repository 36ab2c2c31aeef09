// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <omp.h>

#include <cstdint>

#include "tests/support/attributefiltering.h"

// Linked with the stub that ignores omp_set_dynamic: the threads asked for are those that run.

namespace zarn::processes::filters {
namespace {

using testsupport::AgreesOnAttributeScene;

template <typename T>
class AttributeFilterScenes : public ::testing::Test {};
TYPED_TEST_SUITE(AttributeFilterScenes, testsupport::HandledTypes, testsupport::TypeNames);

TYPED_TEST(AttributeFilterScenes, AgreeWithTheReference) {
  const int threads = omp_get_max_threads();
  for (std::uint64_t seed = 0; seed < 700; ++seed) {
    omp_set_num_threads(1 + static_cast<int>(seed % 3));
    ASSERT_TRUE(AgreesOnAttributeScene<TypeParam>(seed));
  }
  omp_set_num_threads(threads);
}

}  // namespace
}  // namespace zarn::processes::filters
