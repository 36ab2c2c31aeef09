// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/enhancement/sourcereader.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstring>
#include <utility>

namespace zarn::app {

datasources::AuxiliaryData SourceReader::Auxiliary() const {
  datasources::AuxiliaryData auxiliary;
  std::array<double, 6> t;
  if (source_.Dataset().GetGeoTransform(t.data()) == CE_None) {
    auxiliary.geocoding = {t[0], t[1], t[2], t[3], t[4], t[5]};
  }
  return auxiliary;
}

void SourceReader::Read(gobs::Raster& block, std::uint8_t* valid) {
  const Window window{block.OriginX(), block.OriginY(), block.Width(), block.Height()};
  if (ahead_.valid()) ahead_.get();
  if (!(buffers_[1].window == window)) reader_.Read(window, nullptr, buffers_[1]);
  std::swap(buffers_[0], buffers_[1]);
  ReadAhead(window);
  const WindowBuffers& read = buffers_[0];
  const std::size_t rowBytes = block.DescribedSize() / std::max(block.Height(), 1U);
  auto* samples = static_cast<std::byte*>(block.Data());
  for (std::uint32_t y = 0; y < block.Height(); ++y) {
    std::memcpy(samples + y * rowBytes, read.samples.At(0, y), rowBytes);
    std::uint8_t* const row = valid + std::size_t{y} * block.Width();
    if (read.valid.Used()) {
      std::memcpy(row, read.valid.At(0, y), block.Width());
    } else {
      std::fill_n(row, block.Width(), std::uint8_t{1});
    }
  }
}

// The block on the right or, at the end of a row of blocks, the first of the next one.
void SourceReader::ReadAhead(const Window& window) {
  if (rowOfBlocks_.width == 0 || window.y != rowOfBlocks_.y) rowOfBlocks_ = window;
  Window next = window;
  next.x += window.width;
  if (next.x >= source_.Width()) {
    next = rowOfBlocks_;
    next.y += rowOfBlocks_.height;
  }
  next.width = std::min(rowOfBlocks_.width, source_.Width() - next.x);
  next.height = std::min(rowOfBlocks_.height, source_.Height() - next.y);
  if (next.width <= 0 || next.height <= 0) return;
  ahead_ =
      std::async(std::launch::async, [this, next] { reader_.Read(next, nullptr, buffers_[1]); });
}

}  // namespace zarn::app
