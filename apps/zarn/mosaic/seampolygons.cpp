// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/seampolygons.h"

#include <algorithm>
#include <cmath>
#include <map>
#include <utility>

#include "apps/zarn/mosaic/labellattice.h"

namespace zarn::app {
namespace {

/// In halves of a cell, so that corners and middles of edges are whole numbers.
struct Point {
  std::int64_t x = 0;
  std::int64_t y = 0;

  auto operator<=>(const Point&) const = default;
};

constexpr double kHalvesPerCell = 2;

std::int64_t Cross(const Point& origin, const Point& a, const Point& b) {
  return (a.x - origin.x) * (b.y - origin.y) - (a.y - origin.y) * (b.x - origin.x);
}

std::int64_t Dot(const Point& origin, const Point& a, const Point& b) {
  return (a.x - origin.x) * (b.x - origin.x) + (a.y - origin.y) * (b.y - origin.y);
}

double SquareOfDistance(const Point& p, const Point& a, const Point& b) {
  const auto square = static_cast<double>(Dot(a, b, b));
  const auto along = static_cast<double>(Dot(a, b, p));
  if (along <= 0) return static_cast<double>(Dot(a, p, p));
  if (along >= square) return static_cast<double>(Dot(b, p, p));
  const auto across = static_cast<double>(Cross(a, b, p));
  return across * across / square;
}

bool IsBetween(const Point& p, const Point& a, const Point& b) {
  return Cross(a, b, p) == 0 && Dot(p, a, b) <= 0;
}

// Whether two edges have more in common than an end.
bool Meet(const Point& a, const Point& b, const Point& c, const Point& d) {
  if (a == c || a == d || b == c || b == d) {
    const Point& shared = a == c || a == d ? a : b;
    const Point& one = shared == a ? b : a;
    const Point& other = shared == c ? d : c;
    return Cross(shared, one, other) == 0 && Dot(shared, one, other) > 0;
  }
  const auto sign = [](std::int64_t value) { return (value > 0) - (value < 0); };
  if (sign(Cross(a, b, c)) * sign(Cross(a, b, d)) < 0 &&
      sign(Cross(c, d, a)) * sign(Cross(c, d, b)) < 0) {
    return true;
  }
  return IsBetween(c, a, b) || IsBetween(d, a, b) || IsBetween(a, c, d) || IsBetween(b, c, d);
}

/// A piece of border between two areas, from node to node, or a ring without nodes.
struct Arc {
  std::vector<Point> points;      ///< of a ring the first is also the last
  std::vector<std::size_t> kept;  ///< of the points, ascending, with both ends
  std::uint32_t right = 0;        ///< the label on the right side
  std::uint32_t left = 0;

  const Point& At(std::size_t vertex) const { return points[kept[vertex]]; }

  // The point between two that lies farthest from the edge that joins them, and how far.
  std::pair<std::size_t, double> Farthest(std::size_t from, std::size_t to) const {
    std::pair<std::size_t, double> farthest{from, 0};
    for (std::size_t i = from + 1; i < to; ++i) {
      const double square = SquareOfDistance(points[i], points[from], points[to]);
      if (square > farthest.second) farthest = {i, square};
    }
    return farthest;
  }

