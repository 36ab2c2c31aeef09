// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <type_traits>
#include <vector>

#include "host/gobs/raster.h"
#include "tests/support/sampletypes.h"

namespace zarn::testsupport {

struct Shape {
  std::uint32_t width = 0;
  std::uint32_t height = 0;
  std::uint32_t channels = 1;
  std::uint32_t marginX = 0;
  std::uint32_t marginY = 0;

  std::ptrdiff_t FullWidth() const {
    return static_cast<std::ptrdiff_t>(width) + 2 * static_cast<std::ptrdiff_t>(marginX);
  }
  std::ptrdiff_t FullHeight() const {
    return static_cast<std::ptrdiff_t>(height) + 2 * static_cast<std::ptrdiff_t>(marginY);
  }
  /// Index of a pixel in the full block; margins have negative coordinates or lie past the size.
  std::ptrdiff_t PixelIndex(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return (y + static_cast<std::ptrdiff_t>(marginY)) * FullWidth() + x +
           static_cast<std::ptrdiff_t>(marginX);
  }
};

/// A block whose samples the test can reach: allocated to the byte, so that a sanitizer sees an
/// access past its end, and if wanted shifted by some samples, so that nothing can rely on more
/// than the alignment of one sample.
template <typename T>
class TestBlock {
 public:
  explicit TestBlock(const Shape& shape, std::size_t shift = 0)
      : shape_(shape),
        shift_(shift),
        samples_(shift + static_cast<std::size_t>(shape.FullWidth() * shape.FullHeight()) *
                             shape.channels) {
    FillDistinct();
  }

  const Shape& shape() const { return shape_; }
  T* Pixel(std::ptrdiff_t x, std::ptrdiff_t y) { return Samples() + SampleIndex(x, y); }
  const T* Pixel(std::ptrdiff_t x, std::ptrdiff_t y) const { return Samples() + SampleIndex(x, y); }
  T& At(std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t c = 0) { return Pixel(x, y)[c]; }
  T At(std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t c = 0) const { return Pixel(x, y)[c]; }
  T* Samples() { return samples_.data() + shift_; }
  const T* Samples() const { return samples_.data() + shift_; }
  std::size_t SampleCount() const { return samples_.size() - shift_; }

  /// Neighbouring samples differ, in rows, columns and channels alike.
  void FillDistinct() {
    for (std::size_t i = 0; i < samples_.size(); ++i) {
      samples_[i] = static_cast<T>((i * 73 + i / 97 * 29 + 41) % 113);
    }
  }
  void Fill(T value) { samples_.assign(samples_.size(), value); }

  gobs::RasterInfo Info() const {
    return {shape_.width, shape_.height, shape_.channels, CodeFor<T>(),
            gobs::BlockFrame{.marginX = shape_.marginX, .marginY = shape_.marginY}};
  }
  gobs::Raster Wrap() { return {Info(), Samples(), SampleCount() * sizeof(T)}; }
  const gobs::Raster Wrap() const {
    return gobs::Raster::WrapConst(Info(), Samples(), SampleCount() * sizeof(T));
  }

 private:
  std::ptrdiff_t SampleIndex(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return shape_.PixelIndex(x, y) * static_cast<std::ptrdiff_t>(shape_.channels);
  }

  Shape shape_;
  std::size_t shift_;
  std::vector<T> samples_;
};

/// The same bits, or both NaN: which NaN comes out of a sum is not defined.
template <typename T>
bool SameSample(T a, T b) {
  if constexpr (std::is_floating_point_v<T>) {
    if (a != a || b != b) return a != a && b != b;
  }
  return std::memcmp(&a, &b, sizeof(T)) == 0;
}

/// Whether two blocks of one shape agree in every sample, margins included.
template <typename T>
::testing::AssertionResult SameBlocks(const TestBlock<T>& actual, const TestBlock<T>& expected) {
  const Shape& shape = expected.shape();
  const auto marginX = static_cast<std::ptrdiff_t>(shape.marginX);
  const auto marginY = static_cast<std::ptrdiff_t>(shape.marginY);
  for (std::ptrdiff_t y = -marginY; y < shape.FullHeight() - marginY; ++y) {
    for (std::ptrdiff_t x = -marginX; x < shape.FullWidth() - marginX; ++x) {
      for (std::ptrdiff_t c = 0; c < static_cast<std::ptrdiff_t>(shape.channels); ++c) {
        const T a = actual.At(x, y, c);
        const T b = expected.At(x, y, c);
        if (SameSample(a, b)) continue;
        return ::testing::AssertionFailure()
               << "channel " << c << " of pixel (" << x << ", " << y << ") is "
               << ::testing::PrintToString(+a) << " instead of " << ::testing::PrintToString(+b)
               << " in a block of " << shape.width << "x" << shape.height;
      }
    }
  }
  return ::testing::AssertionSuccess();
}

}  // namespace zarn::testsupport
