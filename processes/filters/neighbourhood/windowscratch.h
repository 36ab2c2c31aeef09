// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

#include "processes/filters/neighbourhood/boxrows.h"
#include "processes/filters/neighbourhood/windowjob.h"

namespace zarn::processes::filters {

/// Cuts scratch out of a single allocation, aligned to 64 bytes; with null memory it only adds the
/// sizes up.
class ScratchCutter {
 public:
  explicit ScratchCutter(std::byte* memory) : memory_(memory) {}

  std::byte* Take(std::size_t bytes) {
    std::byte* const place = memory_ == nullptr ? nullptr : memory_ + size_;
    size_ += (bytes + kAlignment - 1) / kAlignment * kAlignment;
    return place;
  }
  /// A padded row.
  template <typename U>
  U* Row(std::size_t elements) {
    return reinterpret_cast<U*>(Take((elements + kRowPadding) * sizeof(U)));
  }
  std::size_t Size() const { return size_; }

 private:
  static constexpr std::size_t kAlignment = 64;
  std::byte* memory_;
  std::size_t size_ = 0;
};

/// Rows that a strip of output pixels needs to be read and written (see WindowStrip).
template <typename T>
struct StripScratch {
  T* centre = nullptr;
  T* old = nullptr;
  std::uint8_t* bytes = nullptr;

  /// For `outputs` samples and windows that reach `pixels` pixels.
  static StripScratch Cut(ScratchCutter& cutter, std::size_t outputs, std::size_t pixels) {
    return {cutter.Row<T>(outputs), cutter.Row<T>(outputs), cutter.Row<std::uint8_t>(pixels)};
  }
};

}  // namespace zarn::processes::filters
