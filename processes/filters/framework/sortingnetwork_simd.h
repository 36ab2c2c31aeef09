// SPDX-License-Identifier: Apache-2.0

// Sorting networks over vectors, compiled once per vector target. Include it only from a
// `_simd.cpp` that Highway's foreach_target.h compiles repeatedly, after hwy/highway.h.

#if defined(ZARN_FRAMEWORK_SORTINGNETWORK_SIMD_H_) == defined(HWY_TARGET_TOGGLE)
#ifdef ZARN_FRAMEWORK_SORTINGNETWORK_SIMD_H_
#undef ZARN_FRAMEWORK_SORTINGNETWORK_SIMD_H_
#else
#define ZARN_FRAMEWORK_SORTINGNETWORK_SIMD_H_
#endif

#include <hwy/highway.h>

#include <cstddef>
#include <vector>

#include "processes/filters/framework/sortingnetwork.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

/// Runs a network on `kBlock` sets of unsigned keys at once: value i of all sets stands in the
/// aligned row at `values` + i * kBlock, whole vectors long. A step costs little more than its
/// loads and stores, and those little more than the comparisons, as long as the rows stay in the
/// nearest cache.
template <typename Key, std::size_t kBlock>
HWY_ATTR void RunNetwork(const std::vector<Exchange>& network, Key* HWY_RESTRICT values) {
  const hn::ScalableTag<Key> d;
  for (const Exchange& step : network) {
    Key* const first = values + step.first * kBlock;
    Key* const second = values + step.second * kBlock;
    switch (step.keep) {
      case Exchange::Keep::kBoth:
        for (std::size_t i = 0; i < kBlock; i += hn::Lanes(d)) {
          const auto a = hn::Load(d, first + i);
          const auto b = hn::Load(d, second + i);
          hn::Store(hn::Min(a, b), d, first + i);
          hn::Store(hn::Max(a, b), d, second + i);
        }
        break;
      case Exchange::Keep::kLesser:
        for (std::size_t i = 0; i < kBlock; i += hn::Lanes(d)) {
          hn::Store(hn::Min(hn::Load(d, first + i), hn::Load(d, second + i)), d, first + i);
        }
        break;
      case Exchange::Keep::kGreater:
        for (std::size_t i = 0; i < kBlock; i += hn::Lanes(d)) {
          hn::Store(hn::Max(hn::Load(d, first + i), hn::Load(d, second + i)), d, second + i);
        }
        break;
    }
  }
}

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#endif