  void Simplify(double tolerance) {
    kept = {0};
    std::vector<std::size_t> ends{points.size() - 1};
    // A ring begins with two halves.
    if (points.front() == points.back()) ends.push_back(Farthest(0, ends[0]).first);
    const double limit = tolerance * kHalvesPerCell * tolerance * kHalvesPerCell;
    while (!ends.empty()) {
      const auto [middle, square] = Farthest(kept.back(), ends.back());
      if (square > limit) {
        ends.push_back(middle);
      } else {
        kept.push_back(ends.back());
        ends.pop_back();
      }
    }
  }
};

/// The directions along the edges of cells, clockwise.
enum Direction : std::size_t { kEast, kSouth, kWest, kNorth, kDirections };
constexpr std::array<Point, kDirections> kStep{Point{1, 0}, {0, 1}, {-1, 0}, {0, -1}};

/// Traces the borders of the labels. Corners of cells are points with even coordinates.
class BorderTracer {
 public:
  BorderTracer(const std::vector<std::uint32_t>& labels, WindowSize lattice)
      : labels_(labels), lattice_(lattice), seen_(CornerCount()) {
    const auto forEachCorner = [&](const auto& visit) {
      for (std::int64_t y = 0; y <= lattice_.height; ++y) {
        for (std::int64_t x = 0; x <= lattice_.width; ++x) {
          if (!IsWithin(x, y)) visit(Point{2 * x, 2 * y});
        }
      }
    };
    forEachCorner([&](const Point& corner) {
      if (!IsNode(corner)) return;
      for (std::size_t d = 0; d < kDirections; ++d) {
        if (IsBorder(corner, d) && !halves_.contains({corner, d})) TraceArc(corner, d);
      }
    });
    forEachCorner([&](const Point& corner) {
      if (seen_[IndexOf(corner)] || IsNode(corner)) return;
      for (std::size_t d = 0; d < kDirections; ++d) {
        if (!IsBorder(corner, d)) continue;
        TraceRing(corner, d);
        break;
      }
    });
  }

  std::vector<Arc>& Arcs() { return arcs_; }

  // A half is an arc in one of its directions: 2 * arc, or 2 * arc + 1 for backwards.
  std::uint32_t LabelOf(std::size_t half) const {
    return half % 2 == 0 ? arcs_[half / 2].right : arcs_[half / 2].left;
  }

  // The half that goes on around the area to the right. Areas that meet at a corner only are two.
  std::size_t Next(std::size_t half) const {
    const auto& [node, arrival] = ends_[half];
    if (arrival == kDirections) return half;  // a ring
    for (const std::size_t turn : {1, 0, 3}) {
      const std::size_t d = (arrival + turn) % kDirections;
      const auto next = halves_.find({node, d});
      if (next != halves_.end() && LabelOf(next->second) == LabelOf(half)) return next->second;
    }
    return half;
  }

 private:
  std::size_t CornerCount() const {
    return static_cast<std::size_t>((lattice_.width + 1) * (lattice_.height + 1));
  }
  std::size_t IndexOf(const Point& corner) const {
    return static_cast<std::size_t>(corner.y / 2 * (lattice_.width + 1) + corner.x / 2);
  }
  std::uint32_t LabelAt(std::int64_t x, std::int64_t y) const {
    const bool inside = x >= 0 && y >= 0 && x < lattice_.width && y < lattice_.height;
    return inside ? labels_[static_cast<std::size_t>(y * lattice_.width + x)] : kNoLabel;
  }
  // Whether all four cells around a corner have the same label, as around most.
  bool IsWithin(std::int64_t x, std::int64_t y) const {
    if (x == 0 || y == 0 || x == lattice_.width || y == lattice_.height) return false;
    const std::uint32_t* const below = labels_.data() + y * lattice_.width + x;
    const std::uint32_t* const above = below - lattice_.width;
    return below[-1] == below[0] && above[-1] == below[0] && above[0] == below[0];
  }
  // The label to the right of the edge that leaves `corner`: the cell between this direction and
  // the next one.
  std::uint32_t RightOf(const Point& corner, std::size_t d) const {
    const std::int64_t x = corner.x / 2;
    const std::int64_t y = corner.y / 2;
    return LabelAt(d == kEast || d == kNorth ? x : x - 1, d == kEast || d == kSouth ? y : y - 1);
  }
  std::uint32_t LeftOf(const Point& corner, std::size_t d) const {
    return RightOf(corner, (d + 3) % kDirections);
  }
  bool IsBorder(const Point& corner, std::size_t d) const {
    return RightOf(corner, d) != LeftOf(corner, d);
  }
  bool IsNode(const Point& corner) const {
    const bool isLatticeCorner = (corner.x == 0 || corner.x == 2 * lattice_.width) &&
                                 (corner.y == 0 || corner.y == 2 * lattice_.height);
    if (isLatticeCorner) return true;
    int borders = 0;
    for (std::size_t d = 0; d < kDirections; ++d) borders += IsBorder(corner, d) ? 1 : 0;
    return borders > 2;
  }
  std::size_t Onwards(const Point& corner, std::size_t arrival) const {
    for (const std::size_t turn : {1, 0}) {
      if (IsBorder(corner, (arrival + turn) % kDirections)) return (arrival + turn) % kDirections;
    }
    return (arrival + 3) % kDirections;
  }

