// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/cutline/distancerows_simd.h"

// Targets that share their kernels with another one, and those whose vectors may be wider than
// eight numbers.
#define HWY_DISABLED_TARGETS \
  (HWY_SSSE3 | HWY_AVX3_DL | HWY_SVE | HWY_SVE2 | HWY_SVE_256 | HWY_SVE2_128 | HWY_RVV)
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "processes/filters/cutline/distancerows_simd.cpp"
#include <hwy/foreach_target.h>
// foreach_target.h must come first.
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;
using D = hn::ScalableTag<double>;
using V = hn::Vec<D>;

/// One edge as seen from a row.
struct EdgeVectors {
  template <typename Edge>
  HWY_INLINE EdgeVectors(D d, const Edge& edge, double y) {
    const double edgeX = edge.x1 - edge.x0;
    const double edgeY = edge.y1 - edge.y0;
    const double fromY = y - edge.y0;
    const double toY = edge.y1 - y;
    const double length = edgeX * edgeX + edgeY * edgeY;
    isPoint = edgeX == 0 && edgeY == 0;
    x0 = hn::Set(d, edge.x0);
    x1 = hn::Set(d, edge.x1);
    dx = hn::Set(d, edgeX);
    dy = hn::Set(d, edgeY);
    alongFrom = hn::Set(d, edgeY * fromY);
    alongTo = hn::Set(d, edgeY * toY);
    acrossFrom = hn::Set(d, edgeX * fromY);
    squaredFrom = hn::Set(d, fromY * fromY);
    squaredTo = hn::Set(d, toY * toY);
    squaredLength = hn::Set(d, length);
    // A bound from below without a division; 0 where the inverse might overflow.
    inverse = hn::Set(d, length > 1e-290 ? (1 - 0x1p-48) / length : 0.0);
  }

  // The smaller of `best` and the squared distance, by the same operations as `SquaredDistance`.
  HWY_INLINE V Lower(D d, V x, V best) const {
    const V zero = hn::Zero(d);
    const V fromX = hn::Sub(x, x0);
    const V toX = hn::Sub(x1, x);
    const V nearFrom = hn::Add(hn::Mul(fromX, fromX), squaredFrom);
    if (isPoint) return hn::IfThenElse(hn::Lt(nearFrom, best), nearFrom, best);
    const V nearTo = hn::Add(hn::Mul(toX, toX), squaredTo);
    const auto before = hn::Lt(hn::Add(hn::Mul(dx, fromX), alongFrom), zero);
    const auto past = hn::Lt(hn::Add(hn::Mul(dx, toX), alongTo), zero);
    const V end = hn::IfThenElse(before, nearFrom, nearTo);
    const auto isEnd = hn::Or(before, past);
    best = hn::IfThenElse(hn::And(isEnd, hn::Lt(end, best)), end, best);
    const V cross = hn::Sub(acrossFrom, hn::Mul(dy, fromX));
    const V square = hn::Mul(cross, cross);
    // Not a number must not hide a distance.
    const auto farther = hn::Ge(hn::Mul(square, inverse), best);
    if (hn::AllTrue(d, hn::Or(isEnd, farther))) return best;
    const V across = hn::Div(square, squaredLength);
    return hn::IfThenElse(hn::AndNot(isEnd, hn::Lt(across, best)), across, best);
  }

  V x0, x1, dx, dy;
  V alongFrom, alongTo, acrossFrom;
  V squaredFrom, squaredTo, squaredLength, inverse;
  bool isPoint;
};

