// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/attribute/labelraster.h"

#include <algorithm>

#include "processes/filters/framework/blockview.h"
#include "processes/filters/framework/sampletypes.h"
#if ZARN_SIMD
#include "processes/filters/framework/samplerows_simd.h"
#endif

namespace zarn::processes::filters {
namespace {

template <typename A>
class LabelRasterOf final : public LabelRaster {
 public:
  LabelRasterOf(const gobs::Raster& attr, std::ptrdiff_t scale, const LabelRule<A>& rule)
      : labels_(attr), scale_(scale), rule_(rule) {}

  bool Pools(std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t nx,
             std::ptrdiff_t ny) const override {
    return rule_.Pools(*Label(x, y), *Label(nx, ny));
  }

#if ZARN_SIMD
  std::size_t LabelSize() const override { return sizeof(A); }

  bool HasVectors() const override {
    return std::is_floating_point_v<A> || !(rule_.tolerance() < 0);
  }

  void ReadRow(std::ptrdiff_t x, std::ptrdiff_t y, std::size_t count, void* row) const override {
    auto* const labels = static_cast<A*>(row);
    const auto pixels = static_cast<std::ptrdiff_t>(count);
    if (scale_ == 1) {
      std::copy_n(Label(x, y), pixels, labels);
      return;
    }
    const A* label = Label(x, y);
    std::ptrdiff_t column = x / scale_;
    for (std::ptrdiff_t i = 0; i < pixels; ++column, ++label) {
      // Rounding towards zero, the pixels before the first share its label.
      const std::ptrdiff_t next = column < 0 ? column * scale_ + 1 : (column + 1) * scale_;
      for (const std::ptrdiff_t end = std::min(pixels, next - x); i < end; ++i) labels[i] = *label;
    }
  }

  bool FlagUnlabelled(const void* row, std::size_t count, std::uint8_t* flags) const override {
    const A noData = rule_.noData();
    return FlagExcluded(static_cast<const A*>(row), count, 1, &noData, nullptr, flags);
  }

  void FlagPools(const PoolRun& run) const override {
    if constexpr (std::is_floating_point_v<A>) {
      FlagNearLabels(run, rule_.tolerance());
    } else {
      using Unsigned = std::make_unsigned_t<A>;
      const auto tolerance = static_cast<Unsigned>(rule_.tolerance());
      const auto below = std::is_signed_v<A> ? tolerance : Unsigned{0};
      FlagNearLabels<Unsigned>(run, below, static_cast<Unsigned>(tolerance + below));
    }
  }
#endif

 private:
  const A* Label(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return labels_.Pixel(x / scale_, y / scale_);
  }

  BlockView<const A> labels_;
  std::ptrdiff_t scale_;
  LabelRule<A> rule_;
};

}  // namespace

LabelRaster::~LabelRaster() = default;

std::unique_ptr<LabelRaster> MakeLabelRaster(const gobs::Raster& attr, std::ptrdiff_t scale,
                                             double noData, double tolerance) {
  std::unique_ptr<LabelRaster> labels;
  VisitSampleType(gobs::GetDataTypeCode(attr), "", [&]<typename A>(std::type_identity<A>) {
    labels = std::make_unique<LabelRasterOf<A>>(attr, scale, LabelRule<A>(noData, tolerance));
    return FilterResult::Success();
  });
  return labels;
}

}  // namespace zarn::processes::filters
