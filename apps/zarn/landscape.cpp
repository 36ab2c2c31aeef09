// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/landscape.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <limits>

#include "apps/zarn/noise.h"
#include "processes/filters/framework/parallel.h"

namespace zarn::app {
namespace {

using noise::Fractal;
using noise::Hash;
using noise::Lerp;
using noise::Signed;
using noise::Smooth;
using noise::SmoothStep;
using noise::Unit;
using noise::Wave;

// What a random number is for; keeps the noises independent of each other.
enum Use : std::uint64_t {
  kParcels = 1000,
  kWarpX = 2000,
  kWarpY = 3000,
  kCourse = 4000,
  kBank = 5000,
  kShore = 6000,
  kRelief = 7000,
  kWoods = 8000,
  kTrees = 9000,
  kHouses = 10000,
  kSoil = 11000,
  kPlants = 12000,
  kRipples = 13000,
  kPaving = 14000,
  kGrain = 15000,
};

constexpr Vec kArea{Landscape::kWidth, Landscape::kHeight};
constexpr Vec kTowardsLight{-0.70710678, -0.70710678};

constexpr double kHouseReach = 40.0;
constexpr int kHouseCell = 32;
constexpr int kHouseColumns = Landscape::kWidth / kHouseCell + 1;
constexpr int kHouseRows = Landscape::kHeight / kHouseCell + 1;

constexpr int kTreeCell = 6;
constexpr int kTreeMargin = 3;  // cells around the area: crowns and shadows reach in
constexpr int kTreeColumns = Landscape::kWidth / kTreeCell + 1 + 2 * kTreeMargin;
constexpr int kTreeRows = Landscape::kHeight / kTreeCell + 1 + 2 * kTreeMargin;

struct Crop {
  Color color;
  double mottle;     // how much soil and moisture show through
  double rowPeriod;  // pixels
  double rowDepth;
  double tramlines;  // how much the wheel tracks of the sprayer show
  double orchard;    // how much the rows are cut into single bushes
};

constexpr Crop kCrops[] = {
    {{96, 117, 64}, 0.07, 3.1, 0.03, 0.12, 0},    // young cereals
    {{112, 131, 76}, 0.08, 3.1, 0.03, 0.12, 0},   // cereals in ear
    {{171, 152, 103}, 0.06, 3.3, 0.03, 0.13, 0},  // ripe wheat
    {{158, 146, 100}, 0.07, 3.3, 0.03, 0.12, 0},  // ripe barley
    {{167, 150, 116}, 0.07, 5.7, 0.06, 0.05, 0},  // stubble
    {{118, 101, 79}, 0.10, 4.3, 0.08, 0, 0},      // ploughed
    {{143, 125, 98}, 0.12, 3.7, 0.05, 0.04, 0},   // harrowed
    {{78, 101, 54}, 0.06, 3.9, 0.07, 0.03, 0},    // maize
    {{84, 112, 60}, 0.06, 4.1, 0.05, 0.08, 0},    // beet
    {{109, 124, 72}, 0.12, 9.5, 0.015, 0, 0},     // pasture
    {{124, 138, 82}, 0.08, 8.5, 0.05, 0, 0},      // mown meadow
    {{131, 137, 92}, 0.09, 7.5, 0.04, 0, 0},      // mown a week ago
    {{148, 147, 84}, 0.06, 3.3, 0.03, 0.10, 0},   // rape past its bloom
    {{104, 116, 72}, 0.06, 8.3, 0.17, 0, 1},      // orchard
};
constexpr std::size_t kMeadows = 9;  // the first of three
constexpr const Crop& kPasture = kCrops[kMeadows];

Color Scaled(const Color& color, double factor) {
  return {color[0] * factor, color[1] * factor, color[2] * factor};
}

Color Blend(const Color& from, const Color& to, double share) {
  return {Lerp(from[0], to[0], share), Lerp(from[1], to[1], share), Lerp(from[2], to[2], share)};
}

}  // namespace

template <typename Function>
CoarseGrid::CoarseGrid(int width, int height, int step, const Function& function)
    : step_(step),
      columns_((width + 2 * kMargin) / step + 2),
      rows_((height + 2 * kMargin) / step + 2) {
  values_.resize(static_cast<std::size_t>(columns_) * static_cast<std::size_t>(rows_));
  processes::filters::parallel::ForEachRowBand(
      rows_, rows_, [&](std::ptrdiff_t, std::ptrdiff_t first, std::ptrdiff_t end) {
        for (std::ptrdiff_t row = first; row < end; ++row) {
          for (int column = 0; column < columns_; ++column) {
            const Vec p{static_cast<double>(column * step_ - kMargin),
                        static_cast<double>(row * step_ - kMargin)};
            values_[static_cast<std::size_t>(row * columns_ + column)] = function(p);
          }
        }
      });
}

double CoarseGrid::At(Vec p) const {
  const double x = std::clamp((p.x + kMargin) / step_, 0.0, columns_ - 1.0);
  const double y = std::clamp((p.y + kMargin) / step_, 0.0, rows_ - 1.0);
  const int column = std::min(static_cast<int>(x), columns_ - 2);
  const int row = std::min(static_cast<int>(y), rows_ - 2);
  const double u = x - column;
  const double v = y - row;
  const double* corner = &values_[static_cast<std::size_t>(row * columns_ + column)];
  return Lerp(Lerp(corner[0], corner[1], u), Lerp(corner[columns_], corner[columns_ + 1], u), v);
}

// Everything that is known about a place before it is painted.
struct Landscape::Site {
  Vec p;
  Vec warped;
  ParcelMap::Place place;
  double bank = 0.0;  // distance from the river's edge, negative in the water
  double bend = 0.0;
  double shore = 0.0;
  double wood = 0.0;
  const House* house = nullptr;
  double houseDistance = kHouseReach;

