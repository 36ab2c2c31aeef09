// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace zarn::processes::filters {

/// What an attribute filter makes of the samples that it pools. The numbers are part of the
/// interface.
enum class FILTERALGO : int {
  kAverage = 0,      ///< their mean
  kMedian = 1,       ///< their median, the lower one of two
  kTrimmedMean = 2,  ///< the mean without the lowest and the highest quarter
};

}  // namespace zarn::processes::filters
