// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/cutlinefile.h"

#include <cpl_error.h>
#include <ogr_geometry.h>
#include <ogr_spatialref.h>
#include <ogrsf_frmts.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <limits>
#include <utility>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/gdalruntime.h"
#include "host/ogc/cs/joltgeoref.h"
#include "host/vector/gdbgeometryif.h"
#include "processes/filters/factories/cutlineblendingfactory.h"

namespace zarn::app {
namespace {

using processes::filters::PolygonParam;

struct Point {
  double x;
  double y;

  bool operator==(const Point&) const = default;
};
using Ring = std::vector<Point>;
using GeometryPtr = std::unique_ptr<OGRGeometry>;

/// Rings as the library takes polygons from its host.
class RingGeometry : public GDBGeometryIF {
 public:
  explicit RingGeometry(const std::vector<Ring>& rings)
      : parts_{static_cast<std::int32_t>(rings.size())} {
    for (const Ring& ring : rings) {
      parts_.push_back(static_cast<std::int32_t>(vertices_.size() / 3));
      for (const Point& p : ring) vertices_.insert(vertices_.end(), {p.x, p.y, 0.0});
    }
  }

  std::int32_t GeometryType() const override { return kPolygon; }
  const double* Vertices() const override { return vertices_.data(); }
  std::uint32_t VertexCount() const override {
    return static_cast<std::uint32_t>(vertices_.size() / 3);
  }
  const std::int32_t* Parts() const override { return parts_.data(); }

 private:
  static constexpr std::int32_t kPolygon = 4;

  std::vector<double> vertices_;
  std::vector<std::int32_t> parts_;
};

class GroundGeoref : public JOLTGeoref {
 public:
  explicit GroundGeoref(const Ground& ground) : ground_(ground) {}

  bool GeorefToRaster(double x, double y, double* column, double* line) const override {
    *column = ground_.Column(x, y);
    *line = ground_.Row(x, y);
    return std::isfinite(*column) && std::isfinite(*line);
  }

 private:
  const Ground& ground_;
};

std::string LayerNames(GDALDataset& dataset) {
  std::string names;
  for (OGRLayer* const layer : dataset.GetLayers()) {
    names += (names.empty() ? "" : ", ") + std::string(layer->GetName());
  }
  return names;
}

[[noreturn]] void RefuseCondition(const CutlineRequest& request) {
  throw UsageError("--where: '" + request.where + "' does not work on " + request.file + ": " +
                   LastGdalMessage(request.file));
}

OGRLayer& PickLayer(GDALDataset& dataset, const CutlineRequest& request) {
  if (dataset.GetLayerCount() == 0) throw RunError(request.file + " has no vector layers");
  if (request.layer.empty() && dataset.GetLayerCount() > 1) {
    throw UsageError(request.file +
                     " has several layers; name one of them with --layer: " + LayerNames(dataset));
  }
  OGRLayer* const layer =
      request.layer.empty() ? dataset.GetLayer(0) : dataset.GetLayerByName(request.layer.c_str());
  if (layer == nullptr) {
    throw UsageError("--layer: " + request.file + " has no layer '" + request.layer +
                     "', but: " + LayerNames(dataset));
  }
  if (!request.where.empty()) {
    CPLErrorReset();
    if (layer->SetAttributeFilter(request.where.c_str()) != OGRERR_NONE) RefuseCondition(request);
  }
  return *layer;
}

/// Collects the rings of one feature, whatever its polygons are wrapped in.
class RingCollector {
 public:
  explicit RingCollector(std::string feature) : feature_(std::move(feature)) {}

  void Add(const OGRGeometry& geometry) {
    switch (wkbFlatten(geometry.getGeometryType())) {
      case wkbPolygon:
        for (const OGRLinearRing* const ring : *geometry.toPolygon()) AddRing(*ring);
        return;
      case wkbMultiPolygon:
      case wkbGeometryCollection:
        for (const OGRGeometry* const part : *geometry.toGeometryCollection()) Add(*part);
        return;
      default:
        throw RunError(feature_ + " is a " + geometry.getGeometryName() +
                       "; a cutline is made of polygons");
    }
  }

