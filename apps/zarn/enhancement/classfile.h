// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "apps/zarn/dataset.h"
#include "apps/zarn/stagingfolder.h"
#include "host/datasources/basicwriter.h"

namespace zarn::app {

/// Writes a raster as a GeoTIFF in a staging folder, with its classes as colour table and category
/// names.
class ClassFile : public datasources::BasicWriter {
 public:
  /// Both are borrowed. The file gets the coordinate system of `image`, and its geocoding where
  /// `image` has one.
  ClassFile(const StagingFolder& file, const RasterSource& image) : file_(file), image_(image) {}

  /// Throws `RunError` when the file cannot be written.
  void Write(const gobs::Raster& raster, const datasources::AuxiliaryData& auxiliary) override;

 private:
  const StagingFolder& file_;
  const RasterSource& image_;
};

}  // namespace zarn::app
