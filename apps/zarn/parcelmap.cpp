// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/parcelmap.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <utility>

#include "apps/zarn/noise.h"

namespace zarn::app {
namespace {

// Half widths in pixels.
constexpr double kMainRoad = 4.2;
constexpr double kSideRoad = 3.2;
constexpr double kStreet = 2.6;
constexpr double kTrack = 1.9;

constexpr int kRoadDepth = 2;
constexpr int kTrackDepth = 5;

struct Extent {
  double low = std::numeric_limits<double>::max();
  double high = std::numeric_limits<double>::lowest();
  double Size() const { return high - low; }
};

Extent ExtentAlong(const std::vector<Vec>& polygon, Vec direction) {
  Extent extent;
  for (const Vec corner : polygon) {
    extent.low = std::min(extent.low, Dot(corner, direction));
    extent.high = std::max(extent.high, Dot(corner, direction));
  }
  return extent;
}

double Area(const std::vector<Vec>& polygon) {
  double twice = 0.0;
  for (std::size_t i = 0; i < polygon.size(); ++i) {
    twice += Dot(Across(polygon[i]), polygon[(i + 1) % polygon.size()]);
  }
  return 0.5 * twice;
}

Vec Centre(const std::vector<Vec>& polygon) {
  Vec sum;
  for (const Vec corner : polygon) sum = sum + corner;
  return (1.0 / static_cast<double>(polygon.size())) * sum;
}

Vec LongestEdge(const std::vector<Vec>& polygon) {
  Vec longest;
  for (std::size_t i = 0; i < polygon.size(); ++i) {
    const Vec edge = polygon[(i + 1) % polygon.size()] - polygon[i];
    if (Dot(edge, edge) > Dot(longest, longest)) longest = edge;
  }
  return Normalized(longest);
}

// The part of a convex polygon where dot(p, normal) <= offset.
std::vector<Vec> PartBelow(const std::vector<Vec>& polygon, Vec normal, double offset) {
  std::vector<Vec> part;
  for (std::size_t i = 0; i < polygon.size(); ++i) {
    const Vec from = polygon[i];
    const Vec to = polygon[(i + 1) % polygon.size()];
    const double a = Dot(from, normal) - offset;
    const double b = Dot(to, normal) - offset;
    if (a <= 0.0) part.push_back(from);
    if ((a < 0.0 && b > 0.0) || (a > 0.0 && b < 0.0))
      part.push_back(from + (a / (a - b)) * (to - from));
  }
  return part;
}

Vec Tilted(Vec v, double slope) { return Normalized(v + slope * Across(v)); }

}  // namespace

double Length(Vec v) { return std::sqrt(Dot(v, v)); }

Vec Normalized(Vec v) { return (1.0 / Length(v)) * v; }

ParcelMap::ParcelMap(std::uint64_t seed, double width, double height, const Settlement& village,
                     const Settlement& hamlet)
    : village_(village), hamlet_(hamlet) {
  constexpr double kBeyond = 200.0;
  Divide({{-kBeyond, -kBeyond},
          {width + kBeyond, -kBeyond},
          {width + kBeyond, height + kBeyond},
          {-kBeyond, height + kBeyond}},
         0, noise::Scramble(seed));
}

bool ParcelMap::IsSettled(Vec p) const {
  return Length(p - village_.centre) < village_.radius ||
         Length(p - hamlet_.centre) < hamlet_.radius;
}

ParcelMap::Line ParcelMap::ChooseLine(const Polygon& polygon, int depth, std::uint64_t bits,
                                      bool settled) const {
  const auto random = [&](int use) { return noise::Unit(noise::Hash(bits, 100 + use)); };
  const double tilt = 2.0 * random(0) - 1.0;

  Line line;
  if (depth < kRoadDepth) {
    const bool main = depth == 0;
    line.normal = main ? Tilted({1, 0}, 0.16 + 0.08 * tilt) : Tilted({0, 1}, 0.14 * tilt);
    const bool throughHamlet = !main && Centre(polygon).x > village_.centre.x;
    line.offset = Dot(line.normal, throughHamlet ? hamlet_.centre : village_.centre);
    line.border = Border::kRoad;
    line.halfWidth = main ? kMainRoad : kSideRoad;
    return line;
  }

  const Vec along = LongestEdge(polygon);
  const double lengthwise = ExtentAlong(polygon, along).Size();
  const double crosswise = ExtentAlong(polygon, Across(along)).Size();
  const bool crosscut = lengthwise > crosswise * noise::Lerp(0.7, 2.2, random(2));
  // Whole neighbourhoods turn, single fields hardly do.
  const double turn = settled ? 0.05 : depth <= 3 ? 0.30 : 0.06;
  line.normal = Tilted(crosscut ? along : Across(along), turn * tilt);
  const Extent extent = ExtentAlong(polygon, line.normal);
  line.offset = noise::Lerp(extent.low, extent.high, noise::Lerp(0.33, 0.67, random(3)));

  if (settled) {
    line.border = Border::kStreet;
    line.halfWidth = kStreet;
  } else if (depth < kTrackDepth && random(4) < 0.75) {
    line.border = Border::kTrack;
    line.halfWidth = kTrack;
  } else {
    line.border = random(4) < 0.3 ? Border::kHedge : Border::kStrip;
  }
  return line;
}

int ParcelMap::Divide(const Polygon& polygon, int depth, std::uint64_t bits) {
  const double area = Area(polygon);
  const Vec centre = Centre(polygon);
  const bool settled = depth >= kRoadDepth && IsSettled(centre);
  const double choice = noise::Unit(noise::Hash(bits, 7));
  const double enough = settled ? 9000.0 : 11000.0 + 55000.0 * choice * choice;
  if (depth > kRoadDepth && area < enough) {
    parcels_.push_back({noise::Hash(bits, 8), LongestEdge(polygon), centre, settled});
    return ~static_cast<int>(parcels_.size() - 1);
  }

  const Line line = ChooseLine(polygon, depth, bits, settled);
  const auto index = static_cast<int>(lines_.size());
  lines_.push_back(line);
  const int below =
      Divide(PartBelow(polygon, line.normal, line.offset), depth + 1, noise::Hash(bits, 1));
  const int above =
      Divide(PartBelow(polygon, -1.0 * line.normal, -line.offset), depth + 1, noise::Hash(bits, 2));
  lines_[static_cast<std::size_t>(index)].below = below;
  lines_[static_cast<std::size_t>(index)].above = above;
  return index;
}

ParcelMap::Place ParcelMap::Find(Vec p) const {
  Place place;
  place.edge = std::numeric_limits<double>::max();
  double clearance = std::numeric_limits<double>::max();
  int next = 0;
  while (next >= 0) {
    const Line& line = lines_[static_cast<std::size_t>(next)];
    const double side = Dot(p, line.normal) - line.offset;
    const double distance = std::abs(side);
    if (distance < place.edge) {
      place.edge = distance;
      place.border = line.border;
      place.edgeAlong = Across(line.normal);
    }
    // Among the lines that carry traffic the one whose verge is nearest counts.
    if (line.halfWidth > 0.0 && distance - line.halfWidth < clearance) {
      clearance = distance - line.halfWidth;
      place.road = distance;
      place.roadHalfWidth = line.halfWidth;
      place.roadKind = line.border;
      place.roadAlong = Across(line.normal);
    }
    next = side <= 0.0 ? line.below : line.above;
  }
  place.parcel = &parcels_[static_cast<std::size_t>(~next)];
  return place;
}

}  // namespace zarn::app