  // Appends the middle of the edge; returns its far end.
  static Point Walk(Arc& arc, const Point& corner, std::size_t d) {
    const Point& step = kStep[d];
    arc.points.push_back({corner.x + step.x, corner.y + step.y});
    return {corner.x + 2 * step.x, corner.y + 2 * step.y};
  }

  Arc Begin(const Point& corner, std::size_t d) const {
    Arc arc;
    arc.right = RightOf(corner, d);
    arc.left = LeftOf(corner, d);
    return arc;
  }

  void TraceArc(const Point& start, std::size_t leaving) {
    Arc arc = Begin(start, leaving);
    arc.points.push_back(start);
    std::size_t d = leaving;
    Point corner = Walk(arc, start, d);
    while (!IsNode(corner)) {
      seen_[IndexOf(corner)] = true;
      d = Onwards(corner, d);
      corner = Walk(arc, corner, d);
    }
    arc.points.push_back(corner);
    const auto opposite = [](std::size_t direction) { return (direction + 2) % kDirections; };
    halves_[{start, leaving}] = 2 * arcs_.size();
    halves_[{corner, opposite(d)}] = 2 * arcs_.size() + 1;
    ends_.emplace_back(corner, d);
    ends_.emplace_back(start, opposite(leaving));
    arcs_.push_back(std::move(arc));
  }

  void TraceRing(const Point& start, std::size_t leaving) {
    Arc arc = Begin(start, leaving);
    std::size_t d = leaving;
    Point corner = start;
    do {
      seen_[IndexOf(corner)] = true;
      corner = Walk(arc, corner, d);
      d = Onwards(corner, d);
    } while (corner != start);
    arc.points.push_back(arc.points.front());
    ends_.emplace_back(start, kDirections);
    ends_.emplace_back(start, kDirections);
    arcs_.push_back(std::move(arc));
  }

  const std::vector<std::uint32_t>& labels_;
  WindowSize lattice_;
  std::vector<bool> seen_;  ///< corners along arcs
  std::vector<Arc> arcs_;
  std::map<std::pair<Point, std::size_t>, std::size_t> halves_;  ///< by node and leaving direction
  std::vector<std::pair<Point, std::size_t>> ends_;  ///< of a half: node and direction of arrival
};

struct Edge {
  std::size_t arc;
  std::size_t vertex;  ///< the first of the two

  auto operator<=>(const Edge&) const = default;
};

/// Edges by the squares of a coarse grid that they may touch.
class EdgeIndex {
 public:
  explicit EdgeIndex(const std::vector<Arc>& arcs) : arcs_(arcs) {
    for (std::size_t a = 0; a < arcs.size(); ++a) {
      for (std::size_t v = 0; v + 1 < arcs[a].kept.size(); ++v) Insert({a, v});
    }
    std::sort(entries_.begin(), entries_.end());
  }

  // The edges that meet another one elsewhere than in a common end; some several times.
  std::vector<Edge> Meeting() const {
    std::vector<Edge> meeting;
    for (std::size_t i = 0; i < entries_.size(); ++i) {
      for (std::size_t k = i + 1; k < entries_.size() && entries_[k].first == entries_[i].first;
           ++k) {
        const Edge& a = entries_[i].second;
        const Edge& b = entries_[k].second;
        if (!Meet(From(a), To(a), From(b), To(b))) continue;
        meeting.push_back(a);
        meeting.push_back(b);
      }
    }
    return meeting;
  }

 private:
  static constexpr std::int64_t kSquare = 32;

  const Point& From(const Edge& edge) const { return arcs_[edge.arc].At(edge.vertex); }
  const Point& To(const Edge& edge) const { return arcs_[edge.arc].At(edge.vertex + 1); }

