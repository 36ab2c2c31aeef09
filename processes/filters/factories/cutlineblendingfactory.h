// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>

#include "processes/filters/cutline/polygonparam.h"
#include "processes/filters/factories/ifilterfactory.h"

class GDBGeometryIF;
class JOLTGeoref;

namespace zarn::processes::filters {

/// Makes the filters that paste a source into the mosaic along a cutline: `CutlineBlendingBase`
/// says what they do and what can be set on them.
class ZARN_FILTERS_EXPORT CutlineBlendingFactory : public IFilterFactory {
 public:
  /// Takes the arrays of `cutline` over without copying them: they come from array new, as those of
  /// `CreatePolygonParam` do. `blend` is the width of the band on each side, in pixels.
  CutlineBlendingFactory(const PolygonParam& cutline, unsigned int blend);
  /// Copies share the arrays, which are released with the last of them; so are, on assignment,
  /// those that were held before.
  CutlineBlendingFactory(const CutlineBlendingFactory& other);
  CutlineBlendingFactory& operator=(const CutlineBlendingFactory& other);
  ~CutlineBlendingFactory() override;

  /// A geometry in the raster coordinates of `georef`, fractional as they are, with its rings; the
  /// caller owns the arrays until a factory takes them over. Empty when either argument is null or
  /// the geometry has no vertices. A vertex that cannot be converted becomes NaN, and such a
  /// polygon admits no pixel.
  static PolygonParam CreatePolygonParam(GDBGeometryIF* geometry, JOLTGeoref* georef);

  unsigned int GetBlend() const { return blend_; }
  /// The whole pixels of the cutline's bounds widened by the blend width, held at 0 from below; all
  /// 0 without a cutline.
  void GetBoundingBox(unsigned int& minX, unsigned int& minY, unsigned int& maxX,
                      unsigned int& maxY) const;
  const PolygonParam& GetCutlineParam() const;
  const PolygonParam& GetTileParam() const;
  /// Replaces the tile polygon and takes its arrays over. Those of the previous one go back to the
  /// caller, unless a copy of the factory still holds them or they are the same.
  void SetTilePolygon(const PolygonParam& tile);

  /// Copies the polygons. The filter is always a `CutlineBlendingBase`; cast it statically to set
  /// what that offers.
  IFilter* GetCPUFilter() const override;

 private:
  struct OwnedPolygon;

  std::shared_ptr<OwnedPolygon> cutline_;
  std::shared_ptr<OwnedPolygon> tile_;
  std::uint32_t blend_;
  std::uint32_t minX_ = 0;
  std::uint32_t minY_ = 0;
  std::uint32_t maxX_ = 0;
  std::uint32_t maxY_ = 0;
};

}  // namespace zarn::processes::filters
