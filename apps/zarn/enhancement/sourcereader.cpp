// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/enhancement/sourcereader.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstring>

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
  reader_.Read({block.OriginX(), block.OriginY(), block.Width(), block.Height()}, nullptr,
               buffers_);
  const std::size_t rowBytes = block.DescribedSize() / std::max(block.Height(), 1U);
  auto* samples = static_cast<std::byte*>(block.Data());
  for (std::uint32_t y = 0; y < block.Height(); ++y) {
    std::memcpy(samples + y * rowBytes, buffers_.samples.At(0, y), rowBytes);
    std::uint8_t* const row = valid + std::size_t{y} * block.Width();
    if (buffers_.valid.Used()) {
      std::memcpy(row, buffers_.valid.At(0, y), block.Width());
    } else {
      std::fill_n(row, block.Width(), std::uint8_t{1});
    }
  }
}

}  // namespace zarn::app
