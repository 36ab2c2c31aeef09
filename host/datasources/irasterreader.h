// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "host/datasources/auxiliarydata.h"
#include "host/gobs/raster.h"
#include "host/hostexport.h"

namespace zarn::datasources {

/// A raster of any size, read by windows. Not for several threads at once.
class ZARN_HOST_EXPORT IRasterReader {
 public:
  IRasterReader() = default;
  IRasterReader(const IRasterReader&) = delete;
  IRasterReader& operator=(const IRasterReader&) = delete;
  virtual ~IRasterReader();

  virtual std::uint32_t Width() const = 0;
  virtual std::uint32_t Height() const = 0;
  virtual std::uint32_t Channels() const = 0;
  virtual gobs::NativeDataTypeCode DataTypeCode() const = 0;
  virtual AuxiliaryData Auxiliary() const = 0;

  /// Fills `block`, a window of the raster without margins that begins at the block's origin and
  /// lies within the raster; it has the raster's channels and sample type. `valid` gets one byte
  /// for each pixel, row by row: 0 for those that are no-data or masked, else 1. Throws an
  /// `Exception` when the raster cannot be read.
  virtual void Read(gobs::Raster& block, std::uint8_t* valid) = 0;
};

}  // namespace zarn::datasources
