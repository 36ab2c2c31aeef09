// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>

#include "apps/zarn/windows.h"
#include "host/gobs/datatypes.h"

namespace zarn::app {

/// One value or pixel for each pixel of a window with its halo, row by row. The memory is kept from
/// window to window and its contents are undefined until written.
class Plane {
 public:
  /// `pixelBytes` 0: the plane is not used.
  void Shape(std::int64_t fullWidth, std::int64_t fullHeight, std::size_t pixelBytes) {
    pixelBytes_ = pixelBytes;
    stride_ = static_cast<std::size_t>(fullWidth) * pixelBytes;
    size_ = static_cast<std::size_t>(fullHeight) * stride_;
    if (size_ <= capacity_) return;
    data_.reset();
    data_ = std::make_unique_for_overwrite<std::byte[]>(size_);
    capacity_ = size_;
  }

  bool Used() const { return pixelBytes_ != 0; }
  std::size_t PixelBytes() const { return pixelBytes_; }
  std::size_t Stride() const { return stride_; }
  std::size_t Size() const { return size_; }
  std::byte* Data() { return data_.get(); }
  const std::byte* Data() const { return data_.get(); }
  /// Column and row count from the first pixel of the halo.
  std::byte* At(std::int64_t column, std::int64_t row) { return data_.get() + Offset(column, row); }
  const std::byte* At(std::int64_t column, std::int64_t row) const {
    return data_.get() + Offset(column, row);
  }

 private:
  std::size_t Offset(std::int64_t column, std::int64_t row) const {
    return static_cast<std::size_t>(row) * stride_ + static_cast<std::size_t>(column) * pixelBytes_;
  }

  std::unique_ptr<std::byte[]> data_;
  std::size_t capacity_ = 0;
  std::size_t size_ = 0;
  std::size_t stride_ = 0;
  std::size_t pixelBytes_ = 0;
};

/// What belongs to one window on its way from the input to the output.
struct WindowBuffers {
  Window window;
  std::int64_t halo = 0;
  Plane samples;        ///< the channels, pixel-interleaved
  Plane alphas;         ///< the alpha bands, pixel-interleaved
  Plane fileMask;       ///< the file's mask as it is
  Plane valid;          ///< bytes, 0: not to be processed, or outside of the image
  bool masked = false;  ///< whether `valid` has a 0
  Plane labels;         ///< the labels, one for each pixel of the image
  gobs::NativeDataTypeCode labelType = gobs::NativeDataTypeCode::kNone;
  Plane output;    ///< the filtered channels, without halo
  Plane writable;  ///< bytes, without halo; 0: the output is not to be written
};

}  // namespace zarn::app
