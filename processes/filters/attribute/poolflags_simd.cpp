// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/attribute/poolflags_simd.h"

#include <algorithm>
#include <cstring>
#include <type_traits>

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/attribute/poolflags_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#include "processes/filters/framework/pixelvectors_simd.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128

/// Sizes of pools: bytes, which may wrap around, and wider numbers, to which these are added up.
class PoolCounts {
 public:
  using D8 = hn::ScalableTag<std::uint8_t>;
  using D16 = hn::RepartitionToWide<D8>;

  HWY_INLINE PoolCounts() : count_(hn::Zero(D8())), low_(hn::Zero(D16())), high_(low_) {}

  HWY_INLINE void Add(hn::Vec<D8> flags) { count_ = hn::Sub(count_, flags); }
  /// Every 255 flags, before the bytes overflow, and at the end.
  HWY_INLINE void Widen() {
    const D16 d16;
    const hn::Half<D8> half;
    low_ = hn::Add(low_, hn::PromoteTo(d16, hn::LowerHalf(half, count_)));
    high_ = hn::Add(high_, hn::PromoteTo(d16, hn::UpperHalf(half, count_)));
    narrow_ = count_;
    count_ = hn::Zero(D8());
  }
  HWY_INLINE void Store(const PoolRun& run, std::size_t x) const {
    const D16 d16;
    hn::StoreU(narrow_, D8(), run.counts8 + x);
    hn::StoreU(low_, d16, run.counts16 + x);
    hn::StoreU(high_, d16, run.counts16 + x + hn::Lanes(d16));
  }

 private:
  hn::Vec<D8> count_;
  hn::Vec<D8> narrow_ = hn::Zero(D8());
  hn::Vec<D16> low_;
  hn::Vec<D16> high_;
};

constexpr std::size_t kCellsPerByte = 255;

/// The flags of one cell's neighbours from pixel `at` on, as lanes of zeros and ones.
template <class D, class Near>
HWY_INLINE hn::Vec<hn::RebindToUnsigned<D>> FlagVector(D d, const NeighbourRow& cell,
                                                       std::size_t at, hn::Vec<D> centre,
                                                       const std::uint8_t* centreUnlabelled,
                                                       const Near& near) {
  const hn::RebindToUnsigned<D> du;
  auto pooled = near(centre, hn::LoadU(d, static_cast<const hn::TFromD<D>*>(cell.labels) + at));
  if (centreUnlabelled != nullptr) pooled = hn::Or(pooled, LoadFlags(d, centreUnlabelled + at));
  if (cell.unlabelled != nullptr) pooled = hn::Or(pooled, LoadFlags(d, cell.unlabelled + at));
  if (cell.excluded != nullptr) {
    pooled = hn::AndNot(LoadFlags(d, cell.excluded + at), pooled);
  }
  return hn::VecFromMask(du, hn::RebindMask(du, pooled));
}

/// Flags and counts `kVectors` vectors of bytes from pixel x of the run on: several share the work
/// of finding the rows.
template <std::size_t kVectors, class D, class Near>
HWY_INLINE void FlagBytes(D d, const PoolRun& run, std::size_t x, const Near& near) {
  const NeighbourRow* const cells = run.cells;
  const std::uint8_t* const unlabelled = run.centre.unlabelled;
  const std::size_t pitch = run.pitch;
  const std::size_t at = run.first + x;
  const std::size_t lanes = hn::Lanes(d);
  const auto* const labels = static_cast<const hn::TFromD<D>*>(run.centre.labels) + at;
  hn::Vec<D> centres[kVectors];
  PoolCounts counts[kVectors];
  for (std::size_t v = 0; v < kVectors; ++v) centres[v] = hn::LoadU(d, labels + v * lanes);
  std::uint8_t* to = run.flags + x;
  const std::size_t cellCount = run.cellCount;
  for (std::size_t begin = 0; begin < cellCount; begin += kCellsPerByte) {
    const std::size_t end = std::min(cellCount, begin + kCellsPerByte);
    for (std::size_t k = begin; k < end; ++k, to += pitch) {
      const NeighbourRow cell = cells[k];
      for (std::size_t v = 0; v < kVectors; ++v) {
        const auto flags = FlagVector(d, cell, at + v * lanes, centres[v], unlabelled, near);
        hn::StoreU(flags, d, to + v * lanes);
        counts[v].Add(flags);
      }
    }
    for (PoolCounts& count : counts) count.Widen();
  }
  for (std::size_t v = 0; v < kVectors; ++v) counts[v].Store(run, x + v * lanes);
}

