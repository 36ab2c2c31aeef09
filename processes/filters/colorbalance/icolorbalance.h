// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {

/// The kinds of colour balancers.
enum class ColorBalanceKind : std::int32_t {
  kLUT = 0,
  kMinMaxLUT = 1,
  kGainOffset = 2,
  kNeighborhood = 3,
  kDodging = 4,
};

/// A filter that corrects every pixel by itself, channel by channel. What all of them share:
///
/// | | |
/// |---|---|
/// | sample types | integers up to 32 bits, float, double; others where a class says so |
/// | blocks | same size, type and channels; no margins; the output may be the input |
/// | excluded pixel | becomes the output no-data pixel, or stays unwritten without one |
/// | any other pixel | never equals a channel's output no-data value, unless a class says so |
/// | unknown type | "Unknown raster block data type for color balancing" |
///
/// Excluded are pixels whose mask byte is 0 and those whose channels all equal the input no-data
/// values (floating ones within 2.2e-16). Inconsistent blocks and fewer parameters than channels
/// are refused too. After a failure the output is untouched.
class IColorBalance : public IFilter {
 public:
  virtual ColorBalanceKind Kind() const = 0;
};

}  // namespace zarn::processes::filters