  std::vector<Ring> TakeRings() { return std::move(rings_); }

 private:
  void AddRing(const OGRLinearRing& line) {
    Ring ring;
    for (int i = 0; i < line.getNumPoints(); ++i) {
      const Point p{line.getX(i), line.getY(i)};
      if (!std::isfinite(p.x) || !std::isfinite(p.y)) {
        throw RunError(feature_ +
                       " has a vertex that is not finite; repair it with ogr2ogr or in "
                       "an editor");
      }
      if (ring.empty() || ring.back() != p) ring.push_back(p);
    }
    if (ring.size() > 1 && ring.front() == ring.back()) ring.pop_back();
    if (ring.size() < 3) {
      Warn(feature_ + " has a ring of fewer than three points, which is left out");
      return;
    }
    ring.push_back(ring.front());
    rings_.push_back(std::move(ring));
  }

  std::string feature_;
  std::vector<Ring> rings_;
};

struct Bounds {
  Point low{std::numeric_limits<double>::infinity(), std::numeric_limits<double>::infinity()};
  Point high{-low.x, -low.y};

  void Include(const Point& p) {
    low = {std::min(low.x, p.x), std::min(low.y, p.y)};
    high = {std::max(high.x, p.x), std::max(high.y, p.y)};
  }
  bool Meets(const Bounds& other) const {
    return low.x <= other.high.x && other.low.x <= high.x && low.y <= other.high.y &&
           other.low.y <= high.y;
  }
};

bool MayTouch(const std::vector<std::vector<Ring>>& features) {
  std::vector<Bounds> bounds(features.size());
  for (std::size_t i = 0; i < features.size(); ++i) {
    for (const Ring& ring : features[i]) {
      for (const Point& p : ring) bounds[i].Include(p);
    }
  }
  // From left to right, so that each is compared with those only that begin before it ends.
  std::sort(bounds.begin(), bounds.end(),
            [](const Bounds& a, const Bounds& b) { return a.low.x < b.low.x; });
  for (std::size_t i = 0; i < bounds.size(); ++i) {
    for (std::size_t k = i + 1; k < bounds.size() && bounds[k].low.x <= bounds[i].high.x; ++k) {
      if (bounds[i].Meets(bounds[k])) return true;
    }
  }
  return false;
}

// A feature as what GEOS takes for valid, by the even-odd rule.
GeometryPtr ValidGeometry(const std::vector<Ring>& rings) {
  OGRMultiPolygon polygons;
  OGRPolygon polygon;
  for (const Ring& ring : rings) {
    OGRLinearRing line;
    for (const Point& p : ring) line.addPoint(p.x, p.y);
    polygon.addRing(&line);
  }
  return GeometryPtr(polygon.MakeValid());
}

std::vector<Ring> United(const std::vector<std::vector<Ring>>& features, const std::string& file) {
  if (features.size() == 1 || !MayTouch(features)) {
    std::vector<Ring> rings;
    for (const auto& feature : features) rings.insert(rings.end(), feature.begin(), feature.end());
    return rings;
  }
  const auto require = [&](const GeometryPtr& geometry) {
    if (geometry) return;
    throw RunError("cannot unite the features of " + file + ": " + LastGdalMessage(file));
  };
  CPLErrorReset();
  OGRMultiPolygon all;
  for (const auto& feature : features) {
    GeometryPtr area = ValidGeometry(feature);
    require(area);
    // Lines and points are left where rings fold up to nothing.
    area.reset(OGRGeometryFactory::forceToMultiPolygon(area.release()));
    if (wkbFlatten(area->getGeometryType()) != wkbMultiPolygon) continue;
    for (const OGRPolygon* const polygon : *area->toMultiPolygon()) all.addGeometry(polygon);
  }
  const GeometryPtr area(all.UnionCascaded());
  require(area);
  RingCollector collector("the united area of " + file);
  if (!area->IsEmpty()) collector.Add(*area);
  return collector.TakeRings();
}

std::vector<Ring> ReadRings(OGRLayer& layer, const CutlineRequest& request) {
  std::vector<std::vector<Ring>> features;
  CPLErrorReset();
  for (const auto& feature : layer) {
    const OGRGeometry* const geometry = feature->GetGeometryRef();
    if (geometry == nullptr || geometry->IsEmpty()) continue;
    RingCollector collector("feature " + std::to_string(feature->GetFID()) + " of " + request.file);
    // Arcs become chains of edges.
    const GeometryPtr straight(geometry->getLinearGeometry());
    collector.Add(*straight);
    std::vector<Ring> rings = collector.TakeRings();
    if (!rings.empty()) features.push_back(std::move(rings));
  }
  if (CPLGetLastErrorType() == CE_Failure) {
    // Databases find out only now.
    if (!request.where.empty()) RefuseCondition(request);
    throw RunError("cannot read " + request.file + ": " + LastGdalMessage(request.file));
  }
  std::vector<Ring> rings;
  if (!features.empty()) rings = United(features, request.file);
  if (rings.empty()) {
    throw RunError(request.file + ", layer " + layer.GetName() + ", has no polygon" +
                   (request.where.empty() ? "" : " that meets --where '" + request.where + "'"));
  }
  return rings;
}

/// Brings rings into the coordinate system of a mosaic.
class Reprojection {
 public:
  Reprojection(const OGRSpatialReference& from, const OGRSpatialReference& to, const Ground& ground,
               std::string failure)
      : ground_(ground), failure_(std::move(failure)) {
    const auto clone = [](const OGRSpatialReference& system) {
      OGRSpatialReference copy(system);
      copy.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
      return copy;
    };
    const OGRSpatialReference source = clone(from);
    const OGRSpatialReference target = clone(to);
    CPLErrorReset();
    transformation_.reset(OGRCreateCoordinateTransformation(&source, &target));
    if (!transformation_) throw RunError(failure_ + ": " + LastGdalMessage());
  }

