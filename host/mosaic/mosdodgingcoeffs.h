// SPDX-License-Identifier: Apache-2.0
#pragma once

/// Dodging coefficients of one channel. The balanced value of a sample v starts from
/// `a = v * d4 + d5`; what the others do depends on the model.
struct MOSDodgingCoeffs {
  double d0 = 0.0;  ///< the channel's mean, around which contrast is changed
  double d1 = 0.0;  ///< added to every value
  double d2 = 1.0;  ///< d3 / d2 is the relative gain beyond 1
  double d3 = 0.0;
  double d4 = 1.0;
  double d5 = 0.0;
};

/// Dodging models; every value without a name acts as `kShift`. With g and o the samples of the
/// gain and offset surfaces (1 and 0 where there is none):
enum class MOSDodgingType : int {
  kShift = 0,   ///< a + (d1 + o)
  kDamped = 1,  ///< as kShift, but brightening is halved where r = (d0 + d1) / (d0 - o) exceeds 1:
                ///< (r * a + a + (d1 + o)) / 2
  kScaled = 2,  ///< (a - d0) * (d3 / d2 + 1) * g + d0 + (d1 + o)
};
