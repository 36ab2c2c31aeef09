// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/cutline/distancerows.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <span>

#include "host/sys/vectorised.h"

#if ZARN_SIMD
#include "processes/filters/framework/samplerows_simd.h"
#endif

namespace zarn::processes::filters {
namespace {

// Fewer groups are not worth an order or bounds.
constexpr std::size_t kMany = 16;

bool UseVectors() {
#if ZARN_SIMD
  return HasVectors();
#else
  return false;
#endif
}

// What the columns `step` to both sides say of a column.
ZARN_VECTORISED void SpreadBounds(const double* bounds, std::size_t width, std::size_t step,
                                  double* spread) {
  const auto apart = static_cast<double>(step);
  std::copy_n(bounds, width, spread);
  for (std::size_t x = step; x < width; ++x) {
    spread[x] = std::min(spread[x], bounds[x - step] + apart);
  }
  for (std::size_t x = step; x < width; ++x) {
    spread[x - step] = std::min(spread[x - step], bounds[x] + apart);
  }
}

}  // namespace

DistanceRows::DistanceRows(const PolygonRowIndex& index, std::int64_t left, std::size_t width,
                           const PolygonRowIndex::Crowd& most)
    : index_(index),
      left_(static_cast<double>(left)),
      width_(width),
      reach_(index.Blend() + index.DistanceTolerance()),
      groups_(most.groups),
      grouped_(most.places),
      bounds_(width),
      spread_(width),
      narrow_(most.groups),
      narrowWords_(WordsFor(WordsFor(width))),
      near_(most.groups),
      ordered_(most.groups),
      vectors_(UseVectors()),
      distances_(WordsFor(width) * kWordColumns),
      touched_(WordsFor(WordsFor(width))),
      known_(touched_.size()) {}

void DistanceRows::Prepare(std::int64_t first, std::int64_t last) {
  count_ = 0;
  std::size_t place = 0;
  index_.ForEachGroup(first, last, [&](const PolygonRowIndex::Group& group) {
    const PolygonEdge& edge = index_.Edges()[group.begin];
    const double dx = edge.x1 - edge.x0;
    const double dy = edge.y1 - edge.y0;
    const double half = std::sqrt(dx * dx + dy * dy) / std::abs(dy) * reach_ * (1 + 1e-9) +
                        index_.DistanceTolerance();
    groups_[count_++] = {&group, place, dx / dy, half, {0, width_}};
    const std::size_t count = group.end - group.begin;
    if (!vectors_ || count == 1) return;
    place = grouped_.Put(&edge, count, index_.DistanceTolerance(), place);
  });
  narrowCount_ = 0;
  std::fill(narrowWords_.begin(), narrowWords_.end(), 0);
  if (count_ <= kMany) return;
  rows_ = {first, last};
  BoundDistances();
  Trim();
}

// A bound for the distance of one place of each edge goes up by one from column to column.
void DistanceRows::BoundDistances() {
  std::fill(bounds_.begin(), bounds_.end(), reach_);
  for (std::size_t g = 0; g < count_; ++g) {
    const PolygonEdge& edge = index_.Edges()[groups_[g].group->begin];
    if (edge.firstBand > rows_.first || edge.lastBand < rows_.last) continue;
    double x = edge.x0;
    double far = std::max(std::abs(edge.y0 - Top()), std::abs(edge.y0 - Bottom()));
    if (std::min(edge.y0, edge.y1) <= Top() && std::max(edge.y0, edge.y1) >= Bottom()) {
      const double upper = groups_[g].XAt(edge, Top());
      const double lower = groups_[g].XAt(edge, Bottom());
      x = (upper + lower) / 2;
      far = std::abs(upper - lower) / 2;
    }
    const double column = std::clamp(std::floor(x - left_), 0.0, static_cast<double>(width_ - 1));
    const double bound = far + std::abs(left_ + column + 0.5 - x);
    if (!(bound < reach_)) continue;
    double& known = bounds_[static_cast<std::size_t>(column)];
    known = std::min(known, bound);
  }
  for (std::size_t step = 1; step < width_ && static_cast<double>(step) < reach_; step *= 2) {
    SpreadBounds(bounds_.data(), width_, step, spread_.data());
    bounds_.swap(spread_);
  }
}

// Leaves out what is nearest nowhere in the rows at hand, and sets apart what is so in few columns.
void DistanceRows::Trim() {
  constexpr std::size_t kNarrow = 24;
  const double farthest = *std::max_element(bounds_.begin(), bounds_.end());
  std::size_t kept = 0;
  for (std::size_t g = 0; g < count_; ++g) {
    Prepared prepared = groups_[g];
    const PolygonRowIndex::Group& group = *prepared.group;
    const double apart = std::max({group.minY - Bottom(), Top() - group.maxY, 0.0});
    if (apart > farthest + Slack()) continue;
    if (apart == 0) prepared.columns = NeededColumns(prepared);
    const auto [first, end] = prepared.columns;
    if (first >= end) continue;
    if (!vectors_ || group.end - group.begin > 1 || end - first > kNarrow) {
      groups_[kept++] = prepared;
      continue;
    }
    const PolygonEdge& edge = index_.Edges()[group.begin];
    narrow_[narrowCount_++] = {edge.x0,
                               edge.y0,
                               edge.x1,
                               edge.y1,
                               edge.firstBand,
                               edge.lastBand,
                               static_cast<std::uint32_t>(first),
                               static_cast<std::uint32_t>(end)};
    for (std::size_t w = first / kWordColumns; w * kWordColumns < end; ++w) {
      narrowWords_[w / kWordColumns] |= std::uint64_t{1} << w % kWordColumns;
    }
  }
  count_ = kept;
}

// Of a group beside the rows: the columns of its part that they are within reach of, and to both
// sides those that it is not farther from than their bounds. Beyond the first that it is farther
// from it is so all the more: its distance goes up by one from column to column, no bound by more.
DistanceRows::Columns DistanceRows::NeededColumns(const Prepared& prepared) const {
  const PolygonRowIndex::Group& group = *prepared.group;
  double low = group.minX;
  double high = group.maxX;
  if (group.end - group.begin == 1) {
    const PolygonEdge& edge = index_.Edges()[group.begin];
    const double upper = prepared.XAt(edge, std::max(group.minY, Top() - reach_));
    const double lower = prepared.XAt(edge, std::min(group.maxY, Bottom() + reach_));
    low = std::max(low, std::min(upper, lower));
    high = std::min(high, std::max(upper, lower));
  }
  Columns columns = Held(low, high);
  const auto centre = [&](std::size_t x) { return left_ + static_cast<double>(x) + 0.5; };
  while (columns.first > 0 &&
         low - centre(columns.first - 1) <= bounds_[columns.first - 1] + Slack()) {
    --columns.first;
  }
  while (columns.end < width_ && centre(columns.end) - high <= bounds_[columns.end] + Slack()) {
    ++columns.end;
  }
  return columns;
}

// The columns whose centres may lie between the two; what is not a number sets no end.
DistanceRows::Columns DistanceRows::Held(double low, double high) const {
  const auto columns = static_cast<double>(width_);
  const double first = low - left_ - 1;
  const double end = high - left_ + 2;
  return {first > 0 ? static_cast<std::size_t>(std::min(first, columns)) : 0,
          end < columns ? static_cast<std::size_t>(std::max(end, 0.0)) : width_};
}

// What of a group the row may be within reach of.
DistanceRows::Near DistanceRows::Reach(const Prepared& prepared, double y) const {
  const PolygonRowIndex::Group& group = *prepared.group;
  const double above = std::max({group.minY - y, y - group.maxY, 0.0});
  if (above > reach_) return {&group, prepared.place, above, {}, {}};
  const double aside = above > 0 ? std::sqrt(reach_ * reach_ - above * above) : reach_;
  double low = group.minX - aside;
  double high = group.maxX + aside;
  double ownLow = group.minX;
  double ownHigh = group.maxX;
  if (group.end - group.begin == 1) {
    // A long edge is near only where the row passes between two parallels to it. (A comparison with
    // what is not a number changes nothing.)
    const PolygonEdge& edge = index_.Edges()[group.begin];
    const double crossing = prepared.XAt(edge, y);
    low = std::max(low, crossing - prepared.half);
    high = std::min(high, crossing + prepared.half);
    ownLow = std::max(ownLow, crossing - 1);
    ownHigh = std::min(ownHigh, crossing + 1);
  }
  Columns columns = Held(low, high);
  columns.first = std::max(columns.first, prepared.columns.first);
  columns.end = std::min(columns.end, prepared.columns.end);
  return {&group, prepared.place, above, columns, Held(ownLow, ownHigh)};
}

// Begins with bounds: nothing beyond the reach matters, and from row to row no distance grows by
// more than one. (An edge that the row does not list is beyond the reach.)
void DistanceRows::BeginWord(std::size_t word) {
  double* const distances = distances_.data() + word * kWordColumns;
#if ZARN_SIMD
  if (vectors_ && (known_[word / kWordColumns] >> word % kWordColumns & 1) != 0) {
    BoundBelow(distances, index_.Blend(), 1 + Slack(), reach_);
    return;
  }
#endif
  std::fill_n(distances, kWordColumns, reach_ * reach_);
}

// Makes the words of these columns ready for use.
void DistanceRows::Touch(Columns columns) {
  for (std::size_t w = columns.first / kWordColumns; w * kWordColumns < columns.end; ++w) {
    std::uint64_t& bits = touched_[w / kWordColumns];
    const std::uint64_t bit = std::uint64_t{1} << w % kWordColumns;
    if ((bits & bit) != 0) continue;
    bits |= bit;
    BeginWord(w);
  }
}

void DistanceRows::LowerNarrow([[maybe_unused]] std::int64_t row) {
  if (narrowCount_ == 0) return;
#if ZARN_SIMD
  touched_ = narrowWords_;
  ForEachRun(touched_, [&](std::size_t first, std::size_t end) {
    for (std::size_t w = first; w < end; ++w) BeginWord(w);
  });
  LowerNarrowDistances(narrow_.data(), narrowCount_, {distances_.data(), left_, row});
#endif
}

void DistanceRows::CollectNear(std::int64_t row, double y) {
  nearCount_ = 0;
  for (std::size_t g = 0; g < count_; ++g) {
    const PolygonRowIndex::Group& group = *groups_[g].group;
    if (row < group.firstRow || row > group.lastRow) continue;
    Near near = Reach(groups_[g], y);
    if (near.columns.first >= near.columns.end) continue;
    // Whole vectors, so that the two parts beside them start anew.
    near.own.first = std::max(near.own.first, near.columns.first) / 8 * 8;
    near.own.end = (std::min(near.own.end, near.columns.end) + 7) / 8 * 8;
    Touch(near.columns);
    near_[nearCount_++] = near;
  }
}

// Those next to the row first: they leave little to do for the others.
void DistanceRows::OrderNear() {
  constexpr std::size_t kSteps = 32;
  const auto stepOf = [&](const Near& near) {
    return static_cast<std::size_t>(near.above / reach_ * (kSteps - 1));
  };
  std::size_t begin[kSteps + 1] = {};
  for (std::size_t i = 0; i < nearCount_; ++i) ++begin[stepOf(near_[i]) + 1];
  for (std::size_t step = 0; step < kSteps; ++step) begin[step + 1] += begin[step];
  for (std::size_t i = 0; i < nearCount_; ++i) ordered_[begin[stepOf(near_[i])]++] = near_[i];
  near_.swap(ordered_);
}

void DistanceRows::Lower(const Near& near, Columns columns, std::int64_t row) {
  if (columns.first >= columns.end) return;
  const PolygonRowIndex::Group& group = *near.group;
  const PolygonEdge* const edges = index_.Edges().data();
#if ZARN_SIMD
  if (vectors_) {
    const double slack = index_.DistanceTolerance();
    const bool isShared = row >= group.firstShared && row <= group.lastShared;
    LowerDistances({.edges = edges + group.begin,
                    .count = group.end - group.begin,
                    .minX = group.minX - slack,
                    .maxX = group.maxX + slack,
                    .above = std::max(near.above - slack, 0.0),
                    .grouped = isShared ? &grouped_ : nullptr,
                    .place = near.place},
                   columns.first, columns.end, {distances_.data(), left_, row});
    return;
  }
#endif
  const double y = static_cast<double>(row) + 0.5;
  for (std::uint32_t i = group.begin; i < group.end; ++i) {
    if (row < edges[i].firstBand || row > edges[i].lastBand) continue;
    for (std::size_t x = columns.first; x < columns.end; ++x) {
      const double squared = SquaredDistance(edges[i], left_ + static_cast<double>(x) + 0.5, y);
      distances_[x] = std::min(distances_[x], squared);
    }
  }
}

void DistanceRows::Compute(std::int64_t row, const PixelBits& inside, PixelBits& band) {
  std::fill(band.begin(), band.end(), 0);
  known_.swap(touched_);
  if (row != above_ + 1) std::fill(known_.begin(), known_.end(), 0);
  above_ = row;
  std::fill(touched_.begin(), touched_.end(), 0);
  LowerNarrow(row);
  CollectNear(row, static_cast<double>(row) + 0.5);
  if (vectors_ && nearCount_ > kMany) {
    OrderNear();
    // First every group where it is itself, then the wider reach of each, most of which is nearer
    // to others by then.
    const std::span<const Near> all(near_.data(), nearCount_);
    for (const Near& near : all) Lower(near, near.own, row);
    for (const Near& near : all) {
      Lower(near, {near.columns.first, std::min(near.own.first, near.columns.end)}, row);
      Lower(near, {std::max(near.own.end, near.columns.first), near.columns.end}, row);
    }
  } else {
    for (std::size_t i = 0; i < nearCount_; ++i) Lower(near_[i], near_[i].columns, row);
  }
  for (std::size_t w = 0; w < band.size(); ++w) {
    if ((touched_[w / kWordColumns] >> w % kWordColumns & 1) == 0) continue;
    double* const weights = distances_.data() + w * kWordColumns;
#if ZARN_SIMD
    if (vectors_) {
      band[w] = WeighDistances(weights, inside[w], index_.Blend());
      continue;
    }
#endif
    for (std::size_t i = 0; i < kWordColumns; ++i) {
      const double weight = std::sqrt(weights[i]) / index_.Blend();
      weights[i] = (inside[w] >> i & 1) != 0 ? weight : -weight;
      band[w] |= std::uint64_t{weight < 1.0} << i;
    }
  }
  if (width_ % kWordColumns != 0) {
    band.back() &= (std::uint64_t{1} << width_ % kWordColumns) - 1;
  }
}

}  // namespace zarn::processes::filters