  /// Straight edges become chains that stay within an eighth of a pixel of their true course.
  Ring operator()(const Ring& ring) const {
    std::vector<Pair> pairs(ring.size());
    for (std::size_t i = 0; i < ring.size(); ++i) pairs[i].from = ring[i];
    Convert(pairs);
    // All edges are halved at once, as often as one of them needs it.
    constexpr int kMostHalvings = 16;
    for (int i = 0; i < kMostHalvings && Refine(pairs); ++i) {
    }
    Ring result;
    for (const Pair& pair : pairs) result.push_back(pair.to);
    result.back() = result.front();
    return result;
  }

 private:
  struct Pair {
    Point from;
    Point to;
    bool settled = false;  ///< the edge from here on is near enough
  };

  void Convert(std::vector<Pair>& pairs) const {
    std::vector<double> x;
    std::vector<double> y;
    for (const Pair& pair : pairs) {
      x.push_back(pair.from.x);
      y.push_back(pair.from.y);
    }
    CPLErrorReset();
    const bool converted = transformation_->Transform(static_cast<int>(x.size()), x.data(),
                                                      y.data(), nullptr) != FALSE;
    for (std::size_t i = 0; i < pairs.size(); ++i) {
      if (!converted || !std::isfinite(x[i]) || !std::isfinite(y[i])) {
        throw RunError(failure_ + ": " + LastGdalMessage());
      }
      pairs[i].to = {x[i], y[i]};
    }
  }

