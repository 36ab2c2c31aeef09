// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "apps/zarn/mosaic/planner.h"
#include "apps/zarn/mosaic/reportfigures.h"
#include "apps/zarn/mosaic/reportpictures.h"

namespace zarn::app {

/// What a report shows beside the plan itself.
struct ReportContents {
  int width = 0;  ///< of the pictures
  int height = 0;
  std::string before;  ///< the pictures as data: URIs
  std::string after;
  std::string map;
  std::string seams;                 ///< data of an SVG path over the pictures
  std::vector<Rgb> colours;          ///< per scene
  std::vector<std::int64_t> pixels;  ///< of the mosaic, by number of the scene; first, of none
  ReportFigures figures;
};

/// A report as a page of HTML that refers to nothing outside of itself.
std::string ReportPage(const MosaicOptions& options, const Planning& planning,
                       const ReportContents& contents);

}  // namespace zarn::app
