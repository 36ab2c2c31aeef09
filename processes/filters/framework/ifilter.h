// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <vector>

#include "host/gobs/raster.h"
#include "processes/filters/framework/filterresult.h"

namespace zarn::processes::filters {

/// A raster filter. It keeps only its parameters and the no-data values between calls.
///
/// One filter object serves any number of blocks in any order, one call at a time; distinct objects
/// are independent. The results do not depend on the number of threads.
class IFilter {
 public:
  IFilter() = default;
  IFilter(const IFilter&) = delete;
  IFilter& operator=(const IFilter&) = delete;
  virtual ~IFilter();

  /// Filters one block.
  ///
  /// `input` carries the margins that the family asks for; `output` has the same sample type and
  /// channel count and must not overlap it unless the family allows it. `blockX` and `blockY` are
  /// the block's origin in the whole image. `inputMask` is null or holds one byte per pixel of the
  /// input's full block, row by row; 0 means that the pixel is not processed.
  ///
  /// Failures of the data come back as code 0 with the output untouched. Exceptions come only from
  /// host services and from allocation.
  virtual FilterResult Process(const gobs::Raster& input, gobs::Raster& output,
                               std::uint32_t blockX, std::uint32_t blockY,
                               const std::uint8_t* inputMask) = 0;

  /// Sets the no-data pixels, one value per channel; both vectors are copied. A null pointer clears
  /// the list, an empty list means that there is none. A pixel is no-data when all its channels
  /// equal the input values; it becomes the output values, which no computed pixel will equal.
  virtual void SetNoDataValues(const std::vector<double>* inputValues,
                               const std::vector<double>* outputValues);

 protected:
  std::vector<double> inputNoData;
  std::vector<double> outputNoData;
};

}  // namespace zarn::processes::filters
