// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

#include "apps/zarn/estimate/cellmeans.h"
#include "apps/zarn/estimate/robust.h"

namespace zarn::app {

struct GainOffset {
  double gain = 1;
  double offset = 0;

  double operator()(double value) const { return gain * value + offset; }
};

/// What two scenes have in common.
struct SceneOverlap {
  std::size_t first;
  std::size_t second;
  std::vector<Moments> moments;  ///< per channel; x is the first scene, y the second
};

/// The moments of two scenes over their common cells without the outliers: cells whose standardised
/// values differ too much in one of the channels are weighed down in all of them (Tukey's biweight,
/// reweighted until it settles), because a cloud or a change is there in every channel.
std::vector<Moments> RobustMoments(const std::vector<CellPair>& cells, std::size_t channels);

/// What holds the gains of a network of scenes where their overlaps leave them open.
struct GainLimits {
  double damping = 0.1;  ///< weight with which every gain is held at 1
  double contrast = 0;   ///< 0 .. 1: how much of the contrast that regression loses is given back
};

/// Logarithm of the gain, not yet damped, of the second scene onto the first; the two must be
/// positively correlated.
double LogGainOntoFirst(const Moments& m, const GainLimits& limits);

/// Gains and offsets, [scene][channel], that bring all scenes onto scene 0, which stays as it is.
///
/// An overlap of two scenes that are both to be corrected asks for equal means and equal
/// deviations: a regression of one on the other would take the noise of both for a lack of
/// contrast. An overlap with scene 0 asks for the gain of least squares, which is smaller by the
/// correlation r; cell means keep r close to what the scenes really share, as noise and small
/// shifts have averaged out. In the logarithms of the gains all these demands are linear, so all
/// overlaps together are one least-squares system. An overlap weighs as its number of cells (1 for
/// the mean overlap) times r^2 / (1 - r^2), the ratio of signal to noise that goes with r: nothing
/// where the scenes are not correlated. The offsets then follow from the means.
std::vector<std::vector<GainOffset>> SolveGainOffsets(std::size_t scenes,
                                                      const std::vector<SceneOverlap>& overlaps,
                                                      std::size_t channels,
                                                      const GainLimits& limits);

/// Which scenes are tied to scene 0 through overlaps.
std::vector<bool> TiedScenes(std::size_t scenes, const std::vector<SceneOverlap>& overlaps);

}  // namespace zarn::app
