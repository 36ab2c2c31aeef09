// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/mosaic/mosaicplan.h"
#include "apps/zarn/mosaic/seams.h"
#include "apps/zarn/mosaic/sourcetally.h"
#include "apps/zarn/mosaic/survey.h"

namespace zarn::app {

using Rgb = std::array<std::uint8_t, 3>;

/// A raster seen through a picture's pixels: its first three channels, or the first one.
struct Sampling {
  int width = 0;
  int height = 0;
  std::size_t channels = 0;
  std::vector<float> values;        ///< [row][column][channel]
  std::vector<std::uint8_t> valid;  ///< [row][column]; 0: no data
};

/// The scenes of a survey pasted whole, one over the other.
Sampling SamplePaste(const Survey& survey, const PictureGrid& grid);

/// A mosaic that was written; `sources` tells where it has data. Throws `RunError`.
Sampling SampleMosaic(const std::string& file, const SourceTally& sources);

/// Which values of a channel become black and white.
using Stretch = std::vector<std::pair<double, double>>;

/// All but the 2 % lowest and highest valid values of each channel.
Stretch StretchFor(const Sampling& sampling);

/// An opaque picture with holes.
struct Picture {
  int width = 0;
  int height = 0;
  std::vector<std::uint8_t> rgba;  ///< [row][column][4]; alpha is 0 or 255
};

Picture Render(const Sampling& sampling, const Stretch& stretch);

/// A colour for each of `count` scenes, no two the same, and those of scenes with a common seam
/// easily told apart.
std::vector<Rgb> SceneColours(std::size_t count, const std::vector<SeamResidual>& seams);

/// The pixels of the mosaic in the colours of the scenes that they come from.
Picture RenderSources(const SourceTally& sources, const std::vector<Rgb>& colours);

/// The cutlines of a plan in pixels of the picture, as the data of an SVG path, where there are
/// pixels of scenes on both sides.
std::string SeamPath(const MosaicPlan& plan, const SourceTally& sources);

enum class PictureKind { kPhotograph, kDrawing };

/// A picture as a data: URI: as PNG, which holds drawings of any size, but photographs of many
/// pixels in a format with losses.
std::string DataUri(const Picture& picture, PictureKind kind);

}  // namespace zarn::app
