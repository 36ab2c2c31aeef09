// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/datasources/auxiliarydata.h"
#include "host/gobs/raster.h"
#include "host/hostexport.h"

namespace zarn::datasources {

/// Where a whole raster is written to.
class ZARN_HOST_EXPORT BasicWriter {
 public:
  BasicWriter() = default;
  BasicWriter(const BasicWriter&) = delete;
  BasicWriter& operator=(const BasicWriter&) = delete;
  virtual ~BasicWriter();

  /// Writes a block without margins and what goes with it. Throws an `Exception` when that fails.
  virtual void Write(const gobs::Raster& raster, const AuxiliaryData& auxiliary) = 0;
};

}  // namespace zarn::datasources
