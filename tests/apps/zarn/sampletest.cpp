// SPDX-License-Identifier: Apache-2.0
#include <cpl_json.h>
#include <gtest/gtest.h>
#include <ogrsf_frmts.h>
#include <stdlib.h>

#include <CLI/CLI.hpp>
#include <array>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/sample.h"

namespace zarn::app {
namespace {

namespace fs = std::filesystem;

const std::set<std::string> kNames{"truth_u8.tif",   "truth_u16.tif", "scene1_u8.tif",
                                   "scene1_u16.tif", "scene2_u8.tif", "scene2_u16.tif",
                                   "cutline.gpkg",   "sample.json"};

void RunSample(const std::string& arguments) {
  CLI::App app("test", "zarn");
  AddSampleCommand(app);
  app.parse("sample -q " + arguments);
}

std::string Contents(const fs::path& file) {
  std::ifstream stream(file, std::ios::binary);
  return {std::istreambuf_iterator<char>(stream), {}};
}

std::set<std::string> NamesIn(const fs::path& folder) {
  std::set<std::string> names;
  for (const auto& entry : fs::directory_iterator(folder)) names.insert(entry.path().filename());
  return names;
}

fs::path MakeFolder() {
  std::string name = (fs::temp_directory_path() / "zarnsample-XXXXXX").string();
  return mkdtemp(name.data()) == nullptr ? fs::path() : fs::path(name);
}

void ExpectRastersGeoreferencedAndDescribed(const fs::path& folder) {
  struct Expected {
    const char* name;
    GDALDataType type;
    int width;
    int height;
    double easting;
    double northing;
    bool hasNoData;
  };
  const Expected rasters[] = {
      {"truth_u8.tif", GDT_Byte, 2352, 1240, 512000, 5391000, false},
      {"truth_u16.tif", GDT_UInt16, 2352, 1240, 512000, 5391000, false},
      {"scene1_u8.tif", GDT_Byte, 1500, 1240, 512000, 5391000, true},
      {"scene1_u16.tif", GDT_UInt16, 1500, 1240, 512000, 5391000, true},
      {"scene2_u8.tif", GDT_Byte, 1500, 1160, 512852, 5390960, true},
      {"scene2_u16.tif", GDT_UInt16, 1500, 1160, 512852, 5390960, true},
  };
  for (const Expected& expected : rasters) {
    SCOPED_TRACE(expected.name);
    const DatasetPtr dataset = OpenRaster((folder / expected.name).string());
    EXPECT_EQ(dataset->GetRasterXSize(), expected.width);
    EXPECT_EQ(dataset->GetRasterYSize(), expected.height);
    std::array<double, 6> transform{};
    ASSERT_EQ(dataset->GetGeoTransform(transform.data()), CE_None);
    EXPECT_EQ(transform, (std::array<double, 6>{expected.easting, 1, 0, expected.northing, 0, -1}));
    EXPECT_STREQ(dataset->GetSpatialRef()->GetAuthorityCode(nullptr), "32633");
    ASSERT_EQ(dataset->GetRasterCount(), 3);
    const char* const names[] = {"red", "green", "blue"};
    for (int band = 1; band <= 3; ++band) {
      GDALRasterBand& target = *dataset->GetRasterBand(band);
      EXPECT_EQ(target.GetRasterDataType(), expected.type);
      EXPECT_EQ(target.GetColorInterpretation(), GCI_RedBand + band - 1);
      EXPECT_STREQ(target.GetDescription(), names[band - 1]);
      int hasNoData = 0;
      EXPECT_EQ(target.GetNoDataValue(&hasNoData), 0.0);
      EXPECT_EQ(hasNoData != 0, expected.hasNoData);
      // Nothing is written beside the file to compute this.
      std::array<double, 2> range{};
      ASSERT_EQ(target.ComputeRasterMinMax(FALSE, range.data()), CE_None);
      EXPECT_GT(range[0], 0.0);
      EXPECT_GT(range[1], expected.type == GDT_Byte ? 150.0 : 2400.0);
      EXPECT_LT(range[1], 4096.0);
    }
  }
}

void ExpectReadableCutlineAndParameters(const fs::path& folder) {
  const DatasetPtr vectors(GDALDataset::Open((folder / "cutline.gpkg").c_str(), GDAL_OF_VECTOR));
  ASSERT_NE(vectors, nullptr);
  OGRLayer* const layer = vectors->GetLayerByName("cutline");
  ASSERT_NE(layer, nullptr);
  EXPECT_STREQ(layer->GetSpatialRef()->GetAuthorityCode(nullptr), "32633");
  ASSERT_EQ(layer->GetFeatureCount(), 1);
  const OGRFeatureUniquePtr feature(layer->GetNextFeature());
  EXPECT_STREQ(feature->GetFieldAsString("scene"), "scene2");
  EXPECT_TRUE(feature->GetGeometryRef()->IsValid());
  EXPECT_EQ(wkbFlatten(feature->GetGeometryRef()->getGeometryType()), wkbPolygon);

  CPLJSONDocument document;
  ASSERT_TRUE(document.Load((folder / "sample.json").string()));
  const CPLJSONArray scenes = document.GetRoot().GetArray("scenes");
  ASSERT_EQ(scenes.Size(), 4);
  // The 16-bit pictures are 16 times finer; gains and places are the same.
  for (const int scene : {0, 2}) {
    EXPECT_EQ(scenes[scene + 1].GetArray("gain")[0].ToDouble(),
              scenes[scene].GetArray("gain")[0].ToDouble());
    EXPECT_EQ(scenes[scene + 1].GetArray("offset")[2].ToDouble(),
              16.0 * scenes[scene].GetArray("offset")[2].ToDouble());
    EXPECT_EQ(scenes[scene + 1].GetArray("hot_spot/centre")[1].ToDouble(),
              scenes[scene].GetArray("hot_spot/centre")[1].ToDouble());
  }
}

class SampleCommand : public testing::Test {
 protected:
  void SetUp() override {
    GDALAllRegister();
    ASSERT_FALSE(root_.empty());
  }
  void TearDown() override { fs::remove_all(root_); }

  const fs::path root_ = MakeFolder();
};

TEST_F(SampleCommand, WritesTheWholeSetOnceAndAgain) {
  const fs::path folder = root_ / "new" / "sample";
  RunSample(folder.string());
  ASSERT_EQ(NamesIn(folder), kNames);
  EXPECT_EQ(NamesIn(folder.parent_path()), std::set<std::string>{"sample"});
  ExpectRastersGeoreferencedAndDescribed(folder);
  ExpectReadableCutlineAndParameters(folder);

  std::map<std::string, std::string> first;
  for (const std::string& name : kNames) first[name] = Contents(folder / name);
  RunSample("--overwrite --seed 3 " + folder.string());
  for (const std::string& name : kNames) {
    EXPECT_TRUE(Contents(folder / name) == first[name]) << name;
  }
  EXPECT_EQ(NamesIn(folder), kNames);
}

TEST_F(SampleCommand, LeavesExistingFilesAlone) {
  std::ofstream(root_ / "scene2_u8.tif") << "mine";
  try {
    RunSample(root_.string());
    FAIL() << "wrote over a file";
  } catch (const RunError& error) {
    EXPECT_EQ(error.what(),
              (root_ / "scene2_u8.tif").string() + " exists; add --overwrite to replace it");
  }
  EXPECT_EQ(NamesIn(root_), std::set<std::string>{"scene2_u8.tif"});
  EXPECT_EQ(Contents(root_ / "scene2_u8.tif"), "mine");
}

}  // namespace
}  // namespace zarn::app
