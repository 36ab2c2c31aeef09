// SPDX-License-Identifier: Apache-2.0
#include <gdal_priv.h>
#include <gtest/gtest.h>
#include <ogrsf_frmts.h>
#include <stdlib.h>

#include <array>
#include <cmath>
#include <cstddef>
#include <filesystem>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "apps/zarn/cutlinefile.h"
#include "apps/zarn/dataset.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/mosaic/cutlinewriter.h"
#include "apps/zarn/mosaic/seampolygons.h"

namespace zarn::app {
namespace {

namespace fs = std::filesystem;

constexpr WindowSize kLattice{40, 30};
constexpr double kCell = 3;
const std::vector<std::string> kNames{"a.tif", "it's \"b\".tif", "nowhere.tif", "d.tif"};

// Areas with holes, islands in them, and corners at which two parts of an area meet.
std::vector<ScenePolygon> Polygons() {
  std::mt19937 random(1);
  std::vector<std::uint32_t> labels;
  for (std::int64_t y = 0; y < kLattice.height; ++y) {
    for (std::int64_t x = 0; x < kLattice.width; ++x) {
      const double ring = std::hypot(static_cast<double>(x - 15), static_cast<double>(y - 14)) / 4;
      const bool isNoisy = x > 25 && random() % 3 == 0;
      labels.push_back(isNoisy ? 3 : static_cast<std::uint32_t>(ring) % 2);
    }
  }
  return SeamPolygons(labels, kLattice, kNames.size(), kCell, 1);
}

double AreaOf(const ScenePolygon& polygon) {
  double area = 0;
  for (const auto& ring : polygon.rings) area += RingArea(ring);
  return area;
}

OutputGrid GridOf(const std::array<double, 6>& transform) {
  OutputGrid grid{120, 90, transform, OGRSpatialReference()};
  grid.crs.importFromEPSG(32633);
  return grid;
}

const OutputGrid kNorthUp = GridOf({400000, 0.5, 0, 5200000, 0, -0.5});

RasterSource MosaicOn(const OutputGrid& grid) {
  DatasetPtr dataset(GetGDALDriverManager()->GetDriverByName("MEM")->Create(
      "", grid.width, grid.height, 1, GDT_Byte, nullptr));
  std::array<double, 6> transform = grid.transform;
  dataset->SetGeoTransform(transform.data());
  dataset->SetSpatialRef(&grid.crs);
  return {"mosaic", std::move(dataset)};
}

// In pixels; of all rings together, those of holes counting less.
double AreaOf(const RasterPolygon& polygon) {
  const auto& param = polygon.Param();
  double twice = 0;
  for (std::int32_t ring = 0; ring < param.parts[0]; ++ring) {
    const bool isLast = ring + 1 == param.parts[0];
    const auto end = isLast ? param.vertexCount : static_cast<std::uint32_t>(param.parts[ring + 2]);
    for (auto i = static_cast<std::uint32_t>(param.parts[ring + 1]); i + 1 < end; ++i) {
      const double* const v = param.vertices + 2 * static_cast<std::size_t>(i);
      twice += v[0] * v[3] - v[2] * v[1];
    }
  }
  return std::abs(twice / 2);
}

class CutlineWriterTest : public testing::Test {
 protected:
  void SetUp() override {
    GDALAllRegister();
    std::string name = (fs::temp_directory_path() / "zarncutlines-XXXXXX").string();
    ASSERT_NE(mkdtemp(name.data()), nullptr);
    folder_ = name;
    file_ = folder_ / "cutlines.gpkg";
  }
  void TearDown() override { fs::remove_all(folder_); }

  fs::path folder_;
  std::string file_;
};

TEST_F(CutlineWriterTest, WritesValidMultiPolygonsInOrder) {
  // North up, turned, and turned with south up, where numbers on the map run the same way as
  // pixels.
  for (const OutputGrid& grid : {kNorthUp, GridOf({400000, 0, -0.5, 5200000, -0.5, 0}),
                                 GridOf({0, 0.3, 0.4, 0, -0.4, 0.3})}) {
    const std::vector<ScenePolygon> polygons = Polygons();
    WriteCutlines(file_, true, grid, kNames, polygons);
    const DatasetPtr dataset(GDALDataset::Open(file_.c_str(), GDAL_OF_VECTOR));
    ASSERT_EQ(dataset->GetLayerCount(), 1);
    OGRLayer& layer = *dataset->GetLayerByName("cutlines");
    EXPECT_EQ(layer.GetGeomType(), wkbMultiPolygon);
    EXPECT_TRUE(layer.GetSpatialRef()->IsSame(&grid.crs));
    ASSERT_EQ(layer.GetFeatureCount(), 4);
    std::size_t i = 0;
    std::size_t holes = 0;
    for (const auto& feature : layer) {
      EXPECT_EQ(feature->GetFieldAsString("scene"), kNames[i]);
      EXPECT_EQ(feature->GetFieldAsInteger("order"), static_cast<int>(i) + 1);
      const OGRMultiPolygon& area = *feature->GetGeometryRef()->toMultiPolygon();
      EXPECT_TRUE(area.IsValid()) << i;
      EXPECT_NEAR(area.get_Area(), AreaOf(polygons[i]) * 0.25, 1e-4) << i;
      for (const OGRPolygon* const part : area) {
        EXPECT_FALSE(part->getExteriorRing()->isClockwise());
        for (int k = 0; k < part->getNumInteriorRings(); ++k, ++holes) {
          EXPECT_TRUE(part->getInteriorRing(k)->isClockwise());
        }
      }
      ++i;
    }
    EXPECT_GT(holes, 2u);
  }
}

TEST_F(CutlineWriterTest, ComesBackAsTheSameAreas) {
  const std::vector<ScenePolygon> polygons = Polygons();
  WriteCutlines(file_, false, kNorthUp, kNames, polygons);
  const RasterSource mosaic = MosaicOn(kNorthUp);
  const std::string conditions[] = {"scene = 'a.tif'", "scene LIKE 'it''s%'", "", "\"order\" = 4"};
  for (const std::size_t i : {0, 1, 3}) {
    const RasterPolygon polygon = LoadCutline({file_, "", conditions[i]}, mosaic);
    EXPECT_NEAR(AreaOf(polygon), AreaOf(polygons[i]), 1e-6) << i;
  }
  EXPECT_NEAR(AreaOf(LoadCutline({file_, "", ""}, mosaic)), 120 * 90, 1e-6);
}

TEST_F(CutlineWriterTest, LeavesAnExistingFileUnlessAsked) {
  const std::vector<ScenePolygon> polygons = Polygons();
  WriteCutlines(file_, false, kNorthUp, kNames, polygons);
  EXPECT_THROW(WriteCutlines(file_, false, kNorthUp, {"new"}, {polygons[0]}), RunError);
  WriteCutlines(file_, true, kNorthUp, {"new"}, {polygons[0]});
  const DatasetPtr dataset(GDALDataset::Open(file_.c_str(), GDAL_OF_VECTOR));
  EXPECT_EQ(dataset->GetLayer(0)->GetFeatureCount(), 1);
  EXPECT_EQ(std::distance(fs::directory_iterator(folder_), {}), 1);
  EXPECT_THROW(WriteCutlines(folder_ / "none" / "c.gpkg", false, kNorthUp, {"new"}, {polygons[0]}),
               RunError);
}

}  // namespace
}  // namespace zarn::app
