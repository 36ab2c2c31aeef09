// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

namespace zarn::app {

/// A rectangle of pixels of the image.
struct Window {
  std::int64_t x = 0;
  std::int64_t y = 0;
  std::int64_t width = 0;
  std::int64_t height = 0;

  bool operator==(const Window&) const = default;
};

struct WindowSize {
  std::int64_t width = 0;
  std::int64_t height = 0;
};

/// What decides how an image is cut into windows.
struct WindowRequest {
  WindowSize image;
  WindowSize outputBlock;            ///< blocks of the output file, which should be written whole
  std::int64_t halo = 0;             ///< pixels needed around a window on every side
  std::size_t sampleBytes = 0;       ///< bytes of a pixel in a block that the filter sees
  std::size_t sideBytes = 0;         ///< bytes of what is read beside it: alpha, masks
  std::size_t slots = 1;             ///< windows in memory at a time
  std::size_t memory = 0;            ///< bytes that they may take together
  std::optional<WindowSize> forced;  ///< the size of the windows, instead of choosing it
  std::int64_t fewestRows = 0;       ///< of a window, where memory allows
};

/// Cuts an image into windows: columns from left to right, each from top to bottom, so that the
/// rows that two windows of a column share need to be read only once. One column of full width
/// where memory allows; more only when the image is too wide.
class WindowPlan {
 public:
  /// Throws `RunError` when not even the smallest window fits.
  explicit WindowPlan(const WindowRequest& request);

  std::size_t Count() const { return static_cast<std::size_t>(columns_ * rows_); }
  Window At(std::size_t index) const;
  /// The size of all windows but those at the right and lower edge.
  const WindowSize& Size() const { return size_; }
  /// Whether a window continues the column of the one before it.
  bool ContinuesColumn(std::size_t index) const {
    return static_cast<std::int64_t>(index) % rows_ != 0;
  }

 private:
  WindowSize image_;
  WindowSize size_;
  std::int64_t columns_ = 0;
  std::int64_t rows_ = 0;
};

}  // namespace zarn::app