  void Insert(const Edge& edge) {
    Point a = From(edge);
    Point b = To(edge);
    if (a.y > b.y) std::swap(a, b);
    for (std::int64_t row = a.y / kSquare; row <= b.y / kSquare; ++row) {
      // Where the edge enters and leaves the row of squares, or begins and ends.
      const auto columnAt = [&](std::int64_t y) {
        if (a.y == b.y) return y <= a.y ? a.x : b.x;
        return a.x + (b.x - a.x) * (std::clamp(y, a.y, b.y) - a.y) / (b.y - a.y);
      };
      const bool level = a.y == b.y;
      const std::int64_t one = level ? a.x : columnAt(row * kSquare);
      const std::int64_t other = level ? b.x : columnAt((row + 1) * kSquare);
      // (One further on each side for the rounding.)
      const std::int64_t first = (std::min(one, other) - 1) / kSquare;
      const std::int64_t last = (std::max(one, other) + 1) / kSquare;
      for (std::int64_t column = first; column <= last; ++column) {
        entries_.push_back({{row, column}, edge});
      }
    }
  }

  const std::vector<Arc>& arcs_;
  std::vector<std::pair<std::pair<std::int64_t, std::int64_t>, Edge>> entries_;
};

// How often the closed way along `points[from..to]` and straight back runs around `p`.
int Turns(const std::vector<Point>& points, std::size_t from, std::size_t to, const Point& p) {
  int turns = 0;
  for (std::size_t i = from; i <= to; ++i) {
    const Point& a = points[i];
    const Point& b = points[i < to ? i + 1 : from];
    if (a.y <= p.y && b.y > p.y && Cross(a, b, p) > 0) ++turns;
    if (a.y > p.y && b.y <= p.y && Cross(a, b, p) < 0) --turns;
  }
  return turns;
}

/// The ends of arcs and one point of each ring, which all stay where they are. As long as no edge
/// has passed one of them, and none meets another, every area lies among its neighbours as before.
class FixedPoints {
 public:
  explicit FixedPoints(const std::vector<Arc>& arcs) : arcs_(arcs) {
    for (const Arc& arc : arcs) {
      points_.insert(points_.end(), {Swapped(arc.points.front()), Swapped(arc.points.back())});
    }
    std::sort(points_.begin(), points_.end());
    points_.erase(std::unique(points_.begin(), points_.end()), points_.end());
  }

  // The edges that lie on another side of such a point than the border that they stand for.
  std::vector<Edge> PassedBy() const {
    std::vector<Edge> edges;
    for (std::size_t a = 0; a < arcs_.size(); ++a) {
      for (std::size_t v = 0; v + 1 < arcs_[a].kept.size(); ++v) {
        if (HasPassed(arcs_[a], arcs_[a].kept[v], arcs_[a].kept[v + 1])) edges.push_back({a, v});
      }
    }
    return edges;
  }

 private:
  static Point Swapped(const Point& p) { return {p.y, p.x}; }

  bool HasPassed(const Arc& arc, std::size_t from, std::size_t to) const {
    if (to == from + 1) return false;
    Point low = arc.points[from];
    Point high = low;
    for (std::size_t i = from; i <= to; ++i) {
      const Point& p = arc.points[i];
      low = {std::min(low.x, p.x), std::min(low.y, p.y)};
      high = {std::max(high.x, p.x), std::max(high.y, p.y)};
    }
    auto row = std::lower_bound(points_.begin(), points_.end(), Swapped(low));
    for (; row != points_.end() && row->x <= high.y; ++row) {
      const Point p = Swapped(*row);
      if (p.x < low.x || p.x > high.x || p == arc.points[from] || p == arc.points[to]) continue;
      if (Turns(arc.points, from, to, p) != 0) return true;
    }
    return false;
  }

