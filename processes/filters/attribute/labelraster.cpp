// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/attribute/labelraster.h"

#include "processes/filters/framework/blockview.h"
#include "processes/filters/framework/sampletypes.h"

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
