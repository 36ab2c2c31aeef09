// SPDX-License-Identifier: Apache-2.0

// Sorting networks over vectors, compiled once per vector target. Include it only from a
// `_simd.cpp` that Highway's foreach_target.h compiles repeatedly, after hwy/highway.h.

#if defined(ZARN_FRAMEWORK_SORTINGNETWORK_SIMD_H) == defined(HWY_TARGET_TOGGLE)
#ifdef ZARN_FRAMEWORK_SORTINGNETWORK_SIMD_H
#undef ZARN_FRAMEWORK_SORTINGNETWORK_SIMD_H
#else
#define ZARN_FRAMEWORK_SORTINGNETWORK_SIMD_H
#endif

#include <hwy/highway.h>

#include <array>
#include <cstddef>
#include <utility>
#include <vector>

#include "processes/filters/framework/sortingnetwork.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

/// The steps of a network that sorts `kCount` values, known when the code is compiled.
template <std::size_t kCount>
inline constexpr auto kSortingSteps = [] {
  constexpr std::size_t kSteps = [] {
    std::size_t steps = 0;
    ForEachSortingStep(kCount, [&](std::size_t, std::size_t) { ++steps; });
    return steps;
  }();
  std::array<std::pair<std::size_t, std::size_t>, kSteps> steps{};
  std::size_t next = 0;
  ForEachSortingStep(kCount, [&](std::size_t first, std::size_t second) {
    steps[next++] = {first, second};
  });
  return steps;
}();

template <class V>
HWY_INLINE void SortPair(V& first, V& second) {
  const V low = hn::Min(first, second);
  second = hn::Max(first, second);
  first = low;
}
template <std::size_t kCount, class V, std::size_t... kStep>
HWY_INLINE void SortVectors(V* v, std::index_sequence<kStep...>) {
  (SortPair(v[kSortingSteps<kCount>[kStep].first], v[kSortingSteps<kCount>[kStep].second]), ...);
}

/// Sorts `kCount` vectors lane by lane. All of it is unrolled and inlined: steps whose results
/// nobody looks at cost nothing.
template <std::size_t kCount, class V>
HWY_INLINE void SortVectors(V* v) {
  SortVectors<kCount>(v, std::make_index_sequence<kSortingSteps<kCount>.size()>());
}

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
