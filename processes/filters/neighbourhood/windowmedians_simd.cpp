// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/windowmedians_simd.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstring>
#include <type_traits>
#include <utility>

// Targets that share their kernels with another one, and those whose vectors may be wider than the
// padding of rows.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/neighbourhood/windowmedians_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/cache_control.h>
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
// Neighbouring windows share pairs of columns as well: the values of each rank are sorted in pairs
// first, which merging the rows of a window begins with.
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

/// The scratch of a block of windows: for each rank the values of all columns, and the lower and
/// the higher ones of each column and the next.
template <typename Key>
struct SortedColumns {
  Key* scratch;
  std::size_t taps;
  std::size_t step;
  std::size_t pitch;

  Key* Column(std::size_t rank) const { return scratch + rank * pitch; }
  Key* Low(std::size_t rank) const { return scratch + (taps + rank) * pitch; }
  Key* High(std::size_t rank) const { return scratch + (2 * taps + rank) * pitch; }
  /// All bits set for columns with an odd number of filled-in keys, else 0.
  Key* Odd() const { return scratch + 3 * taps * pitch; }
};

/// Sorts values that come as sorted pairs and one more: merges the first two pairs, then the rest
/// into them.
template <std::size_t kTaps>
struct PairNetwork;
template <>
struct PairNetwork<5> {
  static constexpr SortingSteps<7> kSteps = {
      {{0, 2}, {1, 3}, {1, 2}, {3, 4}, {2, 3}, {1, 2}, {0, 1}}};
};
template <>
struct PairNetwork<7> {
  // (Batcher's merge of four and three: those in even places, those in odd ones, both together.)
  static constexpr SortingSteps<13> kSteps = {{{0, 2},
                                               {1, 3},
                                               {1, 2},
                                               {5, 6},
                                               {4, 5},
                                               {0, 4},
                                               {2, 6},
                                               {2, 4},
                                               {1, 5},
                                               {3, 5},
                                               {1, 2},
                                               {3, 4},
                                               {5, 6}}};
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
    SortVectors<kLength, kTaken.first, kTaken.count>(values);
    Copy(values + kTaken.first, candidates + Count(kSpan),
         std::make_index_sequence<kTaken.count>());
  }
  template <class V, std::size_t... kSpan>
  static HWY_INLINE void TakeLines(const V* grid, V* candidates, std::index_sequence<kSpan...>) {
    (TakeLine<kSpan>(grid, candidates), ...);
  }

  /// Loads the values of one rank in all columns and sorts them, as far as the lines need it.
  template <std::size_t kRank, class D, typename Key, class V>
  static HWY_INLINE void LoadRank(D d, const SortedColumns<Key>& rows, std::size_t i, V* row) {
    constexpr std::size_t kFirstLine = Lines::kLines[0].line;
    constexpr std::size_t kLastLine = Lines::kLines[kLineCount - 1].line;
    constexpr std::size_t kFirst = kFirstLine < kRank ? 0 : kFirstLine - kRank;
    constexpr std::size_t kEnd = std::min(kLastLine - kRank + 1, kTaps);
    const Key* const columns = rows.Column(kRank) + i;
    if constexpr (kTaps == 3) {
      row[0] = LoadForSteps(d, columns);
      row[1] = LoadForSteps(d, columns + rows.step);
      row[2] = LoadForSteps(d, columns + 2 * rows.step);
      SortVectors<3, kFirst, kEnd - kFirst>(row);
    } else {
      const Key* const low = rows.Low(kRank) + i;
      const Key* const high = rows.High(kRank) + i;
      for (std::size_t pair = 0; pair < kTaps - 1; pair += 2) {
        row[pair] = LoadForSteps(d, low + pair * rows.step);
        row[pair + 1] = LoadForSteps(d, high + pair * rows.step);
      }
      row[kTaps - 1] = LoadForSteps(d, columns + (kTaps - 1) * rows.step);
      RunSteps<PairNetwork<kTaps>::kSteps, kFirst, kEnd - kFirst>(row);
    }
  }
  template <class D, typename Key, class V, std::size_t... kRank>
  static HWY_INLINE void LoadGrid(D d, const SortedColumns<Key>& rows, std::size_t i, V* grid,
                                  std::index_sequence<kRank...>) {
    (LoadRank<kRank>(d, rows, i, grid + kRank * kTaps), ...);
  }
};

