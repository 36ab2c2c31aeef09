// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <vector>

#include "apps/zarn/mosaic/mosaicplan.h"
#include "apps/zarn/mosaic/seams.h"
#include "apps/zarn/mosaic/survey.h"

namespace zarn::app {

enum class BalanceKind { kNone, kGainOffset, kDodging };

/// Finds the corrections that make scenes agree where they overlap, and sets them in `scenes`.
///
/// `survey` holds the scenes in the same order. The scene `anchor` of the survey, which may be one
/// beyond `scenes` (a reference image), stays as it is. With `kGainOffset` all overlaps together
/// give each scene a gain and an offset. `kDodging` gives each scene surfaces: onto the anchor if
/// that is a reference image, gains and offsets; else offsets on top of its gain and offset, which
/// bring it, place by place, onto the mean of all scenes that have data there, so that no scene's
/// errors run on into the others. Throws `RunError` when overlaps do not tie all scenes together.
void Balance(BalanceKind kind, const Survey& survey, std::size_t anchor, bool holdsAnchor,
             std::vector<ScenePlan>& scenes);

/// A surveyed scene as it is after its correction, or before any where `scene` is null.
SceneView ViewOf(const Survey& survey, std::size_t index, const ScenePlan* scene);

}  // namespace zarn::app
