// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

namespace zarn::processes::filters {

/// Records the source's identifier: the last sample of each pixel of a map that counts as having
/// `channel` samples per pixel. Knows the map's type only by its size and the value's bytes.
class SourceMapWriter {
 public:
  /// Writes nothing.
  SourceMapWriter() = default;

  template <typename T>
  SourceMapWriter(T* samples, std::size_t channel, T value)
      : samples_(reinterpret_cast<unsigned char*>(samples + channel - 1)),
        step_(channel * sizeof(T)),
        bytes_(sizeof(T)) {
    std::memcpy(value_, &value, sizeof(T));
  }

  void Write(std::size_t firstPixel, std::size_t endPixel) const {
    switch (bytes_) {
      case 1:
        return WriteBytes<1>(firstPixel, endPixel);
      case 2:
        return WriteBytes<2>(firstPixel, endPixel);
      case 4:
        return WriteBytes<4>(firstPixel, endPixel);
      case 8:
        return WriteBytes<8>(firstPixel, endPixel);
      default:
        return;
    }
  }

 private:
  template <std::size_t kBytes>
  void WriteBytes(std::size_t firstPixel, std::size_t endPixel) const {
    for (std::size_t p = firstPixel; p < endPixel; ++p) {
      std::memcpy(samples_ + p * step_, value_, kBytes);
    }
  }

  unsigned char* samples_ = nullptr;
  std::size_t step_ = 0;
  std::size_t bytes_ = 0;
  unsigned char value_[8] = {};
};

}  // namespace zarn::processes::filters
