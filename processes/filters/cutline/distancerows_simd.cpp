// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/cutline/distancerows_simd.h"

#include <algorithm>

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

// All that there is lies before the start of an edge without length.
constexpr double kBefore = -1;
// Leaves room for rounding in the distance to a box.
constexpr double kShrink = 1 - 0x1p-40;

/// Whether edges in a box, so far (squared) above the row, may lower any of the pixels of a vector.
HWY_INLINE bool MayLower(D d, V minX, V maxX, V above, V x, V best) {
  const V aside = hn::Max(hn::Max(hn::Sub(minX, x), hn::Sub(x, maxX)), hn::Zero(d));
  const V bound = hn::Add(hn::Mul(hn::Mul(aside, aside), hn::Set(d, kShrink)), above);
  return !hn::AllTrue(d, hn::Gt(bound, best));
}

/// One edge as seen from a row.
struct EdgeVectors {
  template <typename Edge>
  HWY_INLINE EdgeVectors(D d, const Edge& edge, double y) {
    const double edgeX = edge.x1 - edge.x0;
    const double edgeY = edge.y1 - edge.y0;
    const double fromY = y - edge.y0;
    const double toY = edge.y1 - y;
    const double length = edgeX * edgeX + edgeY * edgeY;
    const bool isPoint = edgeX == 0 && edgeY == 0;
    x0 = hn::Set(d, edge.x0);
    x1 = hn::Set(d, edge.x1);
    dx = hn::Set(d, edgeX);
    dy = hn::Set(d, edgeY);
    alongFrom = hn::Set(d, isPoint ? kBefore : edgeY * fromY);
    alongTo = hn::Set(d, edgeY * toY);
    acrossFrom = hn::Set(d, edgeX * fromY);
    squaredFrom = hn::Set(d, fromY * fromY);
    squaredTo = hn::Set(d, toY * toY);
    squaredLength = hn::Set(d, length);
    inverse = hn::Set(d, BoundingInverse(length));
  }
  // The smaller of `best` and the squared distance, by the same operations as `SquaredDistance`.
  HWY_INLINE V Lower(D d, V x, V best) const {
    const V zero = hn::Zero(d);
    const V fromX = hn::Sub(x, x0);
    const V toX = hn::Sub(x1, x);
    const V nearFrom = hn::Add(hn::Mul(fromX, fromX), squaredFrom);
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
};

/// The same for all edges of a group, worked out a vector of edges at a time. Such edges are short
/// and near, so nothing overflows.
class GroupVectors {
 public:
  HWY_INLINE GroupVectors(D d, const NearEdges& near, double y) {
    const V row = hn::Set(d, y);
    const GroupedEdges& grouped = *near.grouped;
    for (std::size_t n = 0; n < GroupedEdges::kNumbers; ++n) {
      edges_[n] = grouped.edges[n].data() + near.place;
    }
    const std::size_t part = near.place / GroupedEdges::kPart;
    const std::size_t parts = (near.count + GroupedEdges::kPart - 1) / GroupedEdges::kPart;
    for (std::size_t k = 0; k < parts * GroupedEdges::kPart; k += hn::Lanes(d)) {
      const V dx = hn::LoadU(d, edges_[GroupedEdges::kDx] + k);
      const V dy = hn::LoadU(d, edges_[GroupedEdges::kDy] + k);
      const V fromY = hn::Sub(row, hn::LoadU(d, edges_[GroupedEdges::kY0] + k));
      const V toY = hn::Sub(hn::LoadU(d, edges_[GroupedEdges::kY1] + k), row);
      const auto isPoint = hn::And(hn::Eq(dx, hn::Zero(d)), hn::Eq(dy, hn::Zero(d)));
      const V along = hn::IfThenElse(isPoint, hn::Set(d, kBefore), hn::Mul(dy, fromY));
      hn::Store(along, d, alongFrom_ + k);
      hn::Store(hn::Mul(dy, toY), d, alongTo_ + k);
      hn::Store(hn::Mul(dx, fromY), d, acrossFrom_ + k);
      hn::Store(hn::Mul(fromY, fromY), d, squaredFrom_ + k);
      hn::Store(hn::Mul(toY, toY), d, squaredTo_ + k);
    }
    minX_ = grouped.boxes[GroupedEdges::kMinX].data() + part;
    maxX_ = grouped.boxes[GroupedEdges::kMaxX].data() + part;
    for (std::size_t p = 0; p < parts; p += hn::Lanes(d)) {
      const V minY = hn::LoadU(d, grouped.boxes[GroupedEdges::kMinY].data() + part + p);
      const V maxY = hn::LoadU(d, grouped.boxes[GroupedEdges::kMaxY].data() + part + p);
      const V above = hn::Max(hn::Max(hn::Sub(minY, row), hn::Sub(row, maxY)), hn::Zero(d));
      hn::Store(hn::Mul(hn::Mul(above, above), hn::Set(d, kShrink)), d, above_ + p);
    }
  }

