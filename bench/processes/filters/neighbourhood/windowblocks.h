// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <random>

#include "host/gobs/raster.h"

namespace zarn::bench {

// The blocks on which the square-window filters run.

inline constexpr int kNoData = 255;  ///< as input no-data; the background is 0
enum class Content { kClean, kHoles };

/// Samples between 1 and 254; with holes, patches of no-data and single specks make up about 14 %.
template <typename T>
void Fill(gobs::Raster& block, Content content) {
  std::mt19937 random(7);
  auto* const samples = static_cast<T*>(block.Data());
  const std::size_t channels = block.Channels();
  const std::size_t width = block.FullWidth();
  const std::size_t height = block.FullHeight();
  for (std::size_t i = 0; i < width * height * channels; ++i) {
    samples[i] = static_cast<T>(1 + random() % 254);
  }
  if (content == Content::kClean) return;
  const auto exclude = [&](std::size_t x, std::size_t y, int value) {
    for (std::size_t c = 0; c < channels; ++c) {
      samples[(y * width + x) * channels + c] = static_cast<T>(value);
    }
  };
  const std::size_t patches = width * height / 8192;
  for (std::size_t p = 0; p < patches; ++p) {
    const std::size_t x0 = random() % width;
    const std::size_t y0 = random() % height;
    for (std::size_t y = y0; y < std::min(y0 + 34, height); ++y) {
      for (std::size_t x = x0; x < std::min(x0 + 34, width); ++x) exclude(x, y, kNoData);
    }
  }
  for (std::size_t i = 0; i < width * height / 100; ++i) {
    exclude(random() % width, random() % height, random() % 2 != 0 ? kNoData : 0);
  }
}

inline void FillBlock(gobs::Raster& block, Content content) {
  switch (gobs::GetDataTypeCode(block)) {
    case gobs::NativeDataTypeCode::kUInt8:
      return Fill<std::uint8_t>(block, content);
    case gobs::NativeDataTypeCode::kUInt16:
      return Fill<std::uint16_t>(block, content);
    case gobs::NativeDataTypeCode::kFloat32:
      return Fill<float>(block, content);
    default:
      std::abort();
  }
}

}  // namespace zarn::bench