/// The median of each lane's window from its sorted columns, from column i on.
template <std::size_t kTaps, bool kHoles, class D, typename Key>
HWY_INLINE hn::Vec<D> MedianOfColumns(D d, const SortedColumns<Key>& rows, std::size_t i) {
  using V = hn::Vec<D>;
  using Select = Selection<kTaps, kHoles>;
  V grid[kTaps * kTaps];
  Select::LoadGrid(d, rows, i, grid, std::make_index_sequence<kTaps>());
  V candidates[Select::Count()];
  Select::TakeLines(grid, candidates, std::make_index_sequence<Select::kLineCount>());
  SortVectors<Select::Count(), Select::kMedian, kHoles ? kTaps / 2 + 1 : 1>(candidates);
  V median = candidates[Select::kMedian];
  if constexpr (kHoles) {
    const Key* const oddColumns = rows.Odd() + i;
    auto odd = hn::LoadU(d, oddColumns);
    for (std::size_t column = 1; column < kTaps; ++column) {
      odd = hn::Add(odd, hn::LoadU(d, oddColumns + column * rows.step));
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

/// Sorts `length` columns from column `first` on, excluded keys filled in, and marks those with an
/// odd number of them.
template <bool kHoles, typename Key, std::size_t... kRow>
HWY_ATTR void SortColumns(const KeyWindows<Key>& windows, std::size_t first, std::size_t length,
                          const SortedColumns<Key>& sorted, std::index_sequence<kRow...>) {
  constexpr std::size_t kTaps = sizeof...(kRow);
  const hn::ScalableTag<Key> d;
  const Key* const rows[kTaps] = {windows.rows[kRow] + first...};
  const Key* const excluded[kTaps] = {(kHoles ? windows.excluded[kRow] + first : nullptr)...};
  Key* const columns[kTaps] = {sorted.Column(kRow)...};
  for (std::size_t i = 0; i < length; i += hn::Lanes(d)) {
    hn::Vec<decltype(d)> v[kTaps] = {LoadForSteps(d, rows[kRow] + i)...};
    if constexpr (kHoles) {
      auto fill = hn::Zero(d);
      (FillIn(d, excluded[kRow] + i, fill, v[kRow]), ...);
      hn::StoreU(fill, d, sorted.Odd() + i);
    }
    SortVectors<kTaps>(v);
    (hn::StoreU(v[kRow], d, columns[kRow] + i), ...);
  }
}

/// Sorts the values of each rank in pairs of neighbouring columns, for the first `length` columns.
template <typename Key>
HWY_ATTR void PairColumns(const SortedColumns<Key>& rows, std::size_t length) {
  const hn::ScalableTag<Key> d;
  for (std::size_t rank = 0; rank < rows.taps; ++rank) {
    const Key* const columns = rows.Column(rank);
    Key* const low = rows.Low(rank);
    Key* const high = rows.High(rank);
    for (std::size_t i = 0; i < length; i += hn::Lanes(d)) {
      auto lesser = LoadForSteps(d, columns + i);
      auto greater = LoadForSteps(d, columns + i + rows.step);
      SortPair(lesser, greater);
      hn::StoreU(lesser, d, low + i);
      hn::StoreU(greater, d, high + i);
    }
  }
}

template <std::size_t kTaps, bool kHoles, typename Key>
HWY_ATTR void FindInRow(const KeyWindows<Key>& windows) {
  const hn::ScalableTag<Key> d;
  const std::size_t lanes = hn::Lanes(d);
  const SortedColumns<Key> rows{windows.scratch, kTaps, windows.step,
                                MedianPitch<Key>(kTaps, windows.step)};
  constexpr std::size_t kBlock = kMedianBlockBytes / sizeof(Key);
  HWY_ALIGN Key rest[HWY_MAX_BYTES / sizeof(Key)] = {};
  for (std::size_t first = 0; first < windows.count; first += kBlock) {
    const std::size_t count = std::min(kBlock, windows.count - first);
    const std::size_t length = count + (kTaps - 1) * windows.step;
    // Results that are written in between keep the machine from looking ahead by itself, and a
    // whole row at once would keep everything else waiting.
    for (std::size_t i = 0; windows.next != nullptr && i < length; i += 64 / sizeof(Key)) {
      hwy::Prefetch(windows.next + first + i);
    }
    SortColumns<kHoles>(windows, first, length, rows, std::make_index_sequence<kTaps>());
    if constexpr (kTaps > 3) PairColumns(rows, length - windows.step);
    Key* const medians = windows.medians + first;
    const std::size_t whole = count - count % lanes;
    for (std::size_t i = 0; i < count; i += lanes) {
      hn::StoreU(MedianOfColumns<kTaps, kHoles>(d, rows, i), d, i < whole ? medians + i : rest);
    }
    std::memcpy(medians + whole, rest, (count - whole) * sizeof(Key));
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