  bool Refine(std::vector<Pair>& pairs) const {
    // Off the middle, where the two arcs of an S do not meet the edge.
    constexpr double kPart = 0.4;
    const auto between = [](const Point& a, const Point& b) {
      return Point{a.x + kPart * (b.x - a.x), a.y + kPart * (b.y - a.y)};
    };
    std::vector<Pair> inner;
    for (std::size_t i = 0; i + 1 < pairs.size(); ++i) {
      if (!pairs[i].settled) inner.push_back({between(pairs[i].from, pairs[i + 1].from), {}});
    }
    if (inner.empty()) return false;
    Convert(inner);
    std::vector<Pair> refined;
    auto next = inner.begin();
    for (std::size_t i = 0; i < pairs.size(); ++i) {
      refined.push_back(pairs[i]);
      if (i + 1 == pairs.size() || pairs[i].settled) continue;
      if (PixelsApart(next->to, between(pairs[i].to, pairs[i + 1].to)) <= kTolerance) {
        refined.back().settled = true;
      } else {
        refined.push_back(*next);
      }
      ++next;
    }
    pairs = std::move(refined);
    return true;
  }

  double PixelsApart(const Point& a, const Point& b) const {
    return std::hypot(ground_.Column(a.x, a.y) - ground_.Column(b.x, b.y),
                      ground_.Row(a.x, a.y) - ground_.Row(b.x, b.y));
  }

  static constexpr double kTolerance = 0.125;

  const Ground& ground_;
  std::string failure_;
  std::unique_ptr<OGRCoordinateTransformation> transformation_;
};

void Reproject(OGRLayer& layer, const CutlineRequest& request, const RasterSource& mosaic,
               const Ground& ground, std::vector<Ring>& rings) {
  const OGRSpatialReference* const from = layer.GetSpatialRef();
  const OGRSpatialReference* const to = mosaic.Dataset().GetSpatialRef();
  if (from == nullptr || to == nullptr || SameSystem(*from, *to)) return;
  const Reprojection reproject(
      *from, *to, ground,
      "cannot bring " + request.file + " into the coordinate system of " + mosaic.Name());
  for (Ring& ring : rings) ring = reproject(ring);
}

}  // namespace

RasterPolygon::RasterPolygon(const PolygonParam& polygon)
    : vertices_(polygon.vertices), parts_(polygon.parts), param_(polygon) {}

PolygonParam RasterPolygon::Release() {
  vertices_.release();
  parts_.release();
  return param_;
}

Window RasterPolygon::PixelsWithin(WindowSize raster, std::int64_t reach) const {
  Bounds bounds;
  for (std::size_t i = 0; i < param_.vertexCount; ++i) {
    bounds.Include({param_.vertices[2 * i], param_.vertices[2 * i + 1]});
  }
  // One pixel more, so that no rounding matters.
  const auto margin = static_cast<double>(reach + 1);
  const auto held = [](double value, std::int64_t limit) {
    return static_cast<std::int64_t>(std::clamp(value, 0.0, static_cast<double>(limit)));
  };
  const std::int64_t x = held(std::floor(bounds.low.x - margin), raster.width);
  const std::int64_t y = held(std::floor(bounds.low.y - margin), raster.height);
  return {x, y, held(std::ceil(bounds.high.x + margin), raster.width) - x,
          held(std::ceil(bounds.high.y + margin), raster.height) - y};
}

RasterPolygon LoadCutline(const CutlineRequest& request, const RasterSource& mosaic) {
  CPLErrorReset();
  const DatasetPtr dataset(GDALDataset::Open(
      request.file.c_str(), GDAL_OF_VECTOR | GDAL_OF_READONLY | GDAL_OF_VERBOSE_ERROR));
  if (!dataset) {
    throw RunError("cannot open " + request.file + ": " + LastGdalMessage(request.file));
  }
  OGRLayer& layer = PickLayer(*dataset, request);
  const Ground ground(mosaic);
  std::vector<Ring> rings = ReadRings(layer, request);
  Reproject(layer, request, mosaic, ground, rings);
  std::size_t vertices = 0;
  for (const Ring& ring : rings) vertices += ring.size();
  if (vertices > std::numeric_limits<std::int32_t>::max()) {
    throw RunError(request.file + " has more than 2147483647 vertices; simplify it with ogr2ogr");
  }
  RingGeometry geometry(rings);
  GroundGeoref georef(ground);
  return RasterPolygon(
      processes::filters::CutlineBlendingFactory::CreatePolygonParam(&geometry, &georef));
}

}  // namespace zarn::app
