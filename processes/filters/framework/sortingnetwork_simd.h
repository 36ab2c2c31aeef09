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

/// Loads a vector for the steps of a network.
template <class D>
HWY_INLINE hn::Vec<D> LoadForSteps(D d, const hn::TFromD<D>* from) {
  auto v = hn::LoadU(d, from);
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
  // Numbers and bits are two types of vectors (see below): the compiler would load it for each.
  asm("" : "+v"(v.raw));
#endif
  return v;
}

/// One step. Results that are not wanted are left out.
template <bool kLesser = true, bool kGreater = true, class V>
HWY_INLINE void SortPair(V& first, V& second) {
  const V lesser = hn::Min(first, second);
  if constexpr (kGreater) {
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
    // What is left of the two: comparisons have one port of the machine, bits have two.
    second = kLesser ? hn::Xor3(first, second, lesser) : hn::Max(first, second);
#else
    second = hn::Max(first, second);
#endif
  }
  if constexpr (kLesser) first = lesser;
}

/// Which results of the steps anything looks at.
struct WantedResults {
  bool lesser;
  bool greater;
};
template <std::size_t kSteps>
using SortingSteps = std::array<std::pair<std::size_t, std::size_t>, kSteps>;
inline constexpr std::size_t kMostUnrolled = 64;  ///< places of such a network

/// For those who look at places `first` .. `first` + `count` - 1 in the end.
template <std::size_t kSteps>
constexpr std::array<WantedResults, kSteps> WantedOfSteps(const SortingSteps<kSteps>& steps,
                                                          std::size_t first, std::size_t count) {
  std::array<WantedResults, kSteps> wanted{};
  std::array<bool, kMostUnrolled> places{};
  for (std::size_t i = 0; i < count; ++i) places[first + i] = true;
  for (std::size_t i = kSteps; i-- > 0;) {
    bool& lesser = places[steps[i].first];
    bool& greater = places[steps[i].second];
    wanted[i] = {lesser, greater};
    lesser = greater = lesser || greater;
  }
  return wanted;
}

template <const auto& kSteps, const auto& kWanted, class V, std::size_t... kStep>
HWY_INLINE void RunSteps(V* v, std::index_sequence<kStep...>) {
  (SortPair<kWanted[kStep].lesser, kWanted[kStep].greater>(v[kSteps[kStep].first],
                                                           v[kSteps[kStep].second]),
   ...);
}
/// Runs the steps of a network as far as places `kFirst` .. `kFirst` + `kCount` - 1 need them. All
/// of it is unrolled and inlined.
template <const auto& kSteps, std::size_t kFirst, std::size_t kCount, class V>
HWY_INLINE void RunSteps(V* v) {
  static constexpr auto kWanted = WantedOfSteps(kSteps, kFirst, kCount);
  RunSteps<kSteps, kWanted>(v, std::make_index_sequence<kSteps.size()>());
}

/// Sorts `kCount` vectors lane by lane, as far as places `kFirst` .. `kFirst` + `kTaken` - 1 need
/// it.
template <std::size_t kCount, std::size_t kFirst = 0, std::size_t kTaken = kCount, class V>
HWY_INLINE void SortVectors(V* v) {
  RunSteps<kSortingSteps<kCount>, kFirst, kTaken>(v);
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
