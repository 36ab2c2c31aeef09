// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <vector>

namespace zarn::app {

struct Vec {
  double x = 0.0;
  double y = 0.0;
};

constexpr Vec operator+(Vec a, Vec b) { return {a.x + b.x, a.y + b.y}; }
constexpr Vec operator-(Vec a, Vec b) { return {a.x - b.x, a.y - b.y}; }
constexpr Vec operator*(double s, Vec v) { return {s * v.x, s * v.y}; }
constexpr double Dot(Vec a, Vec b) { return a.x * b.x + a.y * b.y; }
constexpr Vec Across(Vec v) { return {-v.y, v.x}; }
double Length(Vec v);
Vec Normalized(Vec v);

/// Cuts a plane into parcels of land by straight lines, each ending at an older one: the oldest
/// lines are roads, the younger ones tracks, hedges and grass strips, so the roads form a connected
/// network and the fields lie along them.
class ParcelMap {
 public:
  enum class Border : std::uint8_t { kRoad, kStreet, kTrack, kHedge, kStrip };

  struct Parcel {
    std::uint64_t bits = 0;  ///< the parcel's own random bits
    Vec along;               ///< direction of its longest edge
    Vec centre;
    bool settled = false;  ///< part of a settlement
  };

  /// What lies at a place. Distances are in pixels and not negative.
  struct Place {
    const Parcel* parcel = nullptr;
    double edge = 0.0;  ///< to the parcel's nearest edge
    Border border = Border::kStrip;
    Vec edgeAlong;
    double road = 0.0;  ///< to the centre line of the nearest road, street or track
    double roadHalfWidth = 0.0;
    Border roadKind = Border::kTrack;
    Vec roadAlong;
  };

  struct Settlement {
    Vec centre;
    double radius = 0.0;
  };

  /// Parcels of a width x height area and some way beyond. Within the two settlements the borders
  /// are streets. The main road goes from top to bottom through `village`, where a side road joins
  /// it from the left; another one leaves it to the right through `hamlet`.
  ParcelMap(std::uint64_t seed, double width, double height, const Settlement& village,
            const Settlement& hamlet);

  Place Find(Vec p) const;

 private:
  using Polygon = std::vector<Vec>;

  struct Line {
    Vec normal;
    double offset = 0.0;
    Border border = Border::kStrip;
    double halfWidth = 0.0;
    // Index of the next line on either side, or ~index of the parcel there.
    int below = 0;
    int above = 0;
  };

  int Divide(const Polygon& polygon, int depth, std::uint64_t bits);
  Line ChooseLine(const Polygon& polygon, int depth, std::uint64_t bits, bool settled) const;
  bool IsSettled(Vec p) const;

  Settlement village_;
  Settlement hamlet_;
  std::vector<Line> lines_;
  std::vector<Parcel> parcels_;
};

}  // namespace zarn::app
