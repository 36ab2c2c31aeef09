// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "host/gobs/raster.h"

namespace zarn::processes::filters {

/// Addresses the samples of a block: the only code that knows strides and margins.
///
/// Coordinates are those of the block without margins; they run from -margin to size + margin. `T`
/// is const for a block that is only read.
template <typename T>
class BlockView {
 public:
  explicit BlockView(const gobs::Raster& block) requires std::is_const_v<T>
      : BlockView(block, static_cast<T*>(block.Data()), block.Channels()) {}
  explicit BlockView(gobs::Raster& block) requires(!std::is_const_v<T>)
      : BlockView(block, static_cast<T*>(block.Data()), block.Channels()) {}

  /// A plane beside a block (a mask): `channels` samples per pixel of the block's full size.
  static BlockView Beside(const gobs::RasterInfo& block, T* data, std::uint32_t channels) {
    return BlockView(block, data, channels);
  }

  std::ptrdiff_t Width() const { return width_; }
  std::ptrdiff_t Height() const { return height_; }
  std::ptrdiff_t Channels() const { return channels_; }
  std::ptrdiff_t MarginX() const { return marginX_; }
  std::ptrdiff_t MarginY() const { return marginY_; }
  std::ptrdiff_t FullWidth() const { return width_ + 2 * marginX_; }
  std::ptrdiff_t FullHeight() const { return height_ + 2 * marginY_; }

  /// First sample of the pixel in column `x` of row `y`.
  T* Pixel(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return data_ + ((y + marginY_) * FullWidth() + x + marginX_) * channels_;
  }

 private:
  BlockView(const gobs::RasterInfo& block, T* data, std::uint32_t channels)
      : data_(data),
        width_(block.Width()),
        height_(block.Height()),
        channels_(channels),
        marginX_(block.MarginX()),
        marginY_(block.MarginY()) {}

  T* data_;
  std::ptrdiff_t width_;
  std::ptrdiff_t height_;
  std::ptrdiff_t channels_;
  std::ptrdiff_t marginX_;
  std::ptrdiff_t marginY_;
};

}  // namespace zarn::processes::filters