/// `near(centre, neighbour)` tells which lanes of two vectors of labels belong together.
template <class D, class Near>
HWY_ATTR void FlagCells(D d, const PoolRun& run, const Near& near) {
  using A = hn::TFromD<D>;
  std::size_t x = 0;
  if constexpr (sizeof(A) == 1) {
    for (; x + 2 * hn::Lanes(d) <= run.count; x += 2 * hn::Lanes(d)) {
      FlagBytes<2>(d, run, x, near);
    }
    for (; x < run.count; x += hn::Lanes(d)) FlagBytes<1>(d, run, x, near);
  } else {
    const hn::Rebind<std::uint8_t, D> d8;
    for (; x < run.count; x += hn::Lanes(d)) {
      const std::size_t at = run.first + x;
      const auto centre = hn::LoadU(d, static_cast<const A*>(run.centre.labels) + at);
      std::uint8_t* to = run.flags + x;
      for (std::size_t k = 0; k < run.cellCount; ++k, to += run.pitch) {
        const auto flags = FlagVector(d, run.cells[k], at, centre, run.centre.unlabelled, near);
        hn::StoreU(hn::TruncateTo(d8, flags), d8, to);
      }
    }
  }
}

/// The sizes of the pools from their flags.
HWY_ATTR void CountFlags(const PoolRun& run) {
  const hn::ScalableTag<std::uint8_t> d;
  for (std::size_t x = 0; x < run.count; x += hn::Lanes(d)) {
    PoolCounts counts;
    for (std::size_t begin = 0; begin < run.cellCount; begin += kCellsPerByte) {
      const std::size_t end = std::min(run.cellCount, begin + kCellsPerByte);
      for (std::size_t k = begin; k < end; ++k) {
        counts.Add(hn::LoadU(d, run.flags + k * run.pitch + x));
      }
      counts.Widen();
    }
    counts.Store(run, x);
  }
}

template <typename A>
HWY_ATTR void FlagIntegers(const PoolRun& run, A below, A span) {
  const hn::ScalableTag<A> d;
  if (span == 0) {
    FlagCells(d, run,
              [&](auto centre, auto neighbour) HWY_ATTR { return hn::Eq(centre, neighbour); });
  } else {
    FlagCells(d, run, [&](auto centre, auto neighbour) HWY_ATTR {
      const auto above = hn::Add(hn::Sub(neighbour, centre), hn::Set(d, below));
      return hn::Eq(hn::Min(above, hn::Set(d, span)), above);
    });
  }
  if (sizeof(A) > 1) CountFlags(run);
}

template <typename A>
HWY_ATTR void FlagFloats(const PoolRun& run, A tolerance) {
  const hn::ScalableTag<A> d;
  FlagCells(d, run, [&](auto centre, auto neighbour) HWY_ATTR {
    return hn::Not(hn::Gt(hn::Abs(hn::Sub(neighbour, centre)), hn::Set(d, tolerance)));
  });
  CountFlags(run);
}

HWY_ATTR void FlagAll(const PoolRun& run) {
  const hn::ScalableTag<std::uint8_t> d;
  for (std::size_t k = 0; k < run.cellCount; ++k) {
    const std::uint8_t* const excluded = run.cells[k].excluded;
    for (std::size_t x = 0; x < run.count; x += hn::Lanes(d)) {
      auto pooled = hn::Set(d, 255);
      if (excluded != nullptr) {
        pooled = hn::VecFromMask(d, hn::Eq(hn::LoadU(d, excluded + run.first + x), hn::Zero(d)));
      }
      hn::StoreU(pooled, d, run.flags + k * run.pitch + x);
    }
  }
  CountFlags(run);
}

