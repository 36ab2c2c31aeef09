// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/windowmedians_simd.h"

#include <array>
#include <cstdint>
#include <utility>

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/neighbourhood/windowmedians_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

#include "processes/filters/framework/sortingnetwork_simd.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

#if HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128

// Each column of a window is sorted once and serves all windows that it is part of. A window then
// is a grid of `taps` rows of ranks, whose columns rise; once its rows are sorted as well, they
// still do, and the value at rank i and column j has at least (i + 1) * (j + 1) - 1 others at or
// below it and as many at or above as lie right of and under it. So it can be in the middle only
// near the diagonal that goes up, from the corner at the bottom left, and of the values on a line
// parallel to it again only some: those lines are sorted, and then what is left.
//
// Keys that do not count are filled in with the lowest and the highest key in turn. Within a column
// the lowest begins, so a column with an odd number of them has one lowest key too many; two such
// columns push the median up by a rank.

/// The values of one line, in the order of their sorted places, that can be the median or up to
/// `taps` / 2 ranks above.
struct LineSpan {
  std::size_t line;  ///< rank + column of its values
  std::size_t first;
  std::size_t count;
};
template <std::size_t kTaps, bool kHoles>
struct Candidates;
template <>
struct Candidates<3, false> {
  static constexpr std::array<LineSpan, 1> kLines = {{{2, 1, 1}}};
};
template <>
struct Candidates<3, true> {
  static constexpr std::array<LineSpan, 2> kLines = {{{2, 1, 2}, {3, 0, 1}}};
};
template <>
struct Candidates<5, false> {
  static constexpr std::array<LineSpan, 3> kLines = {{{3, 3, 1}, {4, 2, 1}, {5, 0, 1}}};
};
template <>
struct Candidates<5, true> {
  static constexpr std::array<LineSpan, 4> kLines = {{{3, 3, 1}, {4, 2, 3}, {5, 0, 2}, {6, 0, 1}}};
};
template <>
struct Candidates<7, false> {
  static constexpr std::array<LineSpan, 5> kLines = {
      {{4, 4, 1}, {5, 3, 3}, {6, 2, 3}, {7, 0, 3}, {8, 0, 1}}};
};
template <>
struct Candidates<7, true> {
  static constexpr std::array<LineSpan, 6> kLines = {
      {{4, 4, 1}, {5, 3, 3}, {6, 2, 5}, {7, 0, 3}, {8, 0, 2}, {9, 0, 1}}};
};

template <std::size_t kTaps, bool kHoles>
struct Selection {
  using Lines = Candidates<kTaps, kHoles>;
  static constexpr std::size_t kLineCount = Lines::kLines.size();

  static constexpr std::size_t FirstRank(std::size_t line) {
    return line < kTaps ? 0 : line - kTaps + 1;
  }
  static constexpr std::size_t Length(std::size_t line) {
    return (line < kTaps ? line : 2 * (kTaps - 1) - line) + 1;
  }
  static constexpr std::size_t Count(std::size_t lines = kLineCount) {
    std::size_t count = 0;
    for (std::size_t i = 0; i < lines; ++i) count += Lines::kLines[i].count;
    return count;
  }
  /// Place of the median among the candidates: as many values below them are left out.
  static constexpr std::size_t kMedian = [] {
    std::size_t below = 0;
    for (std::size_t line = 0; line < Lines::kLines[0].line; ++line) below += Length(line);
    for (const LineSpan& span : Lines::kLines) below += span.first;
    return kTaps * kTaps / 2 - below;
  }();

  // (Loops would keep the values in memory.)

  template <class V, std::size_t... kIndex>
  static HWY_INLINE void Copy(const V* from, V* to, std::index_sequence<kIndex...>) {
    ((to[kIndex] = from[kIndex]), ...);
  }
  template <std::size_t kLine, class V, std::size_t... kIndex>
  static HWY_INLINE void CopyLine(const V* grid, V* to, std::index_sequence<kIndex...>) {
    constexpr std::size_t kFirst = FirstRank(kLine);
    ((to[kIndex] = grid[(kFirst + kIndex) * kTaps + kLine - kFirst - kIndex]), ...);
  }
  /// Sorts one line and takes its candidates.
  template <std::size_t kSpan, class V>
  static HWY_INLINE void TakeLine(const V* grid, V* candidates) {
    constexpr LineSpan kTaken = Lines::kLines[kSpan];
    constexpr std::size_t kLength = Length(kTaken.line);
    V values[kLength];
    CopyLine<kTaken.line>(grid, values, std::make_index_sequence<kLength>());
    SortVectors<kLength>(values);
    Copy(values + kTaken.first, candidates + Count(kSpan),
         std::make_index_sequence<kTaken.count>());
  }
  template <class V, std::size_t... kSpan>
  static HWY_INLINE void TakeLines(const V* grid, V* candidates, std::index_sequence<kSpan...>) {
    (TakeLine<kSpan>(grid, candidates), ...);
  }

  /// Loads the values of one rank in all columns and sorts them.
  template <class D, typename Key, class V, std::size_t... kColumn>
  static HWY_INLINE void LoadRank(D d, const Key* ranks, std::size_t step, V* row,
                                  std::index_sequence<kColumn...>) {
    ((row[kColumn] = hn::LoadU(d, ranks + kColumn * step)), ...);
    SortVectors<kTaps>(row);
  }
  template <class D, typename Key, class V, std::size_t... kRank>
  static HWY_INLINE void LoadGrid(D d, const Key* columns, std::size_t pitch, std::size_t step,
                                  V* grid, std::index_sequence<kRank...>) {
    (LoadRank(d, columns + kRank * pitch, step, grid + kRank * kTaps,
              std::make_index_sequence<kTaps>()),
     ...);
  }
};