HWY_ATTR void Lower(const NearEdges& near, std::size_t first, std::size_t end,
                    const DistanceRow& row) {
  const D d;
  const std::size_t lanes = hn::Lanes(d);
  const double y = static_cast<double>(row.row) + 0.5;
  const V half = hn::Set(d, 0.5);
  const V lane = hn::Iota(d, 0);
  const V minX = hn::Set(d, near.minX);
  const V maxX = hn::Set(d, near.maxX);
  const V above = hn::Set(d, near.above * near.above * (1 - 0x1p-40));
  const V shrink = hn::Set(d, 1 - 0x1p-40);
  const auto centre = [&](std::size_t i) HWY_ATTR {
    return hn::Add(hn::Add(hn::Set(d, row.left + static_cast<double>(i)), lane), half);
  };
  // The pixels of a vector that the box may still lower.
  const auto mayLower = [&](V x, V best) HWY_ATTR {
    const V aside = hn::Max(hn::Max(hn::Sub(minX, x), hn::Sub(x, maxX)), hn::Zero(d));
    const V bound = hn::Add(hn::Mul(hn::Mul(aside, aside), shrink), above);
    return !hn::AllTrue(d, hn::Gt(bound, best));
  };
  const auto isInBand = [&](const PolygonEdge& edge) {
    return row.row >= edge.firstBand && row.row <= edge.lastBand;
  };
  std::size_t i = first - first % lanes;
  if (near.count == 1) {
    if (!isInBand(*near.edges)) return;
    while (i < end && !mayLower(centre(i), hn::LoadU(d, row.squared + i))) i += lanes;
    if (i >= end) return;
    const EdgeVectors edge(d, *near.edges, y);
    for (; i < end; i += lanes) {
      hn::StoreU(edge.Lower(d, centre(i), hn::LoadU(d, row.squared + i)), d, row.squared + i);
    }
    return;
  }
  for (; i < end; i += lanes) {
    const V x = centre(i);
    V best = hn::LoadU(d, row.squared + i);
    if (!mayLower(x, best)) continue;
    for (std::size_t k = 0; k < near.count; ++k) {
      const PolygonEdge& edge = near.edges[k];
      if (!isInBand(edge)) continue;
      best = EdgeVectors(d, edge, y).Lower(d, x, best);
    }
    hn::StoreU(best, d, row.squared + i);
  }
}

HWY_ATTR void LowerNarrow(const NarrowEdge* edges, std::size_t count, const DistanceRow& row) {
  const D d;
  const std::size_t lanes = hn::Lanes(d);
  const double y = static_cast<double>(row.row) + 0.5;
  const V half = hn::Set(d, 0.5);
  const V lane = hn::Iota(d, 0);
  for (const NarrowEdge* e = edges; e < edges + count; ++e) {
    if (row.row < e->firstRow || row.row > e->lastRow) continue;
    const EdgeVectors edge(d, *e, y);
    for (std::size_t i = e->firstColumn - e->firstColumn % lanes; i < e->endColumn; i += lanes) {
      const V x = hn::Add(hn::Add(hn::Set(d, row.left + static_cast<double>(i)), lane), half);
      hn::StoreU(edge.Lower(d, x, hn::LoadU(d, row.squared + i)), d, row.squared + i);
    }
  }
}

HWY_ATTR std::uint64_t Weigh(double* squared, std::uint64_t inside, double blend) {
  const D d;
  const std::size_t lanes = hn::Lanes(d);
  const V width = hn::Set(d, blend);
  const V one = hn::Set(d, 1.0);
  std::uint64_t band = 0;
  for (std::size_t i = 0; i < kWordColumns; i += lanes) {
    const V weight = hn::Div(hn::Sqrt(hn::LoadU(d, squared + i)), width);
    std::uint64_t bits = inside >> i;
    const auto isInside = hn::LoadMaskBits(d, reinterpret_cast<const std::uint8_t*>(&bits));
    hn::StoreU(hn::IfThenElse(isInside, weight, hn::Neg(weight)), d, squared + i);
    std::uint64_t within = 0;
    hn::StoreMaskBits(d, hn::Lt(weight, one), reinterpret_cast<std::uint8_t*>(&within));
    band |= within << i;
  }
  return band;
}

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#if HWY_ONCE

namespace zarn::processes::filters {

HWY_EXPORT(Lower);
void LowerDistances(const NearEdges& near, std::size_t first, std::size_t end,
                    const DistanceRow& row) {
  HWY_DYNAMIC_DISPATCH(Lower)(near, first, end, row);
}

HWY_EXPORT(LowerNarrow);
void LowerNarrowDistances(const NarrowEdge* edges, std::size_t count, const DistanceRow& row) {
  HWY_DYNAMIC_DISPATCH(LowerNarrow)(edges, count, row);
}

HWY_EXPORT(Weigh);
std::uint64_t WeighDistances(double* squared, std::uint64_t inside, double blend) {
  return HWY_DYNAMIC_DISPATCH(Weigh)(squared, inside, blend);
}

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
