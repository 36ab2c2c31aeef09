// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <utility>

#include "apps/zarn/imagefilter.h"
#include "apps/zarn/mosaic/mosaicplan.h"
#include "apps/zarn/mosaic/planner.h"
#include "host/nspio/counter.h"

namespace zarn::app {

/// Makes a mosaic in one go.
void MakeMosaic(const MosaicOptions& options);

/// Writes the plan of a mosaic to `file`.
void WritePlan(const MosaicOptions& options, const std::string& file);

/// A piece of a job: its tiles from the first to the last one, counted from 1.
struct TileRange {
  std::size_t first = 1;
  std::size_t last = 0;  ///< 0: the last one that there is
};

/// Reads "A-B", "A" or "A-"; throws `UsageError`.
TileRange ParseTiles(const std::string& text);

/// Makes tiles of a plan, each as a file of its own in a folder beside the plan. Tiles that are
/// there already are left as they are, so pieces may overlap, run at the same time and be run again
/// after they were killed.
void RunPlan(const std::string& file, const TileRange& range, const WorkOptions& work);

/// How the tiles of a plan become one raster; what is not given is as the plan has it.
struct FinishOptions {
  std::string format;
  std::vector<std::string> creation;
  bool overwrite = false;
};

/// Joins the tiles of a plan, all of which must be there, in the output that the plan names.
void FinishPlan(const std::string& file, const FinishOptions& options, const WorkOptions& work);

}  // namespace zarn::app
