// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <future>

#include "apps/zarn/blockreader.h"
#include "apps/zarn/dataset.h"
#include "apps/zarn/maskfile.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/windowbuffers.h"
#include "host/datasources/irasterreader.h"

namespace zarn::app {

/// The channels of a raster file for the library. Valid are pixels that are not no-data, NaN,
/// transparent or masked.
///
/// While the caller works on a block, the next one is read by another thread: that on the right of
/// the same size or, at the end of a row of blocks, the first one below.
class SourceReader : public datasources::IRasterReader {
 public:
  /// All are borrowed; `mask` may be null.
  SourceReader(const RasterSource& source, const NoDataValues& noData, MaskFile* mask)
      : source_(source),
        reader_(source, noData, {.mask = mask, .marksNoData = true, .preparesOutput = false}) {}

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
  void ReadAhead(const Window& window);

  const RasterSource& source_;
  BlockReader reader_;
  std::array<WindowBuffers, 2> buffers_;  ///< of the block asked for and of the next one
  Window rowOfBlocks_;                    ///< its first block
  std::future<void> ahead_;               ///< waits when it is destroyed
};

}  // namespace zarn::app
