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
/// | masked pixel (mask byte 0) | becomes the output no-data pixel, or stays unwritten without one
/// | | input no-data pixel (all channels equal; floating ones within 2.2e-16) | likewise | | any
/// other pixel | never equals a channel's output no-data value, unless a class says so | | failures
/// | "Unknown raster block data type for color balancing", inconsistent blocks, fewer
///   parameters than channels; the output stays untouched |
class IColorBalance : public IFilter {
 public:
  virtual ColorBalanceKind Kind() const = 0;
};

}  // namespace zarn::processes::filters
