// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstdint>
#include <vector>

#include "apps/zarn/landscape.h"
#include "apps/zarn/windows.h"

namespace zarn::app {

/// Positions are pixels of the landscape: (0, 0) is its upper left corner, (0.5, 0.5) the centre of
/// its first pixel. Brightness is in the units of the 8-bit pictures.

/// How much finer the 16-bit pictures are: their values go up to 4095, as from a 12-bit sensor.
inline constexpr double kWordScale = 16.0;

/// A broad bright bulge: the land seen with the sun behind the camera.
struct HotSpot {
  Vec centre;
  Vec radii;
  Color strength;  ///< what it adds at its centre, per channel

  /// The share of `strength` at `p`: 1 - r^2, where r is 0 in the centre and 1 on the ellipse.
  double ShareAt(Vec p) const;
};

/// What a sensor makes of the land: gain * land + offset + hot spot + noise.
struct Radiometry {
  Color gain;
  Color offset;
  HotSpot hotSpot;
  double noise;  ///< standard deviation

  /// `land` at `p` without the noise.
  Color Disturb(const Color& land, Vec p) const;
};

/// One disturbed view of part of the landscape: an aerial frame, turned against the pixel grid and
/// with ragged edges, lying in a larger raster.
class Scene {
 public:
  Scene(std::uint64_t seed, const Window& extent, const Radiometry& radiometry, double halfTurn,
        Vec margin);

  /// The raster that holds the frame.
  const Window& Extent() const { return extent_; }
  const zarn::app::Radiometry& Radiometry() const { return radiometry_; }

  /// Whether the frame covers the pixel.
  bool IsValid(std::int64_t column, std::int64_t row) const;
  /// Whether the pixel is an outlier, bright or dark, that tells nothing of the land. No two
  /// outliers touch.
  bool IsSpeck(std::int64_t column, std::int64_t row) const;
  /// What the sensor records, not yet rounded, at a valid pixel where the land has the given
  /// colour.
  Color Observe(const Color& land, std::int64_t column, std::int64_t row) const;

  /// No noise is further from the undisturbed value than this.
  double LargestNoise() const;

 private:
  double EdgeBulge(std::uint64_t edge, double along) const;

  std::uint64_t seed_;
  Window extent_;
  zarn::app::Radiometry radiometry_;
  Vec along_;
  Vec half_;
};

/// The two scenes of the sample, side by side with a common part.
std::array<Scene, 2> MakeScenes(std::uint64_t seed);

/// The ring, closed, through which the second scene is to be pasted onto the first. It runs down
/// the common part, well inside both frames, and on the other sides outside the second scene's
/// raster. The first `seamLength` vertices are those of the seam, from top to bottom.
std::vector<Vec> MakeCutline(std::uint64_t seed, const std::array<Scene, 2>& scenes,
                             std::size_t* seamLength = nullptr);

/// The colours of a window of the landscape, row by row.
struct Land {
  Window window;
  std::vector<Color> colors;

  const Color& At(std::int64_t column, std::int64_t row) const {
    return colors[static_cast<std::size_t>((row - window.y) * window.width + column - window.x)];
  }
};

/// A window in both sample types, pixel-interleaved. 0 in all channels is no-data; in a valid pixel
/// no channel is 0.
struct Picture {
  Window window;
  std::vector<std::uint8_t> bytes;
  std::vector<std::uint16_t> words;
};

/// The rows are shared out among the threads; the result depends on neither their number nor the
/// window.
Land RenderLand(const Landscape& landscape, const Window& window);
/// What an undisturbed sensor would record.
Picture RenderTruth(const Land& land);
/// The scene within a window of its extent that `land` covers.
Picture RenderScene(const Scene& scene, const Land& land, const Window& window);

}  // namespace zarn::app
