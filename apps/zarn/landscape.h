// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "apps/zarn/parcelmap.h"

namespace zarn::app {

/// Red, green and blue in the units of an 8-bit picture, not rounded.
using Color = std::array<double, 3>;

/// A smooth function sampled every few pixels and interpolated between.
class CoarseGrid {
 public:
  CoarseGrid() = default;

  /// Samples `function(Vec)` over a width x height area and some way beyond, rows in parallel.
  template <typename Function>
  CoarseGrid(int width, int height, int step, const Function& function);

  /// Beyond `kMargin` around the area the value at its nearest place.
  double At(Vec p) const;

  static constexpr int kMargin = 32;

 private:
  int step_ = 1;
  int columns_ = 0;
  int rows_ = 0;
  std::vector<double> values_;
};

/// Farmland as it looks from the air, one colour per metre: fields along a network of roads and
/// tracks, woods on the hills, a meandering river with its flood plain, a lake, a village and a
/// hamlet, all lit from the upper left. A pure function of the seed and the pixel, the same on
/// every machine. No two neighbouring pixels are alike by construction: every surface carries
/// texture from hundreds of pixels down to single ones.
class Landscape {
 public:
  static constexpr int kWidth = 2352;
  static constexpr int kHeight = 1240;

  /// Bounds of every colour, in each channel.
  static constexpr double kDarkest = 12.0;
  static constexpr double kBrightest = 200.0;

  explicit Landscape(std::uint64_t seed);
  Landscape(const Landscape&) = delete;
  Landscape& operator=(const Landscape&) = delete;

  /// The colour of a pixel, 0 <= column < kWidth, 0 <= row < kHeight. Safe to call from any number
  /// of threads.
  Color At(int column, int row) const;

 private:
  struct Site;

  struct House {
    Vec centre;
    Vec along;
    double halfLength = 0.0;
    double halfWidth = 0.0;
    std::uint64_t bits = 0;
  };

  struct Tree {
    Vec centre;
    double radius = 0.0;  // 0: no tree in this cell
    std::uint64_t bits = 0;
  };

  struct Crown {
    const Tree* tree = nullptr;
    double height = 0.0;
    Vec slope;
  };

  void LayRiver();
  void RaiseRelief();
  void BuildHouses();
  void PlantTrees();

  Site Survey(Vec p) const;
  bool IsWood(const Site& site) const;
  double TreeDensity(const Site& site) const;
  Crown CrownAt(Vec p) const;
  /// The house nearest to `p` and its distance, negative inside; null where none is close.
  const House* HouseAt(Vec p, double* distance) const;

  Color PaintField(const Site& site) const;
  void PaintBorders(const Site& site, Color& color) const;
  void PaintGardens(const Site& site, Color& color) const;
  void PaintRoads(const Site& site, Color& color) const;
  void PaintWater(const Site& site, Color& color) const;
  void PaintCrown(const Site& site, const Crown& crown, Color& color) const;
  void PaintHouse(const Site& site, Color& color) const;
  double ShadowAt(Vec p, const Crown& crown) const;

  std::uint64_t seed_;
  ParcelMap::Settlement village_;
  ParcelMap::Settlement hamlet_;
  ParcelMap parcels_;
  CoarseGrid warpX_;
  CoarseGrid warpY_;
  CoarseGrid river_;  // distance from the centre line, positive to its right
  CoarseGrid bend_;   // 1 inside a sharp bend, -1 outside
  CoarseGrid bank_;   // half width of the river
  CoarseGrid lake_;   // distance from the shore, negative in the water
  CoarseGrid wood_;   // positive: wood
  CoarseGrid light_;
  std::vector<House> houses_;
  std::vector<std::vector<const House*>> housesNear_;
  std::vector<Tree> trees_;
};

}  // namespace zarn::app
