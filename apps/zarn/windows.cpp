// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/windows.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <string>

#include "apps/zarn/errors.h"

namespace zarn::app {
namespace {

// Larger windows gain nothing and leave the processor's cache earlier.
constexpr double kPreferredSlotBytes = 16 << 20;
constexpr double kMaxBlockBytes = std::numeric_limits<std::uint32_t>::max();

std::int64_t DivideUp(std::int64_t a, std::int64_t b) { return (a + b - 1) / b; }

class Chooser {
 public:
  explicit Chooser(const WindowRequest& request)
      : request_(request),
        // Blocks as tall as a whole image exist (or as wide: strips); aligning to those is
        // hopeless.
        columnUnit_(request.outputBlock.width < request.image.width ? request.outputBlock.width
                                                                    : 256),
        rowUnit_(request.outputBlock.height <= 1024 ? request.outputBlock.height : 64) {}

  WindowSize Choose() const {
    if (request_.forced) {
      if (!Fits(*request_.forced)) Refuse(*request_.forced);
      return *request_.forced;
    }
    // Preferably at most half of a block is margin; else as few rows as the output allows.
    const std::int64_t wanted =
        std::max(rowUnit_, RoundUp(std::max(2 * request_.halo, request_.fewestRows), rowUnit_));
    for (const std::int64_t rows : {std::min(wanted, FullHeight()), rowUnit_}) {
      for (std::int64_t columns = 1;; ++columns) {
        const WindowSize size{ColumnWidth(columns), rows};
        if (Fits(size)) return Grown(size);
        if (size.width <= columnUnit_) break;
      }
    }
    Refuse({columnUnit_, rowUnit_});
  }

 private:
  static std::int64_t RoundUp(std::int64_t value, std::int64_t unit) {
    return DivideUp(value, unit) * unit;
  }
  std::int64_t FullHeight() const { return RoundUp(request_.image.height, rowUnit_); }
  std::int64_t ColumnWidth(std::int64_t columns) const {
    if (columns == 1) return request_.image.width;
    return RoundUp(DivideUp(request_.image.width, columns), columnUnit_);
  }

  // Doubles, because the products of extreme sizes pass 64 bits.
  double FullPixels(WindowSize size) const {
    const auto halo = static_cast<double>(request_.halo);
    return (Clipped(size.width, request_.image.width) + 2 * halo) *
           (Clipped(size.height, request_.image.height) + 2 * halo);
  }
  static double Clipped(std::int64_t size, std::int64_t image) {
    return static_cast<double>(std::min(size, image));
  }
  double BlockBytes(WindowSize size) const {
    return FullPixels(size) * static_cast<double>(request_.sampleBytes);
  }
  double SlotBytes(WindowSize size) const {
    return BlockBytes(size) + FullPixels(size) * static_cast<double>(request_.sideBytes) +
           Clipped(size.width, request_.image.width) * Clipped(size.height, request_.image.height) *
               static_cast<double>(request_.sampleBytes);
  }
  double TotalBytes(WindowSize size) const {
    return static_cast<double>(request_.slots) * SlotBytes(size);
  }
  bool Fits(WindowSize size) const {
    return BlockBytes(size) <= kMaxBlockBytes &&
           TotalBytes(size) <= static_cast<double>(request_.memory);
  }

  WindowSize Grown(WindowSize size) const {
    for (;;) {
      const WindowSize taller{size.width, size.height + rowUnit_};
      if (size.height >= request_.image.height || !Fits(taller) ||
          SlotBytes(taller) > kPreferredSlotBytes) {
        return size;
      }
      size = taller;
    }
  }

  // What to make smaller; without a halo the window alone decides.
  std::string Culprit() const {
    if (request_.halo == 0) return "--window";
    return request_.forced ? "--window or --size" : "--size";
  }

  [[noreturn]] void Refuse(WindowSize smallest) const {
    const auto mebibytes = [](double bytes) {
      return std::to_string(static_cast<std::int64_t>(std::ceil(bytes / (1 << 20)))) + " MiB";
    };
    if (BlockBytes(smallest) > kMaxBlockBytes) {
      throw RunError("a window with its margins would take " + mebibytes(BlockBytes(smallest)) +
                     ", more than the 4095 MiB that a block may have; use a smaller " + Culprit());
    }
    throw RunError("the windows with their margins would take " + mebibytes(TotalBytes(smallest)) +
                   ", more than --memory allows (" +
                   mebibytes(static_cast<double>(request_.memory)) + "); use a smaller " +
                   Culprit() + " or more --memory");
  }

  const WindowRequest& request_;
  std::int64_t columnUnit_;
  std::int64_t rowUnit_;
};

}  // namespace

WindowPlan::WindowPlan(const WindowRequest& request)
    : image_(request.image), size_(Chooser(request).Choose()) {
  size_ = {std::min(size_.width, image_.width), std::min(size_.height, image_.height)};
  columns_ = DivideUp(image_.width, size_.width);
  rows_ = DivideUp(image_.height, size_.height);
}

Window WindowPlan::At(std::size_t index) const {
  const std::int64_t x = static_cast<std::int64_t>(index) / rows_ * size_.width;
  const std::int64_t y = static_cast<std::int64_t>(index) % rows_ * size_.height;
  return {x, y, std::min(size_.width, image_.width - x), std::min(size_.height, image_.height - y)};
}

}  // namespace zarn::app
