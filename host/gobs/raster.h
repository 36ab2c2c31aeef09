// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

#include "host/gobs/datatypes.h"
#include "host/hostexport.h"

namespace zarn::gobs {

/// Margins of a block and its place in the whole image, in pixels.
struct BlockFrame {
  std::uint32_t marginX = 0;  ///< extra columns on each side
  std::uint32_t marginY = 0;  ///< extra rows above and below
  std::uint32_t originX = 0;  ///< column, in the whole image, of the first pixel without margins
  std::uint32_t originY = 0;  ///< row of that pixel

  bool operator==(const BlockFrame&) const = default;
};

/// Shape of a raster block: `height` rows of `width` pixels of `channels` samples, surrounded by
/// margins that really exist in memory.
class ZARN_HOST_EXPORT RasterInfo {
 public:
  /// Throws `DataException` when the block with its margins would take more than 2^32 - 1 bytes
  /// or columns or rows.
  RasterInfo(std::uint32_t width, std::uint32_t height, std::uint32_t channels,
             const DataType& type, const BlockFrame& frame = {});
  /// Throws `Exception` for a code that has no description.
  RasterInfo(std::uint32_t width, std::uint32_t height, std::uint32_t channels,
             NativeDataTypeCode code, const BlockFrame& frame = {});
  RasterInfo(const RasterInfo&) = default;
  RasterInfo& operator=(const RasterInfo&) = default;
  virtual ~RasterInfo();

  std::uint32_t Width() const { return width_; }
  std::uint32_t Height() const { return height_; }
  std::uint32_t Channels() const { return channels_; }
  const DataType& Type() const { return type_; }
  const BlockFrame& Frame() const { return frame_; }
  std::uint32_t MarginX() const { return frame_.marginX; }
  std::uint32_t MarginY() const { return frame_.marginY; }
  std::uint32_t OriginX() const { return frame_.originX; }
  std::uint32_t OriginY() const { return frame_.originY; }
  std::uint32_t FullWidth() const { return width_ + 2 * frame_.marginX; }
  std::uint32_t FullHeight() const { return height_ + 2 * frame_.marginY; }
  /// Bytes of a block of this shape, margins included.
  std::uint32_t DescribedSize() const { return describedSize_; }

 private:
  std::uint32_t width_;
  std::uint32_t height_;
  std::uint32_t channels_;
  DataType type_;
  BlockFrame frame_;
  std::uint32_t describedSize_;
};

/// The code of a block's sample type; `kUnknown` for a description that no code has.
ZARN_HOST_EXPORT NativeDataTypeCode GetDataTypeCode(const RasterInfo& info);

/// A raster block: a shape and the memory that holds it.
///
/// Samples are pixel-interleaved, row by row over the full block (margins included): sample c of
/// pixel (x, y), counted without margins, lies at index
/// `((y + marginY) * fullWidth + x + marginX) * channels + c`.
///
/// A block either owns its memory (first constructor) or wraps memory of the caller, which must
/// outlive it; wrapping never copies. Blocks can be moved, not copied.
class ZARN_HOST_EXPORT Raster : public RasterInfo {
 public:
  /// Allocates zeroed memory.
  explicit Raster(const RasterInfo& info);
  /// Wraps `dataSize` bytes at `data`. Fewer bytes than described, or a null pointer, are accepted
  /// here and refused by the filters. Throws `DataException` when `data` is not aligned to the
  /// sample type.
  Raster(const RasterInfo& info, void* data, std::size_t dataSize);
  /// Wraps memory that may only be read; bind the result to a const object or reference.
  static const Raster WrapConst(const RasterInfo& info, const void* data, std::size_t dataSize);

  Raster(const Raster&) = delete;
  Raster& operator=(const Raster&) = delete;
  Raster(Raster&& other) noexcept;
  Raster& operator=(Raster&& other) noexcept;
  ~Raster() override;

  void* Data() { return data_; }
  const void* Data() const { return data_; }
  /// Bytes that `Data()` points to (at most 2^32 - 1).
  std::uint32_t DataSize() const { return dataSize_; }
  bool OwnsData() const { return ownsData_; }

 private:
  void Release();

  void* data_ = nullptr;
  std::uint32_t dataSize_ = 0;
  bool ownsData_ = false;
};

}  // namespace zarn::gobs
