// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

namespace zarn::processes::filters {

/// What a GeoLUT matrix is made of.
struct GLUTParameters {
  std::int32_t trimMethod = 0;  ///< the value of a `TrimMethod`
  std::int32_t tileWidth = 0;   ///< columns of the image to a cell
  std::int32_t tileHeight = 0;  ///< rows of the image to a cell
  std::int32_t gridRows = 0;
  std::int32_t gridColumns = 0;
  std::int32_t channelCount = 0;
  bool ignoreFirstBin = false;  ///< leaves level 0 out of the statistics
  bool ignoreLastBin = false;   ///< leaves the top level out of the statistics
  double leftTrim = -1;         ///< as `ITrimMethod::Trim` has it; -1 makes both trims 0.02
  double rightTrim = -1;
  float power = 1;              ///< exponent of the stretch
  std::int32_t pixelDepth = 8;  ///< bits of a sample: 8 or 16
};

/// The passes of `IGeoLUTMatrix::Clean`.
struct GLUTCleaning {
  bool globalFilter = false;
  bool localFilter = false;
  bool fillsMasked = false;  ///< whether masked cells get tables from their neighbours as well
  bool interpolation = false;
};

}  // namespace zarn::processes::filters
