// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/scene.h"

#include <algorithm>
#include <cmath>

#include "apps/zarn/noise.h"
#include "host/gobs/saturatecast.h"
#include "processes/filters/framework/parallel.h"

namespace zarn::app {
namespace {

using noise::Fractal;
using noise::Hash;
using noise::Signed;
using noise::Unit;

constexpr std::size_t kChannels = 3;

// At most one outlier lies in a cell, and never on its rim, so that none touches another.
constexpr std::int64_t kSpeckCell = 16;
constexpr double kSpeckShare = 0.3;  // of the cells

// Four uniform numbers of 16 bits: a bell close to the normal one, with finite tails, whose
// variance is 4 / 12.
constexpr double kBellDeviation = 0.57735026918962576;
constexpr double kBellReach = 2.0;

double Bell(std::uint64_t bits) {
  const std::uint64_t sum =
      (bits & 0xFFFF) + (bits >> 16 & 0xFFFF) + (bits >> 32 & 0xFFFF) + (bits >> 48);
  return static_cast<double>(sum) * 0x1p-16 - kBellReach;
}

Vec CentreOf(std::int64_t column, std::int64_t row) {
  return {static_cast<double>(column) + 0.5, static_cast<double>(row) + 0.5};
}

// 0 is kept for no-data.
template <typename T>
T Digitize(double value, double highest) {
  return gobs::SaturateCast<T>(std::clamp(std::floor(value + 0.5), 1.0, highest));
}

// Fills both sample types from `colorAt(column, row, color)`; false leaves no-data.
template <typename ColorAt>
Picture Paint(const Window& window, const ColorAt& colorAt) {
  Picture picture{window, {}, {}};
  const auto count = static_cast<std::size_t>(window.width * window.height) * kChannels;
  picture.bytes.resize(count);
  picture.words.resize(count);
  processes::filters::parallel::ForEachRowBand(
      window.height, window.height, [&](std::ptrdiff_t, std::ptrdiff_t first, std::ptrdiff_t end) {
        for (std::ptrdiff_t row = first; row < end; ++row) {
          for (std::int64_t column = 0; column < window.width; ++column) {
            Color color;
            if (!colorAt(window.x + column, window.y + row, color)) continue;
            const auto sample = static_cast<std::size_t>(row * window.width + column) * kChannels;
            for (std::size_t channel = 0; channel < kChannels; ++channel) {
              picture.bytes[sample + channel] = Digitize<std::uint8_t>(color[channel], 255.0);
              picture.words[sample + channel] =
                  Digitize<std::uint16_t>(kWordScale * color[channel], 4095.0);
            }
          }
        }
      });
  return picture;
}

}  // namespace

double HotSpot::ShareAt(Vec p) const {
  const double x = (p.x - centre.x) / radii.x;
  const double y = (p.y - centre.y) / radii.y;
  return 1.0 - (x * x + y * y);
}

Color Radiometry::Disturb(const Color& land, Vec p) const {
  const double share = hotSpot.ShareAt(p);
  Color color;
  for (std::size_t channel = 0; channel < kChannels; ++channel) {
    color[channel] =
        gain[channel] * land[channel] + offset[channel] + hotSpot.strength[channel] * share;
  }
  return color;
}

// The turn is given by the tangent of half its angle, which needs no trigonometry.
Scene::Scene(std::uint64_t seed, const Window& extent, const zarn::app::Radiometry& radiometry,
             double halfTurn, Vec margin)
    : seed_(noise::Scramble(seed)),
      extent_(extent),
      radiometry_(radiometry),
      along_{(1.0 - halfTurn * halfTurn) / (1.0 + halfTurn * halfTurn),
             2.0 * halfTurn / (1.0 + halfTurn * halfTurn)},
      half_{0.5 * static_cast<double>(extent.width) - margin.x,
            0.5 * static_cast<double>(extent.height) - margin.y} {}

// How far the frame's edge lies inside the straight one: the relief bends it, and the rectification
// leaves it ragged.
double Scene::EdgeBulge(std::uint64_t edge, double along) const {
  const std::uint64_t seed = Hash(seed_, 1, static_cast<std::int64_t>(edge));
  const double side = 10.0 * static_cast<double>(edge) + 0.5;
  const auto notch = static_cast<std::int64_t>(std::floor(along / 5.0));
  return 9.0 * Fractal(seed, along, side, 330.0, 2) +
         3.0 * Fractal(seed + 9, along, side, 30.0, 3) + 2.5 * Signed(Hash(seed + 20, notch));
}

bool Scene::IsValid(std::int64_t column, std::int64_t row) const {
  const bool inRaster = column >= extent_.x && column < extent_.x + extent_.width &&
                        row >= extent_.y && row < extent_.y + extent_.height;
  if (!inRaster) return false;
  const Vec centre{static_cast<double>(extent_.x) + 0.5 * static_cast<double>(extent_.width),
                   static_cast<double>(extent_.y) + 0.5 * static_cast<double>(extent_.height)};
  const Vec from = CentreOf(column, row) - centre;
  const double u = Dot(from, along_);
  const double v = Dot(from, Across(along_));

  // Far from the edges their shape does not matter.
  constexpr double kLargestBulge = 45.0;
  const auto within = [&](std::uint64_t edge, double inside, double along) {
    return inside > kLargestBulge || (inside > -kLargestBulge && inside > EdgeBulge(edge, along));
  };
  return within(0, half_.x - u, v) && within(1, half_.x + u, v) && within(2, half_.y - v, u) &&
         within(3, half_.y + v, u);
}

bool Scene::IsSpeck(std::int64_t column, std::int64_t row) const {
  const std::int64_t cellX = column / kSpeckCell;
  const std::int64_t cellY = row / kSpeckCell;
  const std::uint64_t bits = Hash(seed_ + 1000, cellX, cellY);
  const auto inner = static_cast<std::uint64_t>(kSpeckCell - 2);
  return Unit(bits) < kSpeckShare &&
         column % kSpeckCell == 1 + static_cast<std::int64_t>((bits & 0xFFFF) % inner) &&
         row % kSpeckCell == 1 + static_cast<std::int64_t>((bits >> 16 & 0xFFFF) % inner);
}

Color Scene::Observe(const Color& land, std::int64_t column, std::int64_t row) const {
  Color color = radiometry_.Disturb(land, CentreOf(column, row));
  if (IsSpeck(column, row)) {
    // Bright or dark at random, but always far from what is around.
    const std::uint64_t bits = Hash(seed_ + 2000, column, row);
    const bool bright = color[1] < 75.0 || (color[1] < 160.0 && (bits & 1) != 0);
    for (std::size_t channel = 0; channel < kChannels; ++channel) {
      const double own = Unit(Hash(bits, static_cast<std::int64_t>(channel)));
      color[channel] = bright ? 226.0 + 24.0 * own : 2.0 + 12.0 * own;
    }
    return color;
  }
  for (std::size_t channel = 0; channel < kChannels; ++channel) {
    const std::uint64_t bits = Hash(seed_ + 3000 + channel, column, row);
    color[channel] += radiometry_.noise / kBellDeviation * Bell(bits);
  }
  return color;
}

double Scene::LargestNoise() const { return radiometry_.noise / kBellDeviation * kBellReach; }

std::array<Scene, 2> MakeScenes(std::uint64_t seed) {
  // The hot spots reach to the frames' corners.
  // A hazy morning, and a clear day with a warmer sensor.
  const Window left{0, 0, 1500, 1240};
  const Window right{852, 40, 1500, 1160};
  const Radiometry hazy{{0.84375, 0.875, 0.875},
                        {10.0, 12.0, 24.0},
                        {{430.0, 390.0}, {1500.0, 1250.0}, {56.0, 54.0, 46.0}},
                        1.25};
  const Radiometry clear{{1.15625, 1.09375, 0.96875},
                         {-2.0, -3.0, -6.0},
                         {{1960.0, 800.0}, {1560.0, 1080.0}, {36.0, 34.0, 26.0}},
                         1.5};
  return {Scene(Hash(seed, 1), left, hazy, 0.021, {42.0, 48.0}),
          Scene(Hash(seed, 2), right, clear, -0.018, {42.0, 60.0})};
}

std::vector<Vec> MakeCutline(std::uint64_t seed, const std::array<Scene, 2>& scenes,
                             std::size_t* seamLength) {
  constexpr double kOutside = 10.0;
  constexpr double kStep = 40.0;
  constexpr double kSwing = 110.0;
  const Window& below = scenes[0].Extent();
  const Window& pasted = scenes[1].Extent();
  const double middle = 0.5 * static_cast<double>(below.x + below.width + pasted.x);
  const double top = static_cast<double>(pasted.y) - kOutside;
  const double bottom = static_cast<double>(pasted.y + pasted.height) + kOutside;
  const double right = static_cast<double>(pasted.x + pasted.width) + kOutside;

  std::vector<Vec> ring;
  const int steps = static_cast<int>((bottom - top) / kStep);
  for (int i = 0; i <= steps; ++i) {
    const double y = noise::Lerp(top, bottom, static_cast<double>(i) / steps);
    const double swing = Fractal(Hash(seed, 3), y, 0.5 * kStep, 300.0, 3);
    ring.push_back({middle + kSwing * std::clamp(swing, -1.5, 1.5), y});
  }
  if (seamLength != nullptr) *seamLength = ring.size();
  ring.push_back({right, bottom});
  ring.push_back({right, top});
  ring.push_back(ring.front());
  return ring;
}

Land RenderLand(const Landscape& landscape, const Window& window) {
  Land land{window, {}};
  land.colors.resize(static_cast<std::size_t>(window.width * window.height));
  processes::filters::parallel::ForEachRowBand(
      window.height, window.height, [&](std::ptrdiff_t, std::ptrdiff_t first, std::ptrdiff_t end) {
        for (std::ptrdiff_t row = first; row < end; ++row) {
          for (std::int64_t column = 0; column < window.width; ++column) {
            land.colors[static_cast<std::size_t>(row * window.width + column)] =
                landscape.At(static_cast<int>(window.x + column), static_cast<int>(window.y + row));
          }
        }
      });
  return land;
}

Picture RenderTruth(const Land& land) {
  return Paint(land.window, [&](std::int64_t column, std::int64_t row, Color& color) {
    color = land.At(column, row);
    return true;
  });
}

Picture RenderScene(const Scene& scene, const Land& land, const Window& window) {
  return Paint(window, [&](std::int64_t column, std::int64_t row, Color& color) {
    if (!scene.IsValid(column, row)) return false;
    color = scene.Observe(land.At(column, row), column, row);
    return true;
  });
}

}  // namespace zarn::app
