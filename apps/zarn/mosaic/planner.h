// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "apps/zarn/imagefilter.h"
#include "apps/zarn/mosaic/balance.h"
#include "apps/zarn/mosaic/mosaicplan.h"
#include "apps/zarn/mosaic/survey.h"
#include "apps/zarn/stagedoutput.h"
#include "host/nspio/counter.h"

namespace zarn::app {

/// What a mosaic is asked to be.
struct MosaicOptions {
  WorkOptions work;
  OutputOptions output;
  std::vector<std::string> scenes;
  std::string crs;
  std::vector<double> extent;      ///< left, lower, right, upper
  std::vector<double> resolution;  ///< width and height of a pixel
  std::string resampling = "cubic";
  double threshold = 0.125;
  std::string cutlines;
  std::string cutlineId;
  std::string writeCutlines;
  std::string seams = "path";  ///< "path", or "none" for scenes pasted whole
  std::uint32_t feather = 0;
  std::string balance = "none";
  std::string reference;
  bool hotSpot = false;
  std::string order = "listed";
  std::string sourceMap;
  std::string srcNoData;
  std::string dstNoData;
  std::string filter = "none";
  int filterSize = 3;
  bool fillGaps = false;
  bool stopOnNoData = false;
  std::int64_t tileSide = 1024;
  std::string report;
  std::string config;  ///< file that options were read from, or empty
  std::string plan;    ///< file that the plan is written to, or empty
};

/// A plan, and what it rests on.
struct Planning {
  MosaicPlan plan;
  std::optional<Survey> survey;       ///< of the scenes in the order of pasting
  std::vector<std::uint32_t> labels;  ///< which scene shows in a cell of the survey; or empty
  std::vector<std::pair<std::string, double>> seconds;  ///< that each step took
};

/// Looks at the scenes, decides on the grid, and finds corrections and seams. All that can be wrong
/// with the input is found before the first scene is read. Throws `UsageError` and `RunError`.
Planning MakePlan(const MosaicOptions& options, nspio::Counter& progress);

}  // namespace zarn::app