  double Water() const { return std::min(bank, shore); }
  double Verge() const { return place.road - place.roadHalfWidth; }
};

Landscape::Landscape(std::uint64_t seed)
    : seed_(noise::Scramble(seed)),
      village_{{kArea.x * 0.50, kArea.y * (0.32 + 0.03 * Signed(Hash(seed_, 1)))}, 165.0},
      hamlet_{{kArea.x * 0.83, kArea.y * (0.40 + 0.03 * Signed(Hash(seed_, 2)))}, 85.0},
      parcels_(seed_ + kParcels, kArea.x, kArea.y, village_, hamlet_) {
  const auto grid = [](int step, const auto& function) {
    return CoarseGrid(kWidth, kHeight, step, function);
  };
  warpX_ = grid(8, [&](Vec p) { return 30.0 * Fractal(seed_ + kWarpX, p.x, p.y, 520.0, 3); });
  warpY_ = grid(8, [&](Vec p) { return 30.0 * Fractal(seed_ + kWarpY, p.x, p.y, 520.0, 3); });
  const Vec lake{kArea.x * (0.70 + 0.02 * Signed(Hash(seed_, 3))), kArea.y * 0.17};
  lake_ = grid(4, [&](Vec p) {
    const Vec q = p - lake;
    return Length({0.72 * q.x + 0.2 * q.y, 1.25 * q.y - 0.2 * q.x}) - 88.0 +
           34.0 * Fractal(seed_ + kShore, p.x, p.y, 150.0, 4);
  });
  LayRiver();
  RaiseRelief();
  BuildHouses();
  PlantTrees();
}

void Landscape::LayRiver() {
  constexpr double kStep = 6.0;
  constexpr double kMeander = 640.0;  // along the course
  std::vector<Vec> course;
  std::vector<double> turning;
  Vec p{-260.0, kArea.y * (0.68 + 0.03 * Signed(Hash(seed_ + kCourse, 0)))};
  Vec heading{1.0, 0.0};
  for (int i = 0; p.x < kArea.x + 260.0 && i < 4000; ++i) {
    // The heading swings to and fro, as a river's does; tan(angle / 2) turns it without sine and
    // cosine. The last term leads it back into its valley.
    const double along = kStep * i;
    const double swing = 0.62 + 0.34 * Smooth(seed_ + kCourse + 1, along / 700.0, 0.5);
    const double phase = along / kMeander + 0.75 * Smooth(seed_ + kCourse + 2, along / 950.0, 0.5);
    const double half =
        std::clamp(swing * Wave(phase) + 0.38 * Smooth(seed_ + kCourse + 3, along / 210.0, 0.5) -
                       0.0019 * (p.y - 0.69 * kArea.y),
                   -0.9, 0.9);
    const Vec next{(1.0 - half * half) / (1.0 + half * half), 2.0 * half / (1.0 + half * half)};
    turning.push_back(Dot(Across(heading), next));
    heading = next;
    course.push_back(p);
    p = p + kStep * heading;
  }

  struct Nearest {
    double distance;
    double bend;
  };
  // The vertices are so close that the nearest point lies on a leg of the nearest vertex.
  const auto nearest = [&](Vec q) {
    std::size_t vertex = 1;
    double best = std::numeric_limits<double>::max();
    for (std::size_t i = 1; i + 1 < course.size(); ++i) {
      const Vec away = q - course[i];
      const double square = Dot(away, away);
      if (square < best) {
        best = square;
        vertex = i;
      }
    }
    Nearest result{};
    for (const std::size_t i : {vertex, vertex + 1}) {
      const Vec leg = course[i] - course[i - 1];
      const Vec to = q - course[i - 1];
      const double t = std::clamp(Dot(to, leg) / (kStep * kStep), 0.0, 1.0);
      const Vec away = to - t * leg;
      if (i == vertex || Dot(away, away) < best) {
        best = Dot(away, away);
        const double side = Dot(Across(leg), to) < 0.0 ? -1.0 : 1.0;
        result = {side * std::sqrt(best), std::clamp(side * turning[i] * 13.0, -1.0, 1.0)};
      }
    }
    return result;
  };
  river_ = CoarseGrid(kWidth, kHeight, 4, [&](Vec q) { return nearest(q).distance; });
  bend_ = CoarseGrid(kWidth, kHeight, 8, [&](Vec q) { return nearest(q).bend; });
  bank_ = CoarseGrid(kWidth, kHeight, 4, [&](Vec q) {
    return 12.5 + 3.4 * Fractal(seed_ + kBank, q.x, q.y, 130.0, 4);
  });
}

void Landscape::RaiseRelief() {
  // The river has cut a valley with a flat floor, the lake lies in a hollow, and the hills grow
  // away from both.
  const CoarseGrid height(kWidth, kHeight, 4, [&](Vec p) {
    const double valley = SmoothStep(25.0, 340.0, std::abs(river_.At(p)));
    const double hollow = SmoothStep(0.0, 160.0, lake_.At(p));
    const double hills = 56.0 * Fractal(seed_ + kRelief, p.x, p.y, 700.0, 4);
    return (20.0 * valley + hills * (0.12 + 0.88 * valley)) * (0.25 + 0.75 * hollow);
  });
  light_ = CoarseGrid(kWidth, kHeight, 4, [&](Vec p) {
    constexpr double kReach = 4.0;
    const auto at = [&](double x, double y) { return height.At({x, y}); };
    const Vec rise{(at(p.x + kReach, p.y) - at(p.x - kReach, p.y)) / (2.0 * kReach),
                   (at(p.x, p.y + kReach) - at(p.x, p.y - kReach)) / (2.0 * kReach)};
    return std::clamp(1.0 - 0.75 * Dot(rise, kTowardsLight), 0.68, 1.28);
  });
  wood_ = CoarseGrid(kWidth, kHeight, 4, [&](Vec p) {
    return Fractal(seed_ + kWoods, p.x, p.y, 330.0, 5) + 0.010 * (height.At(p) - 14.0) - 0.42;
  });
}

void Landscape::BuildHouses() {
  constexpr int kSpacing = 7;
  for (const ParcelMap::Settlement& place : {village_, hamlet_}) {
    const double reach = place.radius + 45.0;
    for (double y = place.centre.y - reach; y < place.centre.y + reach; y += kSpacing) {
      for (double x = place.centre.x - reach; x < place.centre.x + reach; x += kSpacing) {
        const std::uint64_t bits = Hash(seed_ + kHouses, static_cast<std::int64_t>(std::floor(x)),
                                        static_cast<std::int64_t>(std::floor(y)));
        const Vec p{x + 2.0 * Signed(Hash(bits, 1)), y + 2.0 * Signed(Hash(bits, 2))};
        if (Length(p - place.centre) > reach * (0.82 + 0.18 * Unit(Hash(bits, 3)))) continue;
        const Site site = Survey(p);
        const double setback = site.Verge();
        const bool barn = setback > 27.0 && setback < 33.0 && Unit(Hash(bits, 4)) < 0.25;
        const bool home = setback > 9.0 && setback < 13.5 && Unit(Hash(bits, 4)) < 0.75;
        if ((!barn && !home) || site.Water() < 40.0 ||
            site.place.roadKind == ParcelMap::Border::kTrack) {
          continue;
        }
        const bool crowded = std::any_of(houses_.begin(), houses_.end(), [&](const House& other) {
          return Length(other.centre - p) <
                 other.halfLength + (barn ? 13.0 : 10.0) + 5.0 * Unit(Hash(bits, 5));
        });
        if (crowded) continue;
        const bool gableToStreet = Unit(Hash(bits, 6)) < 0.25;
        const Vec along = site.place.roadAlong;
        houses_.push_back({p, gableToStreet ? Across(along) : along,
                           (barn ? 8.5 : 5.2) + 2.2 * Unit(Hash(bits, 7)),
                           (barn ? 4.6 : 3.6) + 1.2 * Unit(Hash(bits, 8)), bits});
      }
    }
  }

  housesNear_.resize(static_cast<std::size_t>(kHouseColumns) * kHouseRows);
  for (const House& house : houses_) {
    for (int row = 0; row < kHouseRows; ++row) {
      for (int column = 0; column < kHouseColumns; ++column) {
        const Vec cell{(column + 0.5) * kHouseCell, (row + 0.5) * kHouseCell};
        if (Length(cell - house.centre) < kHouseReach + house.halfLength + kHouseCell) {
          housesNear_[static_cast<std::size_t>(row * kHouseColumns + column)].push_back(&house);
        }
      }
    }
  }
}

void Landscape::PlantTrees() {
  trees_.resize(static_cast<std::size_t>(kTreeColumns) * kTreeRows);
  processes::filters::parallel::ForEachRowBand(
      kTreeRows, kTreeRows, [&](std::ptrdiff_t, std::ptrdiff_t first, std::ptrdiff_t end) {
        for (std::ptrdiff_t row = first; row < end; ++row) {
          for (std::ptrdiff_t column = 0; column < kTreeColumns; ++column) {
            const std::uint64_t bits = Hash(seed_ + kTrees, column, row);
            const Vec p{kTreeCell * (static_cast<double>(column - kTreeMargin) + 0.5 +
                                     0.36 * Signed(Hash(bits, 1))),
                        kTreeCell * (static_cast<double>(row - kTreeMargin) + 0.5 +
                                     0.36 * Signed(Hash(bits, 2)))};
            const Site site = Survey(p);
            if (Unit(Hash(bits, 3)) >= TreeDensity(site)) continue;
            const double radius =
                2.2 + 2.3 * Unit(Hash(bits, 4)) * (0.6 + 0.4 * Unit(Hash(bits, 8)));
            trees_[static_cast<std::size_t>(row * kTreeColumns + column)] = {p, radius, bits};
          }
        }
      });
}

Landscape::Site Landscape::Survey(Vec p) const {
  Site site;
  site.p = p;
  site.warped = {p.x + warpX_.At(p), p.y + warpY_.At(p)};
  site.place = parcels_.Find(site.warped);
  site.bank = std::abs(river_.At(p)) - bank_.At(p);
  site.bend = bend_.At(p);
  site.shore = lake_.At(p);
  site.wood = wood_.At(p);
  site.house = HouseAt(p, &site.houseDistance);
  // Only the two roads have bridges; tracks end before the flood plain and the shore.
  if (site.place.roadHalfWidth > 0.0 && site.place.roadKind != ParcelMap::Border::kRoad &&
      site.Water() < 22.0) {
    site.place.road = std::numeric_limits<double>::max();
  }
  return site;
}

bool Landscape::IsWood(const Site& site) const {
  const bool open = site.bank < 40.0 || site.shore < 12.0;
  if (open || site.place.parcel->settled || site.house != nullptr) return false;
  const bool plantation = site.place.parcel->bits % 11 == 0 && site.place.edge > 5.0;
  return plantation || site.wood > 0.0;
}

double Landscape::TreeDensity(const Site& site) const {
  using Border = ParcelMap::Border;
  if (site.Verge() < 3.5 || site.Water() < 2.5) return 0.0;
  if (site.house != nullptr) {
    if (site.houseDistance < 4.0) return 0.0;
    if (site.houseDistance < 32.0) return 0.20;
  }
  if (IsWood(site)) return 0.96;
  const double patches = Smooth(seed_ + kTrees + 1, site.p.x / 70.0, site.p.y / 70.0);
  if (site.bank < 26.0) {
    const double bare = site.bend > 0.25 ? 13.0 : 3.0;  // gravel lies inside the bends
    return site.bank < bare ? 0.0 : 0.55 * SmoothStep(-0.35, 0.25, patches);
  }
  if (site.shore < 20.0) return 0.7 * SmoothStep(-0.2, 0.3, patches);
  if (site.place.border == Border::kHedge && site.place.edge < 3.6) {
    return 0.9 * SmoothStep(-0.5, -0.2, patches);
  }
  if (site.place.roadKind != Border::kStreet && site.Verge() < 9.0) {
    return 0.55 * SmoothStep(0.15, 0.4, patches);
  }
  return 0.0012;
}

Landscape::Crown Landscape::CrownAt(Vec p) const {
  const auto column = static_cast<std::ptrdiff_t>(std::floor(p.x / kTreeCell)) + kTreeMargin;
  const auto row = static_cast<std::ptrdiff_t>(std::floor(p.y / kTreeCell)) + kTreeMargin;
  Crown crown;
  for (std::ptrdiff_t y = row - 1; y <= row + 1; ++y) {
    for (std::ptrdiff_t x = column - 1; x <= column + 1; ++x) {
      const Tree& tree = trees_[static_cast<std::size_t>(y * kTreeColumns + x)];
      const Vec away = p - tree.centre;
      const double square = Dot(away, away) / (tree.radius * tree.radius);
      if (tree.radius <= 0.0 || square >= 1.0) continue;
      const double height = tree.radius * (0.6 + std::sqrt(1.0 - square));
      if (height > crown.height) crown = {&tree, height, (1.0 / tree.radius) * away};
    }
  }
  return crown;
}

const Landscape::House* Landscape::HouseAt(Vec p, double* distance) const {
  if (housesNear_.empty()) return nullptr;
  const auto column = static_cast<std::ptrdiff_t>(std::floor(p.x / kHouseCell));
  const auto row = static_cast<std::ptrdiff_t>(std::floor(p.y / kHouseCell));
  if (column < 0 || column >= kHouseColumns || row < 0 || row >= kHouseRows) return nullptr;
  const House* nearest = nullptr;
  *distance = kHouseReach;
  for (const House* house : housesNear_[static_cast<std::size_t>(row * kHouseColumns + column)]) {
    const Vec away = p - house->centre;
    const double a = std::abs(Dot(away, house->along)) - house->halfLength;
    const double b = std::abs(Dot(away, Across(house->along))) - house->halfWidth;
    const double outside = a > 0.0 && b > 0.0 ? Length({a, b}) : std::max(a, b);
    if (outside < *distance) {
      *distance = outside;
      nearest = house;
    }
  }
  return nearest;
}

Color Landscape::PaintField(const Site& site) const {
  const ParcelMap::Parcel& parcel = *site.place.parcel;
  // Land that floods is grazed or mown, and nobody ploughs up to the bank.
  const bool low = std::abs(river_.At(parcel.centre)) < 95.0 || site.place.parcel->settled;
  const bool brink =
      site.Water() < 17.0 + 8.0 * Smooth(seed_ + kSoil + 20, site.p.x / 50.0, site.p.y / 50.0);
  const std::uint64_t choice = parcel.bits >> 8;
  const Crop& crop = brink ? kPasture
                     : low ? kCrops[kMeadows + choice % 3]
                           : kCrops[choice % std::size(kCrops)];

  // Rows run along the field; on the headlands, where the machines turn, along the edge.
  const bool headland = site.place.edge < 13.0 &&
                        std::abs(Dot(site.place.edgeAlong, parcel.along)) < 0.8 &&
                        crop.tramlines > 0.0;
  const Vec along = headland ? site.place.edgeAlong : parcel.along;
  const double u =
      headland ? site.place.edge : Dot(site.warped - parcel.centre, Across(parcel.along));
  const double v = Dot(site.warped, along);

  const double soil = Fractal(seed_ + kSoil, site.p.x, site.p.y, 130.0, 4);
  const double plants = Fractal(seed_ + kPlants, site.p.x, site.p.y, 17.0, 3);
  const double streaks = Smooth(seed_ + kPlants + 10, u / 2.3, v / 22.0);
  double rows = crop.rowDepth * Wave(u / crop.rowPeriod);
  if (crop.orchard > 0.0) rows *= 0.5 + 0.9 * Wave(v / 6.7);
  const double lane = u / 21.0;
  const double fromLane = 21.0 * std::abs(lane - std::floor(lane) - 0.5);
  const double wheels = 1.0 - SmoothStep(0.5, 1.3, std::abs(fromLane - 1.7));

  const double own = 0.07 * Signed(Hash(parcel.bits, 1));
  const double value = 1.0 + own + crop.mottle * (soil + 0.45 * plants) + 0.035 * streaks + rows -
                       crop.tramlines * wheels;
  Color color = Scaled(crop.color, value);
  // Moist places are greener, dry ones redder; no two fields have quite the same hue.
  const double hue = 0.5 * crop.mottle * soil + 0.02 * Signed(Hash(parcel.bits, 2));
  color[0] *= 1.0 + hue;
  color[2] *= 1.0 + 0.6 * hue + 0.02 * Signed(Hash(parcel.bits, 3));
  return color;
}

void Landscape::PaintBorders(const Site& site, Color& color) const {
  const bool wood = IsWood(site);
  if (site.place.edge > 7.0 && !wood) return;
  const double rough = Fractal(seed_ + kPlants + 30, site.p.x, site.p.y, 9.0, 3);
  const double width = site.place.border == ParcelMap::Border::kHedge ? 3.0 : 1.4;
  const double strip = 1.0 - SmoothStep(width - 0.7, width + 1.1, site.place.edge + 0.8 * rough);
  color = Blend(color, Scaled({98, 108, 66}, 1.0 + 0.12 * rough), 0.85 * strip);
  if (wood) color = Scaled({52, 58, 40}, 1.0 + 0.2 * rough);
}

void Landscape::PaintGardens(const Site& site, Color& color) const {
  if (site.house == nullptr) return;
  const std::uint64_t bits = site.house->bits;
  const double rough = Fractal(seed_ + kPlants + 40, site.p.x, site.p.y, 8.0, 3);
  const double share = 1.0 - SmoothStep(20.0, 30.0, site.houseDistance + 4.0 * rough);
  const Color lawn = Blend({94, 116, 66}, {122, 128, 88}, Unit(Hash(bits, 20)));
  color = Blend(color, Scaled(lawn, 1.0 + 0.10 * rough), share);
  const double yard = 1.0 - SmoothStep(1.5, 6.0, site.houseDistance + 2.5 * rough);
  const Color ground = Blend({138, 130, 118}, {112, 118, 84}, Unit(Hash(bits, 21)));
  color = Blend(color, Scaled(ground, 1.0 + 0.07 * rough), 0.8 * yard);
}

void Landscape::PaintRoads(const Site& site, Color& color) const {
  const double verge = site.Verge();
  if (verge > 6.0) return;
  const double rough = Fractal(seed_ + kPaving, site.p.x, site.p.y, 6.0, 3);
  const double cover = 1.0 - SmoothStep(-0.6, 0.6, verge);
  if (site.place.roadKind == ParcelMap::Border::kTrack) {
    const double wheels = 1.0 - SmoothStep(0.4, 1.1, std::abs(site.place.road - 1.1));
    const Color earth = Scaled({152, 137, 111}, 1.0 + 0.10 * rough);
    const Color grass = Scaled({108, 116, 74}, 1.0 + 0.10 * rough);
    color = Blend(color, Blend(grass, earth, std::max(0.35, wheels)), cover);
    return;
  }
  const double grass = 1.0 - SmoothStep(2.0, 4.5, verge + rough);
  color = Blend(color, Scaled({104, 116, 70}, 1.0 + 0.12 * rough), grass);
  const Color tar =
      site.place.roadKind == ParcelMap::Border::kRoad ? Color{122, 121, 121} : Color{134, 131, 126};
  const double worn = 0.05 * (1.0 - SmoothStep(0.3, 1.2, std::abs(site.place.road - 1.7)));
  color = Blend(color, Scaled(tar, 1.0 + 0.045 * rough - worn), cover);
  if (site.place.roadKind != ParcelMap::Border::kRoad) return;
  const double edge = 1.0 - SmoothStep(0.2, 0.8, std::abs(verge + 0.8));
  const double dash = SmoothStep(-0.2, 0.2, Wave(Dot(site.warped, site.place.roadAlong) / 18.0));
  const double middle = dash * (1.0 - SmoothStep(0.1, 0.7, site.place.road));
  color = Blend(color, {176, 176, 172}, 0.45 * std::max(edge, middle));
}

void Landscape::PaintWater(const Site& site, Color& color) const {
  if (site.Water() > 20.0) return;
  const bool river = site.bank < site.shore;
  const double rough = Fractal(seed_ + kBank + 10, site.p.x, site.p.y, 11.0, 4);
  const double ripples = Fractal(seed_ + kRipples, site.p.x, 1.7 * site.p.y, 5.0, 2);
  const double swell = Fractal(seed_ + kRipples + 10, site.p.x, site.p.y, 70.0, 4);
  const double bars = 0.55 + 0.8 * Smooth(seed_ + kBank + 20, site.p.x / 75.0, site.p.y / 75.0);
  const double inside = river ? std::max(0.0, site.bend) * std::clamp(bars, 0.0, 1.0) : 0.0;
  const double outside = river ? std::max(0.0, -site.bend) : 0.0;

  const double beach = (river ? 1.2 : 0.8) + 10.0 * inside;
  const double dry = 1.0 - SmoothStep(beach - 1.0, beach + 1.5, site.Water() + 1.8 * rough);
  const Color gravel = river ? Color{164, 153, 130} : Color{112, 112, 78};
  color = Blend(color, Scaled(gravel, 1.0 + 0.11 * rough), dry);
  const double cut = outside * (1.0 - SmoothStep(1.0, 4.5, site.Water() + rough));
  color = Blend(color, Scaled({92, 82, 64}, 1.0 + 0.15 * rough), 0.8 * cut);

  // Deep water is dark; the bed shows through near the bank, furthest inside the bends.
  const double wet = 1.0 - SmoothStep(-0.8, 0.6, site.Water() + 0.7 * rough);
  const double depth = SmoothStep(0.0, 5.0 + 9.0 * inside + (river ? 0.0 : 9.0), -site.Water());
  const Color deep = river ? Color{66, 82, 72} : Color{52, 70, 74};
  const Color bed = river ? Color{116, 114, 88} : Color{88, 100, 80};
  const Color water = Blend(bed, deep, depth);
  color = Blend(color, Scaled(water, 1.0 + 0.045 * ripples + 0.05 * swell), wet);
}

void Landscape::PaintHouse(const Site& site, Color& color) const {
  static constexpr Color kRoofs[] = {{158, 98, 74},   {146, 88, 68},   {168, 112, 86},
                                     {134, 84, 70},   {112, 106, 104}, {96, 92, 94},
                                     {128, 112, 100}, {150, 140, 132}};
  if (site.house == nullptr || site.houseDistance > 1.0) return;
  const House& house = *site.house;
  const double across = Dot(site.p - house.centre, Across(house.along));
  const double side = SmoothStep(-0.5, 0.5, across) * 2.0 - 1.0;
  const double lit = side * Dot(Across(house.along), kTowardsLight);
  const double tiles = Wave(across / 1.9);
  const double rough = Fractal(seed_ + kPaving + 20, site.p.x, site.p.y, 4.0, 2);
  const double ridge = 1.0 - SmoothStep(0.2, 0.9, std::abs(across));
  const double value = 1.0 + 0.24 * lit + 0.03 * tiles + 0.05 * rough + 0.10 * ridge +
                       0.08 * Signed(Hash(house.bits, 31));
  const Color& roof = kRoofs[Hash(house.bits, 30) % std::size(kRoofs)];
  color = Blend(color, Scaled(roof, value), 1.0 - SmoothStep(-0.5, 0.5, site.houseDistance));
}

void Landscape::PaintCrown(const Site& site, const Crown& crown, Color& color) const {
  if (crown.tree == nullptr) return;
  const Vec p = site.p;
  const std::uint64_t bits = crown.tree->bits;
  const double stand = Smooth(seed_ + kTrees + 2, p.x / 120.0, p.y / 120.0);
  const bool conifer = stand + 0.25 * Signed(Hash(bits, 5)) > 0.18;
  const Color leaves = conifer ? Color{54, 72, 50} : Color{82, 100, 56};
  const double tone = 0.14 * Signed(Hash(bits, 6));
  const double twigs = Fractal(seed_ + kPlants + 50, p.x, p.y, 3.2, 2);
  const double lit = Dot(crown.slope, kTowardsLight);
  color = Scaled(leaves, 1.0 + tone + 0.25 * lit + 0.17 * twigs);
  color[0] *= 1.0 + 0.08 * Signed(Hash(bits, 7));
}

// What stands closer to the light throws its shadow here, unless something as high is here.
double Landscape::ShadowAt(Vec p, const Crown& crown) const {
  double shadow = 0.0;
  for (const double reach : {2.6, 5.2}) {
    const Vec q = p + reach * kTowardsLight;
    if (CrownAt(q).height > reach + crown.height) shadow = std::max(shadow, 0.42);
    double distance = 0.0;
    if (HouseAt(q, &distance) != nullptr) {
      shadow = std::max(shadow, 0.45 * (1.0 - SmoothStep(-0.6, 0.6, distance)));
    }
  }
  return shadow;
}

Color Landscape::At(int column, int row) const {
  const Vec p{column + 0.5, row + 0.5};
  const Site site = Survey(p);

  Color color = PaintField(site);
  PaintBorders(site, color);
  PaintGardens(site, color);
  PaintWater(site, color);
  PaintRoads(site, color);  // last: the roads have bridges

  const Crown crown = CrownAt(p);
  PaintCrown(site, crown, color);
  PaintHouse(site, color);

  // Water mirrors the sky, so the slope of the land does not darken it.
  const double wet = 1.0 - SmoothStep(-1.0, 1.0, site.Water());
  const double light = Lerp(light_.At(p), 1.0, wet) * (1.0 - ShadowAt(p, crown));
  const std::uint64_t bits = Hash(seed_ + kGrain, column, row);
  const double grain = 4.2 * (static_cast<double>(bits & 0xFFFF) * 0x1p-15 - 1.0);
  // The air between takes some of the colour and the depth.
  const double gray = 0.3 * color[0] + 0.6 * color[1] + 0.1 * color[2];
  constexpr double kHaze = 11.0;
  for (std::size_t channel = 0; channel < color.size(); ++channel) {
    const auto own = static_cast<double>(bits >> (16 + 16 * channel) & 0xFFFF) * 0x1p-15 - 1.0;
    const double clear = Lerp(gray, color[channel], 0.92) * light;
    const double shoulder = std::min(clear, 135.0 + 0.55 * (clear - 135.0));
    color[channel] = std::clamp(kHaze + shoulder + grain + 1.2 * own, kDarkest, kBrightest);
  }
  return color;
}

}  // namespace zarn::app
