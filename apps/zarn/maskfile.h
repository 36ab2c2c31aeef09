// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/windows.h"

namespace zarn::app {

/// A raster of one band that says which pixels are to be processed: those where it is not 0 (nor
/// NaN).
class MaskFile {
 public:
  /// Throws `RunError` unless the file has one band of real numbers, the size of `image` and, where
  /// both are georeferenced, its place on the ground.
  MaskFile(const std::string& name, const RasterSource& image);

  const std::string& Name() const { return name_; }
  GDALDataset& Dataset() const { return *dataset_; }

  /// Sets the bytes of excluded pixels in `valid` to 0 and leaves the others; `valid` has the
  /// pixels of `area`, `stride` bytes from row to row.
  void Exclude(const Window& area, std::uint8_t* valid, std::size_t stride);

 private:
  template <typename Sample>
  void ExcludeRows(const Window& part, GDALDataType type, std::vector<Sample>& samples,
                   std::uint8_t* valid, std::size_t stride);

  std::string name_;
  DatasetPtr dataset_;
  std::vector<std::uint8_t> bytes_;
  std::vector<double> doubles_;
};

}  // namespace zarn::app
