// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <vector>

namespace zarn::utils {

/// How values between pixels come about. The numbers are part of the host's interface.
enum class ResampleMethod : std::int32_t {
  kBilinear = 0,
  kCubic = 1,  ///< Catmull-Rom, that is, cubic convolution with a = -0.5
  kNearest = 3,
  kDirectCopy = 25,  ///< whole pixels; not a method of `Resample`
};

struct ResampleInfo {
  ResampleMethod method = ResampleMethod::kNearest;
  bool hasNoData = false;                ///< whether uncovered pixels are written at all
  double noData = 0.0;                   ///< for all channels; with complex samples the real part
  std::vector<double> noDataPixel = {};  ///< unless empty, one value per channel instead
};

}  // namespace zarn::utils
