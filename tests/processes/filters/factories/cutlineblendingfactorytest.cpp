// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstdlib>
#include <memory>
#include <vector>

#include "host/ogc/cs/joltgeoref.h"
#include "host/vector/gdbgeometryif.h"
#include "processes/filters/cutline/cutlineblendingbase.h"
#include "processes/filters/factories/cutlineblendingfactory.h"

namespace zarn::processes::filters {
namespace {

using Box = std::array<unsigned, 4>;

PolygonParam Owned(const std::vector<double>& vertices) {
  auto* const copy = new double[vertices.size()];
  std::copy(vertices.begin(), vertices.end(), copy);
  return {.vertices = copy, .vertexCount = static_cast<std::uint32_t>(vertices.size() / 2)};
}

Box BoxOf(const CutlineBlendingFactory& factory) {
  Box box = {9, 9, 9, 9};
  factory.GetBoundingBox(box[0], box[1], box[2], box[3]);
  return box;
}

TEST(CutlineBlendingFactory, BoundsAreWidenedAndHeldAtZero) {
  const std::vector<double> square = {10.4, 20.6, 30.5, 20.6, 30.5, 40.2, 10.4, 20.6};
  EXPECT_EQ(BoxOf({Owned(square), 0}), (Box{10, 21, 31, 40}));
  EXPECT_EQ(BoxOf({Owned(square), 5}), (Box{5, 16, 36, 45}));
  EXPECT_EQ(BoxOf({Owned(square), 4000000000U}), (Box{0, 0, 4000000031U, 4000000040U}));
  EXPECT_EQ(BoxOf({Owned({-9.0, -2.0, -8.0, 0.1}), 0}), (Box{0, 0, 0, 0}));
  EXPECT_EQ(BoxOf({Owned({1e300, 3, 4, 3}), 0}), (Box{4, 3, 4294967295U, 3}));
  EXPECT_EQ(BoxOf({PolygonParam{}, 7}), (Box{0, 0, 0, 0}));
}

class Geometry : public GDBGeometryIF {
 public:
  std::int32_t GeometryType() const override { return type; }
  const double* Vertices() const override { return vertices.data(); }
  std::uint32_t VertexCount() const override {
    return static_cast<std::uint32_t>(vertices.size() / 3);
  }
  const std::int32_t* Parts() const override { return parts.empty() ? nullptr : parts.data(); }
  void FillShape(GDBShape& shape) const override {
    // Other vertices than the plain arrays, to see which are taken.
    shape.vertexCount = 1;
    shape.vertices = static_cast<double*>(std::calloc(3, sizeof(double)));
    shape.vertices[0] = 1000;
    shape.parts = static_cast<std::int32_t*>(std::calloc(2, sizeof(std::int32_t)));
    shape.parts[0] = 1;
  }

  std::int32_t type = 5;
  std::vector<double> vertices = {100, 200, 7, 110, 200, 7, 666, 1, 7};
  std::vector<std::int32_t> parts = {2, 0, 2};
};

class Georef : public JOLTGeoref {
 public:
  bool GeorefToRaster(double x, double y, double* column, double* line) const override {
    if (x == 666) return false;
    *column = (x - 90) / 4;
    *line = (300 - y) / 8;
    return true;
  }
};

TEST(CutlineBlendingFactory, MakesPolygonsOfGeometries) {
  Geometry geometry;
  Georef georef;
  const auto create = [&] {
    const PolygonParam made = CutlineBlendingFactory::CreatePolygonParam(&geometry, &georef);
    return CutlineBlendingFactory(made, 0);
  };
  {
    const CutlineBlendingFactory factory = create();
    const PolygonParam& polygon = factory.GetCutlineParam();
    ASSERT_EQ(polygon.vertexCount, 3U);
    EXPECT_EQ(std::vector<double>(polygon.vertices, polygon.vertices + 4),
              (std::vector<double>{2.5, 12.5, 5, 12.5}));
    EXPECT_TRUE(std::isnan(polygon.vertices[4]) && std::isnan(polygon.vertices[5]));
    EXPECT_EQ(std::vector<std::int32_t>(polygon.parts, polygon.parts + 3), geometry.parts);
  }
  geometry.parts.clear();
  EXPECT_EQ(create().GetCutlineParam().parts, nullptr);
  geometry.type = 7;
  {
    const CutlineBlendingFactory factory = create();
    ASSERT_EQ(factory.GetCutlineParam().vertexCount, 1U);
    EXPECT_EQ(factory.GetCutlineParam().vertices[0], 227.5);
    ASSERT_NE(factory.GetCutlineParam().parts, nullptr);
    EXPECT_EQ(factory.GetCutlineParam().parts[0], 1);
  }
  EXPECT_FALSE(CutlineBlendingFactory::CreatePolygonParam(nullptr, &georef).Exists());
  EXPECT_FALSE(CutlineBlendingFactory::CreatePolygonParam(&geometry, nullptr).Exists());
}

TEST(CutlineBlendingFactory, FiltersAndCopiesOutliveEachOther) {
  const std::vector<double> square = {2, 2, 8, 2, 8, 8, 2, 8, 2, 2};
  std::unique_ptr<IFilter> filter;
  {
    CutlineBlendingFactory copy(PolygonParam{}, 1);
    {
      CutlineBlendingFactory factory(Owned(square), 0);
      copy = factory;
      const PolygonParam first = Owned({4, 0, 9, 0, 9, 9, 4, 9, 4, 0});
      factory.SetTilePolygon(first);
      EXPECT_EQ(factory.GetTileParam().vertices, first.vertices);
      factory.SetTilePolygon(Owned({5, 0, 9, 0, 9, 9, 5, 9, 5, 0}));
      delete[] first.vertices;  // replaced, so they are ours again
      copy = factory;
    }
    EXPECT_EQ(copy.GetBlend(), 0U);
    EXPECT_EQ(BoxOf(copy), (Box{2, 2, 8, 8}));
    filter.reset(copy.GetCUDAFilter());
  }
  int start = 0;
  int end = 0;
  auto* const blending = dynamic_cast<CutlineBlendingBase*>(filter.get());
  ASSERT_NE(blending, nullptr);
  blending->GetStartEndY(start, end);
  EXPECT_EQ(start, 2);
  EXPECT_EQ(end, 9);
  const gobs::RasterInfo info(10, 10, 1, gobs::NativeDataTypeCode::kUInt8);
  gobs::Raster source(info);
  gobs::Raster mosaic(info);
  std::fill_n(static_cast<std::uint8_t*>(source.Data()), 100, 1);
  ASSERT_TRUE(filter->Process(source, mosaic, 0, 0, nullptr).Ok());
  const auto* const pixels = static_cast<const std::uint8_t*>(mosaic.Data());
  EXPECT_EQ(std::count(pixels, pixels + 100, 1), 3 * 6);
}

}  // namespace
}  // namespace zarn::processes::filters
