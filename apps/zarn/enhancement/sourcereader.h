// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/blockreader.h"
#include "apps/zarn/dataset.h"
#include "apps/zarn/maskfile.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/windowbuffers.h"
#include "host/datasources/irasterreader.h"

namespace zarn::app {

/// The channels of a raster file for the library. Valid are pixels that are not no-data, NaN,
/// transparent or masked.
class SourceReader : public datasources::IRasterReader {
 public:
  /// All are borrowed; `mask` may be null.
  SourceReader(const RasterSource& source, const NoDataValues& noData, MaskFile* mask)
      : source_(source), reader_(source, noData, {.mask = mask, .marksNoData = true}) {}

  std::uint32_t Width() const override { return static_cast<std::uint32_t>(source_.Width()); }
  std::uint32_t Height() const override { return static_cast<std::uint32_t>(source_.Height()); }
  std::uint32_t Channels() const override {
    return static_cast<std::uint32_t>(source_.Channels().size());
  }
  gobs::NativeDataTypeCode DataTypeCode() const override { return source_.Type().code; }
  /// The geocoding alone.
  datasources::AuxiliaryData Auxiliary() const override;
  /// Throws `RunError`.
  void Read(gobs::Raster& block, std::uint8_t* valid) override;

 private:
  const RasterSource& source_;
  BlockReader reader_;
  WindowBuffers buffers_;
};

}  // namespace zarn::app
