// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/interpolation.h"

#include <algorithm>
#include <utility>

namespace zarn::app {
namespace {

using utils::ResampleMethod;

/// The stored positions of a part of a window, counted from a window of the source.
class StoredPositions : public utils::IBufPosTfm {
 public:
  StoredPositions(const double* x, const double* y, std::int64_t pitch, const Window& source)
      : x_(x),
        y_(y),
        pitch_(pitch),
        left_(static_cast<double>(source.x)),
        top_(static_cast<double>(source.y)) {}

  void Transform(int column, int row, int count, double* x, double* y) override {
    const std::int64_t first = row * pitch_ + column;
    for (std::int64_t i = 0; i < count; ++i) {
      x[i] = x_[first + i] - left_;
      y[i] = y_[first + i] - top_;
    }
  }
  bool IsConcurrent() const override { return true; }

 private:
  const double* x_;
  const double* y_;
  std::int64_t pitch_;
  double left_;
  double top_;
};

utils::ResampleBuffer BufferOf(const gobs::Raster& block, const std::uint8_t* mask) {
  return {gobs::GetDataTypeCode(block),
          static_cast<int>(block.Width()),
          static_cast<int>(block.Height()),
          static_cast<int>(block.Channels()),
          const_cast<unsigned char*>(static_cast<const unsigned char*>(block.Data())),
          const_cast<unsigned char*>(mask),
          false};
}

}  // namespace

ResampleMethod MethodOf(const std::string& name) {
  if (name == "bilinear") return ResampleMethod::kBilinear;
  return name == "cubic" ? ResampleMethod::kCubic : ResampleMethod::kNearest;
}

Interpolation::Interpolation(std::shared_ptr<PositionField> field, const RasterSource& source,
                             ResampleMethod method)
    : field_(std::move(field)), width_(source.Width()), height_(source.Height()), method_(method) {}

void Interpolation::Enter(const Window& window) {
  window_ = window;
  field_->Fill(window, x_, y_);
}

Window Interpolation::SourceOf(const Window& part) const {
  // Cubic convolution draws on two pixels to either side of a position.
  const double reach = method_ == ResampleMethod::kNearest ? 0.0 : 2.0;
  double left = width_;
  double right = 0;
  double top = height_;
  double bottom = 0;
  for (std::int64_t row = part.y; row < part.y + part.height; ++row) {
    const std::size_t first = Index(part.x, row);
    for (std::size_t i = first; i < first + static_cast<std::size_t>(part.width); ++i) {
      const bool inside = x_[i] >= 0 && x_[i] < width_ && y_[i] >= 0 && y_[i] < height_;
      left = inside ? std::min(left, x_[i]) : left;
      right = inside ? std::max(right, x_[i]) : right;
      top = inside ? std::min(top, y_[i]) : top;
      bottom = inside ? std::max(bottom, y_[i]) : bottom;
    }
  }
  if (left > right) return {};
  const auto x = static_cast<std::int64_t>(std::max(left - reach, 0.0));
  const auto y = static_cast<std::int64_t>(std::max(top - reach, 0.0));
  return {x, y, static_cast<std::int64_t>(std::min(right + reach + 1, width_)) - x,
          static_cast<std::int64_t>(std::min(bottom + reach + 1, height_)) - y};
}

void Interpolation::Move(const gobs::Raster& source, const std::uint8_t* mask,
                         const std::vector<double>& fill, gobs::Raster& output,
                         std::uint8_t* covered) {
  const std::size_t first = Index(output.OriginX(), output.OriginY());
  StoredPositions positions(x_.data() + first, y_.data() + first, window_.width,
                            {source.OriginX(), source.OriginY(), 0, 0});
  utils::ResampleBuffer destination = BufferOf(output, covered);
  utils::Resample(BufferOf(source, mask), destination, &positions,
                  {.method = method_, .hasNoData = !fill.empty(), .noDataPixel = fill});
}

}  // namespace zarn::app
