// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>

#include <cstdint>

#if ZARN_SIMD
#include <hwy/targets.h>
#endif

namespace zarn::testsupport {

/// Calls `use()` once with the kernels of each vector target of this CPU, whatever it would choose.
template <class Use>
void ForEachVectorTarget(const Use& use) {
#if ZARN_SIMD
  const auto choose = [](std::int64_t target) {
    hwy::SetSupportedTargetsForTest(target);
    hwy::GetChosenTarget().DeInit();
  };
  for (const std::int64_t target : hwy::SupportedAndGeneratedTargets()) {
    SCOPED_TRACE(hwy::TargetName(target));
    choose(target);
    use();
  }
  choose(0);
#else
  use();
#endif
}

}  // namespace zarn::testsupport
