// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/cutlineblendingfactory.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdlib>
#include <limits>

#include "host/gobs/saturatecast.h"
#include "host/ogc/cs/joltgeoref.h"
#include "host/vector/gdbgeometryif.h"
#include "processes/filters/cutline/cutlineblending.h"

namespace zarn::processes::filters {

struct CutlineBlendingFactory::OwnedPolygon {
  explicit OwnedPolygon(const PolygonParam& polygon) : param(polygon) {}
  OwnedPolygon(const OwnedPolygon&) = delete;
  OwnedPolygon& operator=(const OwnedPolygon&) = delete;
  ~OwnedPolygon() {
    delete[] param.vertices;
    delete[] param.parts;
  }

  PolygonParam param;
};

namespace {

std::uint32_t WholePixel(double value) {
  return value > 0.0 ? gobs::SaturateCast<std::uint32_t>(std::floor(value)) : 0;
}

}  // namespace

CutlineBlendingFactory::CutlineBlendingFactory(const PolygonParam& cutline, unsigned int blend)
    : cutline_(std::make_shared<OwnedPolygon>(cutline)),
      tile_(std::make_shared<OwnedPolygon>(PolygonParam{})),
      blend_(blend) {
  if (!cutline.Exists()) return;
  const double* const vertices = cutline.vertices;
  double lowX = vertices[0];
  double lowY = vertices[1];
  double highX = lowX;
  double highY = lowY;
  for (std::size_t i = 1; i < cutline.vertexCount; ++i) {
    lowX = std::min(lowX, vertices[2 * i]);
    lowY = std::min(lowY, vertices[2 * i + 1]);
    highX = std::max(highX, vertices[2 * i]);
    highY = std::max(highY, vertices[2 * i + 1]);
  }
  minX_ = WholePixel(lowX + 0.5 - blend);
  minY_ = WholePixel(lowY + 0.5 - blend);
  maxX_ = WholePixel(highX + 0.5 + blend);
  maxY_ = WholePixel(highY + 0.5 + blend);
}

CutlineBlendingFactory::CutlineBlendingFactory(const CutlineBlendingFactory& other) = default;
CutlineBlendingFactory& CutlineBlendingFactory::operator=(const CutlineBlendingFactory& other) =
    default;
CutlineBlendingFactory::~CutlineBlendingFactory() = default;

PolygonParam CutlineBlendingFactory::CreatePolygonParam(GDBGeometryIF* geometry,
                                                        JOLTGeoref* georef) {
  if (geometry == nullptr || georef == nullptr) return {};
  struct Shape : GDBShape {
    Shape() = default;
    Shape(const Shape&) = delete;
    Shape& operator=(const Shape&) = delete;
    ~Shape() {
      std::free(vertices);
      std::free(parts);
    }
  };
  Shape shape;
  const bool convert = geometry->GeometryType() == GDBGeometryIF::kNeedsConversion;
  if (convert) ConvertGeometryToGDBShape(geometry, &shape);
  const double* const vertices = convert ? shape.vertices : geometry->Vertices();
  const std::uint32_t count = convert ? shape.vertexCount : geometry->VertexCount();
  const std::int32_t* const parts = convert ? shape.parts : geometry->Parts();
  if (vertices == nullptr || count == 0) return {};

  auto converted = std::make_unique<double[]>(2 * std::size_t{count});
  for (std::size_t i = 0; i < count; ++i) {
    double* const at = converted.get() + 2 * i;
    at[0] = at[1] = std::numeric_limits<double>::quiet_NaN();
    georef->GeorefToRaster(vertices[3 * i], vertices[3 * i + 1], at, at + 1);
  }
  PolygonParam polygon{.vertexCount = count};
  if (parts != nullptr) {
    const auto length = static_cast<std::size_t>(std::max(parts[0], 0)) + 1;
    polygon.parts = new std::int32_t[length];
    std::copy_n(parts, length, polygon.parts);
  }
  polygon.vertices = converted.release();
  return polygon;
}

void CutlineBlendingFactory::GetBoundingBox(unsigned int& minX, unsigned int& minY,
                                            unsigned int& maxX, unsigned int& maxY) const {
  minX = minX_;
  minY = minY_;
  maxX = maxX_;
  maxY = maxY_;
}

const PolygonParam& CutlineBlendingFactory::GetCutlineParam() const { return cutline_->param; }

const PolygonParam& CutlineBlendingFactory::GetTileParam() const { return tile_->param; }

void CutlineBlendingFactory::SetTilePolygon(const PolygonParam& tile) {
  // Arrays that copies share have an owner already.
  const PolygonParam& held = tile_->param;
  if (tile.Exists() && tile.vertices == held.vertices && tile.parts == held.parts) return;
  auto next = std::make_shared<OwnedPolygon>(tile);
  if (tile_.use_count() == 1) tile_->param = {};
  tile_ = std::move(next);
}

IFilter* CutlineBlendingFactory::GetCPUFilter() const {
  auto filter = std::make_unique<CPUCutlineBlending>(cutline_->param, blend_);
  filter->SetTileShape(tile_->param);
  return filter.release();
}

}  // namespace zarn::processes::filters