  // As `EdgeVectors::Lower` for all edges.
  HWY_INLINE V Lower(D d, V x, V best, std::size_t count) const {
    for (std::size_t k = 0; k < count; k += GroupedEdges::kPart) {
      const std::size_t p = k / GroupedEdges::kPart;
      if (!MayLower(d, hn::Set(d, minX_[p]), hn::Set(d, maxX_[p]), hn::Set(d, above_[p]), x,
                    best)) {
        continue;
      }
      V below0;
      V below1;
      V below2;
      V below3;
      best = LowerToEnd(d, k, x, best, below0);
      best = LowerToEnd(d, k + 1, x, best, below1);
      best = LowerToEnd(d, k + 2, x, best, below2);
      best = LowerToEnd(d, k + 3, x, best, below3);
      const V least = hn::Min(hn::Min(below0, below1), hn::Min(below2, below3));
      if (hn::AllTrue(d, hn::Ge(least, best))) continue;
      best = LowerAcross(d, k, x, best, hn::Lt(below0, best));
      best = LowerAcross(d, k + 1, x, best, hn::Lt(below1, best));
      best = LowerAcross(d, k + 2, x, best, hn::Lt(below2, best));
      best = LowerAcross(d, k + 3, x, best, hn::Lt(below3, best));
    }
    return best;
  }

 private:
  static constexpr std::size_t kParts = kMostGrouped / GroupedEdges::kPart;

  HWY_INLINE V Edge(D d, GroupedEdges::Number number, std::size_t k) const {
    return hn::Set(d, edges_[number][k]);
  }
  HWY_INLINE V Square(D d, std::size_t k, V fromX) const {
    const V cross =
        hn::Sub(hn::Set(d, acrossFrom_[k]), hn::Mul(Edge(d, GroupedEdges::kDy, k), fromX));
    return hn::Mul(cross, cross);
  }
  // Where one of the ends is nearest; elsewhere `below` becomes a bound of the squared distance.
  HWY_INLINE V LowerToEnd(D d, std::size_t k, V x, V best, V& below) const {
    const V zero = hn::Zero(d);
    const V dx = Edge(d, GroupedEdges::kDx, k);
    const V fromX = hn::Sub(x, Edge(d, GroupedEdges::kX0, k));
    const V toX = hn::Sub(Edge(d, GroupedEdges::kX1, k), x);
    const V nearFrom = hn::Add(hn::Mul(fromX, fromX), hn::Set(d, squaredFrom_[k]));
    const V nearTo = hn::Add(hn::Mul(toX, toX), hn::Set(d, squaredTo_[k]));
    const auto before = hn::Lt(hn::Add(hn::Mul(dx, fromX), hn::Set(d, alongFrom_[k])), zero);
    const auto past = hn::Lt(hn::Add(hn::Mul(dx, toX), hn::Set(d, alongTo_[k])), zero);
    const V end = hn::IfThenElse(before, nearFrom, nearTo);
    const auto isEnd = hn::Or(before, past);
    const V bound = hn::Mul(Square(d, k, fromX), Edge(d, GroupedEdges::kInverse, k));
    below = hn::IfThenElse(isEnd, hn::Inf(d), bound);
    return hn::Min(best, hn::IfThenElse(isEnd, end, best));
  }
  HWY_INLINE V LowerAcross(D d, std::size_t k, V x, V best, hn::Mask<D> where) const {
    if (hn::AllFalse(d, where)) return best;
    const V square = Square(d, k, hn::Sub(x, Edge(d, GroupedEdges::kX0, k)));
    const V across = hn::Div(square, Edge(d, GroupedEdges::kLength, k));
    return hn::IfThenElse(where, hn::Min(across, best), best);
  }

  const double* edges_[GroupedEdges::kNumbers];
  HWY_ALIGN double alongFrom_[kMostGrouped];
  HWY_ALIGN double alongTo_[kMostGrouped];
  HWY_ALIGN double acrossFrom_[kMostGrouped];
  HWY_ALIGN double squaredFrom_[kMostGrouped];
  HWY_ALIGN double squaredTo_[kMostGrouped];
  HWY_ALIGN double above_[std::max<std::size_t>(kParts, 8)];
  const double* minX_;
  const double* maxX_;
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
  const V above = hn::Set(d, near.above * near.above * kShrink);
  const auto centre = [&](std::size_t i) HWY_ATTR {
    return hn::Add(hn::Add(hn::Set(d, row.left + static_cast<double>(i)), lane), half);
  };
  const auto mayLower = [&](V x, V best)
                            HWY_ATTR { return MayLower(d, minX, maxX, above, x, best); };
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
  if (near.grouped != nullptr) {
    while (i < end && !mayLower(centre(i), hn::LoadU(d, row.squared + i))) i += lanes;
    if (i >= end) return;
    const GroupVectors group(d, near, y);
    for (; i < end; i += lanes) {
      const V x = centre(i);
      const V best = hn::LoadU(d, row.squared + i);
      if (mayLower(x, best)) {
        hn::StoreU(group.Lower(d, x, best, near.count), d, row.squared + i);
      }
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

HWY_ATTR void Bound(double* weights, double blend, double step, double most) {
  const D d;
  for (std::size_t i = 0; i < kWordColumns; i += hn::Lanes(d)) {
    const V distance = hn::Mul(hn::Abs(hn::LoadU(d, weights + i)), hn::Set(d, blend));
    const V bound = hn::Min(hn::Add(distance, hn::Set(d, step)), hn::Set(d, most));
    hn::StoreU(hn::Mul(bound, bound), d, weights + i);
  }
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

HWY_EXPORT(Bound);
void BoundBelow(double* weights, double blend, double step, double most) {
  HWY_DYNAMIC_DISPATCH(Bound)(weights, blend, step, most);
}

}  // namespace zarn::processes::filters

#endif  // HWY_ONCE
