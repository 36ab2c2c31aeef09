// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/windows.h"
#include "host/gobs/datatypes.h"

namespace zarn::app {

/// How the pixels of an image lie in a coarser raster: pixel (x, y) is in its pixel
/// ((x + offsetX) / factor, (y + offsetY) / factor).
struct CoarserGrid {
  std::int64_t factor = 1;
  std::int64_t offsetX = 0;
  std::int64_t offsetY = 0;
};

/// What decides whether two labels are of the same segment.
enum class LabelComparison {
  kEquality,
  kDifference,  ///< up to a tolerance, to either side
};

/// A raster of one band that gives each pixel of an image a label. It may be coarser than the image
/// by a whole number; its labels are handed out repeated, one for each pixel of the image, so that
/// nothing depends on where a window begins.
class LabelFile {
 public:
  /// `noData` is the label of pixels without one, "none", or empty for the file's own. Throws
  /// `RunError` unless the file has one band of real numbers whose grid fits that of `image`, and
  /// `UsageError` when `noData` is no number.
  LabelFile(const std::string& name, const RasterSource& image, const std::string& noData,
            LabelComparison comparison);

  const std::string& Name() const { return name_; }
  /// Of the labels that are handed out: the file's own, or one that also holds the differences of
  /// its labels, with their signs, or a `NoData` that is none of them.
  gobs::NativeDataTypeCode Type() const { return type_; }
  std::size_t Bytes() const { return bytes_; }
  /// The label that means none. No pixel has it when there is no such label.
  double NoData() const { return noData_; }

  /// The labels of the pixels of `area`, `stride` bytes from row to row.
  void Read(const Window& area, std::byte* labels, std::size_t stride);

 private:
  void SettleNoData(const std::string& option, LabelComparison comparison);
  void ReadPart(const Window& coarse);
  template <typename Sample, typename Label>
  void RepeatRow(std::int64_t coarseRow, std::int64_t coarseLeft, const Window& area,
                 std::byte* labels) const;

  std::string name_;
  DatasetPtr dataset_;
  SampleType fileType_;
  CoarserGrid grid_;
  bool isWidened_ = false;
  gobs::NativeDataTypeCode type_ = gobs::NativeDataTypeCode::kNone;
  std::size_t bytes_ = 0;
  double noData_ = 0;
  std::vector<std::byte> scratch_;
};

}  // namespace zarn::app