HWY_ATTR bool Kept(const std::uint16_t* counts, const std::uint8_t* mask, std::size_t count,
                   std::uint8_t* flags) {
  const hn::ScalableTag<std::uint16_t> d;
  const hn::Rebind<std::uint8_t, decltype(d)> d8;
  auto any = hn::Zero(d8);
  const auto flag = [&](std::size_t i, auto maskBytes) HWY_ATTR {
    const auto empty = hn::VecFromMask(d, hn::Eq(hn::LoadU(d, counts + i), hn::Zero(d)));
    const auto masked = hn::VecFromMask(d8, hn::Eq(maskBytes, hn::Zero(d8)));
    const auto kept = hn::Or(hn::TruncateTo(d8, empty), masked);
    hn::StoreU(kept, d8, flags + i);
    return kept;
  };
  const auto ones = hn::Set(d8, 1);
  std::size_t i = 0;
  for (; i + hn::Lanes(d) <= count; i += hn::Lanes(d)) {
    any = hn::Or(any, flag(i, mask == nullptr ? ones : hn::LoadU(d8, mask + i)));
  }
  if (i < count) {
    HWY_ALIGN std::uint8_t rest[HWY_MAX_BYTES] = {};
    std::memset(rest, 1, count - i);
    if (mask != nullptr) std::memcpy(rest, mask + i, count - i);
    // What lies beyond the run does not count.
    any = hn::Or(any, hn::IfThenElseZero(hn::FirstN(d8, count - i), flag(i, hn::Load(d8, rest))));
  }
  return !hn::AllTrue(d8, hn::Eq(any, hn::Zero(d8)));
}

#else

// Never called: the definition takes the place of emulated vectors.
template <typename A>
void FlagIntegers(const PoolRun&, A, A) {}
template <typename A>
void FlagFloats(const PoolRun&, A) {}
void FlagAll(const PoolRun&) {}
bool Kept(const std::uint16_t*, const std::uint8_t*, std::size_t, std::uint8_t*) { return false; }

#endif

// The dispatch table holds plain functions.
void FlagUInt8(const PoolRun& run, std::uint8_t below, std::uint8_t span) {
  FlagIntegers(run, below, span);
}
void FlagUInt16(const PoolRun& run, std::uint16_t below, std::uint16_t span) {
  FlagIntegers(run, below, span);
}
void FlagUInt32(const PoolRun& run, std::uint32_t below, std::uint32_t span) {
  FlagIntegers(run, below, span);
}
void FlagFloat32(const PoolRun& run, float tolerance) { FlagFloats(run, tolerance); }
void FlagFloat64(const PoolRun& run, double tolerance) { FlagFloats(run, tolerance); }

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {

// Explicit specialisations are exported unless told otherwise.
#define ZARN_HIDDEN __attribute__((visibility("hidden")))
#define ZARN_FLAG_INTEGERS(name, A)                                      \
  HWY_EXPORT(name);                                                      \
  template <>                                                            \
  ZARN_HIDDEN void FlagNearLabels(const PoolRun& run, A below, A span) { \
    HWY_DYNAMIC_DISPATCH(name)(run, below, span);                        \
  }
#define ZARN_FLAG_FLOATS(name, A)                                    \
  HWY_EXPORT(name);                                                  \
  template <>                                                        \
  ZARN_HIDDEN void FlagNearLabels(const PoolRun& run, A tolerance) { \
    HWY_DYNAMIC_DISPATCH(name)(run, tolerance);                      \
  }
ZARN_FLAG_INTEGERS(FlagUInt8, std::uint8_t)
ZARN_FLAG_INTEGERS(FlagUInt16, std::uint16_t)
ZARN_FLAG_INTEGERS(FlagUInt32, std::uint32_t)
ZARN_FLAG_FLOATS(FlagFloat32, float)
ZARN_FLAG_FLOATS(FlagFloat64, double)

HWY_EXPORT(FlagAll);
void FlagNeighbours(const PoolRun& run) { HWY_DYNAMIC_DISPATCH(FlagAll)(run); }

HWY_EXPORT(Kept);
bool FlagKept(const std::uint16_t* counts, const std::uint8_t* mask, std::size_t count,
              std::uint8_t* flags) {
  return HWY_DYNAMIC_DISPATCH(Kept)(counts, mask, count, flags);
}

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