  const std::vector<Arc>& arcs_;
  std::vector<Point> points_;  ///< x and y swapped, so that they are sorted by rows
};

// Puts vertices back until no border meets another one or has passed one by. With all of them none
// does: each corner of the lattice has the borders through it within half a cell of itself.
void KeepApart(std::vector<Arc>& arcs) {
  const FixedPoints fixed(arcs);
  while (true) {
    std::vector<Edge> wrong = EdgeIndex(arcs).Meeting();
    const std::vector<Edge> passed = fixed.PassedBy();
    wrong.insert(wrong.end(), passed.begin(), passed.end());
    std::sort(wrong.begin(), wrong.end());
    wrong.erase(std::unique(wrong.begin(), wrong.end()), wrong.end());
    bool changed = false;
    // From the back, so that the vertices before keep their numbers.
    for (auto edge = wrong.rbegin(); edge != wrong.rend(); ++edge) {
      Arc& arc = arcs[edge->arc];
      const std::size_t from = arc.kept[edge->vertex];
      const auto [middle, square] = arc.Farthest(from, arc.kept[edge->vertex + 1]);
      if (square == 0) continue;
      arc.kept.insert(arc.kept.begin() + static_cast<std::ptrdiff_t>(edge->vertex) + 1, middle);
      changed = true;
    }
    if (!changed) return;
  }
}

using Ring = std::vector<Point>;  // without the first point at the end

// A ring that comes back to a point is cut there, so that each part touches itself nowhere.
void AddSimpleRings(const Ring& ring, std::vector<Ring>& rings) {
  Ring sorted(ring);
  std::sort(sorted.begin(), sorted.end());
  if (std::adjacent_find(sorted.begin(), sorted.end()) == sorted.end()) {
    rings.push_back(ring);
    return;
  }
  Ring open;
  std::map<Point, std::size_t> places;
  for (const Point& p : ring) {
    const auto place = places.find(p);
    if (place != places.end()) {
      const auto first = open.begin() + static_cast<std::ptrdiff_t>(place->second);
      rings.emplace_back(first, open.end());
      for (auto q = first + 1; q != open.end(); ++q) places.erase(*q);
      open.erase(first + 1, open.end());
    } else {
      places[p] = open.size();
      open.push_back(p);
    }
  }
  rings.push_back(open);
}

void AppendHalf(const Arc& arc, bool backwards, Ring& ring) {
  for (std::size_t i = 0; i + 1 < arc.kept.size(); ++i) {
    ring.push_back(arc.At(backwards ? arc.kept.size() - 1 - i : i));
  }
}

}  // namespace

double RingArea(const std::vector<std::array<double, 2>>& ring) {
  double twice = 0;
  for (std::size_t i = 0; i + 1 < ring.size(); ++i) {
    twice += ring[i][0] * ring[i + 1][1] - ring[i + 1][0] * ring[i][1];
  }
  return twice / 2;
}

std::vector<ScenePolygon> SeamPolygons(const std::vector<std::uint32_t>& labels, WindowSize lattice,
                                       std::size_t count, double cell, double tolerance) {
  BorderTracer borders(labels, lattice);
  for (Arc& arc : borders.Arcs()) arc.Simplify(tolerance);
  KeepApart(borders.Arcs());

  std::vector<ScenePolygon> polygons(count);
  std::vector<bool> used(2 * borders.Arcs().size());
  for (std::size_t start = 0; start < used.size(); ++start) {
    if (used[start] || borders.LabelOf(start) == kNoLabel) continue;
    Ring whole;
    std::size_t half = start;
    do {
      used[half] = true;
      AppendHalf(borders.Arcs()[half / 2], half % 2 != 0, whole);
      half = borders.Next(half);
    } while (half != start);
    std::vector<Ring> rings;
    AddSimpleRings(whole, rings);
    for (const Ring& ring : rings) {
      auto& closed = polygons[borders.LabelOf(start)].rings.emplace_back();
      for (const Point& p : ring) {
        closed.push_back({static_cast<double>(p.x) / kHalvesPerCell * cell,
                          static_cast<double>(p.y) / kHalvesPerCell * cell});
      }
      closed.push_back(closed.front());
    }
  }
  return polygons;
}

}  // namespace zarn::app
