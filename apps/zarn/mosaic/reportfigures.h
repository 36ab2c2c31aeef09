// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "apps/zarn/mosaic/planner.h"
#include "apps/zarn/mosaic/seams.h"

namespace zarn::app {

/// The values of a scene in a band, where another scene has data too.
struct CommonValues {
  std::int64_t count = 0;
  double mean = 0;
  double deviation = 0;   ///< the standard one
  double othersMean = 0;  ///< of the means, at each place, of all others that have data there
  std::vector<std::int64_t> bins;
};

/// The bins of a band's histograms, the same for all scenes.
struct HistogramAxis {
  double begin = 0;
  double width = 1;  ///< of a bin
  std::size_t bins = 0;
  int decimals = 0;  ///< that numbers of the band are worth being printed with
};

/// How well the scenes agree in one state.
struct Agreement {
  std::vector<std::vector<CommonValues>> scenes;  ///< [scene][band]
  std::vector<SeamResidual> seams;
};

/// The same before and after the corrections.
struct ReportFigures {
  std::vector<HistogramAxis> axes;  ///< per band
  Agreement before;
  Agreement after;
};

/// Which scene (its index) shows in each cell of the survey, `kNoLabel` where none has data. Gaps
/// that are filled show what fills them.
std::vector<std::uint32_t> ShownScenes(const Planning& planning);

/// `planning` must have a survey.
ReportFigures MeasureAgreement(const Planning& planning);

}  // namespace zarn::app