/// The median of each lane's window from its sorted columns; `columns` starts at the window's left.
/// `oddColumns`, where given, has all bits set for columns with an odd number of filled-in keys.
template <std::size_t kTaps, bool kHoles, class D, typename Key>
HWY_INLINE hn::Vec<D> MedianOfColumns(D d, const Key* columns, std::size_t pitch, std::size_t step,
                                      const Key* oddColumns) {
  using V = hn::Vec<D>;
  using Select = Selection<kTaps, kHoles>;
  V grid[kTaps * kTaps];
  Select::LoadGrid(d, columns, pitch, step, grid, std::make_index_sequence<kTaps>());
  V candidates[Select::Count()];
  Select::TakeLines(grid, candidates, std::make_index_sequence<Select::kLineCount>());
  SortVectors<Select::Count()>(candidates);
  V median = candidates[Select::kMedian];
  if constexpr (kHoles) {
    auto odd = hn::LoadU(d, oddColumns);
    for (std::size_t column = 1; column < kTaps; ++column) {
      odd = hn::Add(odd, hn::LoadU(d, oddColumns + column * step));
    }
    // (Minus their number, counting down from zero.)
    const auto number = hn::Sub(hn::Zero(d), odd);
    for (std::size_t pair = 1; pair <= kTaps / 2; ++pair) {
      const auto least = hn::Set(d, static_cast<Key>(2 * pair));
      median = hn::IfThenElse(hn::Eq(hn::Max(number, least), number),
                              candidates[Select::kMedian + pair], median);
    }
  }
  return median;
}

/// Fills excluded keys in, and turns to the other key after each.
template <class D, typename Key>
HWY_INLINE void FillIn(D d, const Key* excluded, hn::Vec<D>& fill, hn::Vec<D>& keys) {
  const auto isExcluded = hn::LoadU(d, excluded);
  keys = hn::IfVecThenElse(isExcluded, fill, keys);
  fill = hn::Xor(fill, isExcluded);
}

/// Sorts the columns, excluded keys filled in, and marks those with an odd number of them.
template <bool kHoles, typename Key, std::size_t... kRow>
HWY_ATTR void SortColumns(const KeyWindows<Key>& windows, std::index_sequence<kRow...>) {
  constexpr std::size_t kTaps = sizeof...(kRow);
  const hn::ScalableTag<Key> d;
  const Key* const rows[kTaps] = {windows.rows[kRow]...};
  const Key* const excluded[kTaps] = {(kHoles ? windows.excluded[kRow] : nullptr)...};
  Key* const columns[kTaps] = {windows.columns + kRow * windows.pitch...};
  Key* const odd = windows.columns + kTaps * windows.pitch;
  const std::size_t length = windows.count + (kTaps - 1) * windows.step;
  for (std::size_t i = 0; i < length; i += hn::Lanes(d)) {
    hn::Vec<decltype(d)> v[kTaps] = {hn::LoadU(d, rows[kRow] + i)...};
    if constexpr (kHoles) {
      auto fill = hn::Zero(d);
      (FillIn(d, excluded[kRow] + i, fill, v[kRow]), ...);
      hn::StoreU(fill, d, odd + i);
    }
    SortVectors<kTaps>(v);
    (hn::StoreU(v[kRow], d, columns[kRow] + i), ...);
  }
}

template <std::size_t kTaps, bool kHoles, typename Key>
HWY_ATTR void FindInRow(const KeyWindows<Key>& windows) {
  SortColumns<kHoles>(windows, std::make_index_sequence<kTaps>());
  const hn::ScalableTag<Key> d;
  const Key* const columns = windows.columns;
  const std::size_t pitch = windows.pitch;
  const std::size_t step = windows.step;
  const std::size_t count = windows.count;
  Key* const medians = windows.medians;
  for (std::size_t i = 0; i < count; i += hn::Lanes(d)) {
    const auto median =
        MedianOfColumns<kTaps, kHoles>(d, columns + i, pitch, step, columns + kTaps * pitch + i);
    hn::StoreU(median, d, medians + i);
  }
}

template <std::size_t kTaps, typename Key>
HWY_ATTR void FindInRow(const KeyWindows<Key>& windows) {
  if (windows.excluded == nullptr) {
    FindInRow<kTaps, false>(windows);
  } else {
    FindInRow<kTaps, true>(windows);
  }
}

template <typename Key>
HWY_ATTR void Find(const KeyWindows<Key>& windows) {
  switch (windows.taps) {
    case 3:
      return FindInRow<3>(windows);
    case 5:
      return FindInRow<5>(windows);
    default:
      return FindInRow<7>(windows);
  }
}

#else

// Never called: the definition takes the place of emulated vectors.
template <typename Key>
void Find(const KeyWindows<Key>&) {}

#endif

// The dispatch table holds plain functions.
void Find8(const KeyWindows<std::uint8_t>& windows) { Find(windows); }
void Find16(const KeyWindows<std::uint16_t>& windows) { Find(windows); }
void Find32(const KeyWindows<std::uint32_t>& windows) { Find(windows); }
void Find64(const KeyWindows<std::uint64_t>& windows) { Find(windows); }

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {

// Explicit specialisations are exported unless told otherwise.
#define ZARN_ENTRY(name, Key)                                                              \
  HWY_EXPORT(name);                                                                        \
  template <>                                                                              \
  __attribute__((visibility("hidden"))) void FindMedians(const KeyWindows<Key>& windows) { \
    HWY_DYNAMIC_DISPATCH(name)(windows);                                                   \
  }
ZARN_ENTRY(Find8, std::uint8_t)
ZARN_ENTRY(Find16, std::uint16_t)
ZARN_ENTRY(Find32, std::uint32_t)
ZARN_ENTRY(Find64, std::uint64_t)

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
