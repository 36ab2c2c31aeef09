// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gdal_priv.h>

#include <cstddef>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "host/gobs/datatypes.h"

namespace zarn::app {

struct DatasetCloser {
  void operator()(GDALDataset* dataset) const { GDALClose(dataset); }
};
using DatasetPtr = std::unique_ptr<GDALDataset, DatasetCloser>;

/// Opens a raster for reading; throws `RunError` naming the file and the reason.
DatasetPtr OpenRaster(const std::string& name);

/// The sample type of a band as the filters and as GDAL name it. Signed bytes are Byte with a
/// metadata item in GDAL.
struct SampleType {
  gobs::NativeDataTypeCode code;
  GDALDataType gdal;

  bool operator==(const SampleType&) const = default;
  bool IsSignedByte() const { return code == gobs::NativeDataTypeCode::kInt8; }
  std::size_t Bytes() const { return static_cast<std::size_t>(GDALGetDataTypeSizeBytes(gdal)); }
  std::string Name() const { return IsSignedByte() ? "Int8" : GDALGetDataTypeName(gdal); }
};

SampleType SampleTypeOf(GDALRasterBand& band);

/// A raster that is to be filtered: its bands sorted by what they hold.
class RasterSource {
 public:
  /// Throws `RunError` for what cannot be filtered: no bands, or bands of different types.
  explicit RasterSource(const std::string& name);
  /// The same for a dataset that is open; `name` is what messages call it.
  RasterSource(const std::string& name, DatasetPtr dataset);

  const std::string& Name() const { return name_; }
  GDALDataset& Dataset() const { return *dataset_; }
  int Width() const { return dataset_->GetRasterXSize(); }
  int Height() const { return dataset_->GetRasterYSize(); }
  const SampleType& Type() const { return type_; }
  /// Numbers of the bands that the filter works on.
  const std::vector<int>& Channels() const { return channels_; }
  /// Numbers of the alpha bands, which are copied and tell which pixels are valid.
  const std::vector<int>& Alphas() const { return alphas_; }
  /// Masks of the file that are bands of their own, not derived from no-data or alpha.
  const std::vector<GDALRasterBand*>& Masks() const { return masks_; }
  /// The no-data values that the file declares, one per channel; empty unless each channel has one.
  const std::vector<double>& NoData() const { return noData_; }
  /// Columns and rows of the file's blocks.
  int BlockWidth() const { return blockWidth_; }
  int BlockHeight() const { return blockHeight_; }
  /// Throws `RunError` when a band has a palette, whose numbers cannot be computed with.
  void RefusePalette() const;
  /// Gives the dataset away, so that it can be closed with a look at what comes of it; only the
  /// name and the sample type may be asked for afterwards.
  DatasetPtr TakeDataset() { return std::move(dataset_); }

 private:
  void SortBands();
  void FindMasks();
  void ReadNoData();

  std::string name_;
  DatasetPtr dataset_;
  SampleType type_{};
  std::vector<int> channels_;
  std::vector<int> alphas_;
  std::vector<GDALRasterBand*> masks_;
  std::vector<double> noData_;
  int blockWidth_ = 1;
  int blockHeight_ = 1;
};

}  // namespace zarn::app
