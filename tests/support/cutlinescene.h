// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <numbers>
#include <vector>

#include "processes/filters/cutline/polygonparam.h"
#include "tests/support/randomnumbers.h"

namespace zarn::testsupport {

/// A polygon that owns its numbers.
struct Rings {
  std::vector<double> vertices;
  std::vector<std::int32_t> parts = {0};

  void Begin() {
    ++parts[0];
    parts.push_back(static_cast<std::int32_t>(vertices.size() / 2));
  }
  void Add(double x, double y) { vertices.insert(vertices.end(), {x, y}); }
  void AddRing(const std::vector<std::pair<double, double>>& points) {
    Begin();
    for (const auto& [x, y] : points) Add(x, y);
  }

  processes::filters::PolygonParam Param() {
    return {.vertices = vertices.data(),
            .vertexCount = static_cast<std::uint32_t>(vertices.size() / 2),
            .parts = parts.data()};
  }
  bool HasEdge(std::size_t vertex) const {
    const auto next = static_cast<std::int32_t>(vertex + 1);
    return std::find(parts.begin() + 1, parts.end(), next) == parts.end();
  }
};

enum class PolygonKind { kStar, kHole, kScribble, kAligned, kTeeth, kFlat };

/// Polygons around (cx, cy) of about `size` pixels. Aligned ones have their vertices on multiples
/// of a half: on centres, on borders, with horizontal and coinciding edges.
inline Rings RandomPolygon(PolygonKind kind, std::uint64_t seed, double cx, double cy, double size,
                           int count) {
  RandomNumbers random(seed);
  Rings rings;
  const auto ring = [&](double radius, double wobble) {
    rings.Begin();
    const std::size_t begin = rings.vertices.size();
    for (int i = 0; i < count; ++i) {
      const double angle = 2 * std::numbers::pi * i / count;
      const double r = radius * (1 + wobble * random.Fraction());
      rings.Add(cx + r * std::cos(angle), cy + r * std::sin(angle));
    }
    rings.Add(rings.vertices[begin], rings.vertices[begin + 1]);
  };
  switch (kind) {
    case PolygonKind::kStar:
      ring(size / 2, 0.4);
      break;
    case PolygonKind::kHole:
      ring(size / 2, 0.1);
      ring(size / 4, 0.1);
      break;
    case PolygonKind::kScribble:
    case PolygonKind::kAligned: {
      const bool aligned = kind == PolygonKind::kAligned;
      for (int part = 0; part < 3; ++part) {
        rings.Begin();
        const std::size_t begin = rings.vertices.size();
        double x = cx;
        double y = cy;
        for (int i = 0; i < count / 3 + 3; ++i) {
          x = cx + size / 2 * random.Fraction();
          // Often along the row of the vertex before.
          if (!random.Percent(25)) y = cy + size / 2 * random.Fraction();
          if (aligned) x = std::round(2 * x) / 2;
          if (aligned) y = std::round(2 * y) / 2;
          rings.Add(x, y);
          if (random.Percent(10)) rings.Add(x, y);
        }
        // The last ring stays open.
        if (part < 2) rings.Add(rings.vertices[begin], rings.vertices[begin + 1]);
      }
      break;
    }
    case PolygonKind::kTeeth:
      rings.Begin();
      for (int i = 0; i <= count; ++i) {
        rings.Add(cx + size * (double(i) / count - 0.5), cy + (i % 2 == 0 ? 1 : -1) * size / 2);
      }
      rings.Add(cx + size / 2, cy + size);
      rings.Add(cx - size / 2, cy + size / 2);
      break;
    case PolygonKind::kFlat:
      rings.Begin();
      for (int i = 0; i <= count; ++i) {
        rings.Add(cx + size / 2 * random.Fraction(), std::floor(cy) + 0.5);
      }
      break;
  }
  return rings;
}

/// The signed distance to a polygon by the textbook: parity of the edges that a ray crosses, and
/// the nearest point of all edges, not of those near the row.
inline double SignedDistance(const Rings& rings, double x, double y) {
  bool inside = false;
  double nearest = std::numeric_limits<double>::infinity();
  for (std::size_t i = 0; 2 * i + 3 < rings.vertices.size(); ++i) {
    if (!rings.HasEdge(i)) continue;
    const double* const v = rings.vertices.data() + 2 * i;
    if ((v[1] > y) != (v[3] > y) && x < v[0] + (y - v[1]) / (v[3] - v[1]) * (v[2] - v[0])) {
      inside = !inside;
    }
    const double length = std::hypot(v[2] - v[0], v[3] - v[1]);
    const double along =
        length > 0 ? ((x - v[0]) * (v[2] - v[0]) + (y - v[1]) * (v[3] - v[1])) / length : 0;
    const double t = length > 0 ? std::clamp(along / length, 0.0, 1.0) : 0;
    nearest =
        std::min(nearest, std::hypot(x - v[0] - t * (v[2] - v[0]), y - v[1] - t * (v[3] - v[1])));
  }
  return inside ? nearest : -nearest;
}

}  // namespace zarn::testsupport
