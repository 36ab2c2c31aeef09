// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <csignal>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "tests/apps/zarn/cutlinereference.h"
#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"

namespace zarn::testsupport {
namespace {

namespace fs = std::filesystem;
using Arguments = std::vector<std::string>;

constexpr int kColumns = 260;
constexpr int kRows = 200;
constexpr double kNoData = 0;

struct Scene {
  std::string name;
  int left;
  int top;
  Image image;
  double noData = kNoData;
};

// Land that all scenes show: waves and hatching, between 40 and 200.
double Land(int x, int y, int band) {
  return 120 + 50 * std::sin(0.041 * x + band) * std::cos(0.033 * y) +
         20 * std::sin(0.31 * x + 0.27 * y) + (x * 7 + y * 13) % 11;
}

// A scene with a slanted collar without data, an island without data, and pixels that are 0 in one
// band only.
Scene MakeScene(const std::string& name, int left, int top, int width, int height, double gain,
                double offset, GDALDataType type = GDT_Byte) {
  Scene scene{name, left, top, Image(width, height, 3, type)};
  const double scale = type == GDT_Byte ? 1 : 64;
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      const bool collar = x + y / 8 < 12 || y + x / 9 < 10 || width - x < 7 || height - y < 6;
      const bool island = std::hypot(x - width * 0.4, y - height * 0.6) < 5;
      for (int band = 0; band < 3; ++band) {
        const double value = scale * (gain * Land(x + left, y + top, band) + offset);
        scene.image.At(x, y, band) =
            collar || island ? kNoData : std::round(std::clamp(value, 1.0, 255 * scale));
      }
      if ((x * 31 + y * 17) % 97 == 0) scene.image.At(x, y, 1) = 0;
    }
  }
  return scene;
}

std::vector<Scene> ThreeScenes(GDALDataType type = GDT_Byte) {
  return {MakeScene("west", 0, 0, 150, 170, 1, 0, type),
          MakeScene("east", 100, 20, 160, 150, 0.8, 22, type),
          MakeScene("south", 40, 90, 170, 110, 1.15, -14, type)};
}

Polygon West() { return {Rectangle(-3.1875, -2.4375, 118.3125, 140.8125)}; }
Polygon East() {
  return {{{118.3125, -2.4375},
           {300.4375, -2.4375},
           {300.4375, 150.3125},
           {131.5625, 128.1875},
           {118.3125, -2.4375}}};
}
Polygon South() { return {Rectangle(20.0625, 128.6875, 222.8125, 240.3125)}; }

// The same scene with another no-data value, and with data that is black.
Scene WithBlack(Scene scene, double noData) {
  scene.noData = noData;
  for (int y = 0; y < scene.image.height; ++y) {
    for (int x = 0; x < scene.image.width; ++x) {
      const bool black = (x * 29 + y * 13) % 53 == 0;
      const bool empty = scene.image.AllBands(x, y, kNoData);
      for (int band = 0; band < 3 && (empty || black); ++band) {
        scene.image.At(x, y, band) = empty ? noData : 0;
      }
    }
  }
  return scene;
}

bool HasData(const Scene& scene, int x, int y) { return !scene.image.AllBands(x, y, scene.noData); }

struct Expected {
  Image mosaic;
  Image map;
};

// Scenes pasted one after the other by the definition of the blend: whole where there is nothing
// yet, else mixed by weight.
Expected Mosaicked(const std::vector<Scene>& scenes, const std::vector<Polygon>& cutlines,
                   int feather) {
  Expected result{Image(kColumns, kRows, 3, scenes.front().image.type),
                  Image(kColumns, kRows, 1, GDT_Byte)};
  for (std::size_t i = 0; i < scenes.size(); ++i) {
    const Scene& scene = scenes[i];
    for (int y = 0; y < scene.image.height; ++y) {
      for (int x = 0; x < scene.image.width; ++x) {
        const int column = x + scene.left;
        const int row = y + scene.top;
        const double w = Weight(cutlines[i], column + 0.5, row + 0.5, feather);
        if (w <= -1 || !HasData(scene, x, y)) continue;
        double& number = result.map.At(column, row, 0);
        const double a = number == 0 || w >= 1 ? 1 : 0.5 * w + 0.5;
        for (int band = 0; band < 3; ++band) {
          double& value = result.mosaic.At(column, row, band);
          value = std::trunc(scene.image.At(x, y, band) * a + value * (1 - a));
        }
        if (a >= 0.5) number = static_cast<double>(i + 1);
      }
    }
  }
  // A mix of pixels with data must not look as if there were none.
  const double noData = scenes.front().noData;
  for (int y = 0; y < kRows; ++y) {
    for (int x = 0; x < kColumns; ++x) {
      if (result.map.At(x, y, 0) == 0) {
        for (int band = 0; band < 3; ++band) result.mosaic.At(x, y, band) = noData;
      } else if (result.mosaic.AllBands(x, y, noData)) {
        result.mosaic.At(x, y, 0) = noData == 0 ? 1 : noData - 1;
      }
    }
  }
  return result;
}

class Mosaicking : public testing::Test {
 protected:
  void WriteScenes(const std::vector<Scene>& scenes) {
    files_.clear();
    for (const Scene& scene : scenes) {
      files_.push_back(folder_ / (scene.name + ".tif"));
      Write(scene.image, files_.back(), {"TILED=YES", "BLOCKXSIZE=64", "BLOCKYSIZE=64"},
            Georeference(scene.left, scene.top, scene.noData));
    }
  }
  void WriteCutlines() {
    WriteFeatures({{OnMap(East()), "east"}, {OnMap(West()), "west"}, {OnMap(South()), "south.tif"}},
                  folder_ / "cutlines.gpkg", "GPKG", 32633, "scene");
  }
  Arguments Command(const Arguments& options, const std::string& output = "mosaic.tif") {
    Arguments arguments{"mosaic"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    arguments.insert(arguments.end(), files_.begin(), files_.end());
    arguments.push_back(folder_ / output);
    return arguments;
  }
  void Run(const Arguments& arguments) {
    const Outcome outcome = RunProgram(arguments);
    ASSERT_EQ(outcome.status, 0) << outcome.err;
    EXPECT_EQ(outcome.err, "");
  }
  Image Mosaic(const Arguments& options) {
    Run(Command(options));
    return Read(folder_ / "mosaic.tif");
  }

  TemporaryFolder folder_;
  Arguments files_;
};

TEST_F(Mosaicking, FollowsTheFormulaAlongGivenCutlines) {
  std::vector<std::vector<Scene>> inputs{ThreeScenes(GDT_Byte), ThreeScenes(GDT_UInt16),
                                         ThreeScenes(GDT_Byte)};
  for (Scene& scene : inputs.back()) scene = WithBlack(scene, 255);
  WriteCutlines();
  for (std::size_t i = 0; i < inputs.size(); ++i) {
    const std::vector<Scene>& scenes = inputs[i];
    WriteScenes(scenes);
    for (const int feather : {0, 13}) {
      SCOPED_TRACE(std::to_string(i) + ", feather " + std::to_string(feather));
      const Expected expected = Mosaicked(scenes, {West(), East(), South()}, feather);
      const Image mosaic =
          Mosaic({"--overwrite", "--cutlines", folder_ / "cutlines.gpkg", "--feather",
                  std::to_string(feather), "--source-map", folder_ / "map.tif"});
      EXPECT_EQ(Difference(expected.mosaic, mosaic), "");
      EXPECT_EQ(Difference(expected.map, Read(folder_ / "map.tif")), "");
    }
  }
}

// Whatever the no-data value is and however data without one is told from nothing.
TEST_F(Mosaicking, WhatIsWithoutDataNeverLooksLikeDataNorTheOtherWayRound) {
  const std::vector<Scene> scenes = ThreeScenes();
  WriteScenes(scenes);
  const Image mosaic =
      Mosaic({"--feather", "20", "--dst-nodata", "90", "--source-map", folder_ / "map.tif"});
  const Image map = Read(folder_ / "map.tif");
  Run(Command({"--feather", "20", "--dst-nodata", "none"}, "masked.tif"));
  const OpenDataset masked = OpenImage(folder_ / "masked.tif");
  std::vector<std::uint8_t> mask(std::size_t{kColumns} * kRows);
  ASSERT_EQ(
      masked->GetRasterBand(1)->GetMaskBand()->RasterIO(GF_Read, 0, 0, kColumns, kRows, mask.data(),
                                                        kColumns, kRows, GDT_Byte, 0, 0, nullptr),
      CE_None);
  int holes = 0;
  for (int y = 0; y < kRows; ++y) {
    for (int x = 0; x < kColumns; ++x) {
      const bool covered = std::any_of(scenes.begin(), scenes.end(), [&](const Scene& scene) {
        const int column = x - scene.left;
        const int row = y - scene.top;
        return column >= 0 && row >= 0 && column < scene.image.width && row < scene.image.height &&
               HasData(scene, column, row);
      });
      ASSERT_EQ(map.At(x, y, 0) != 0, covered) << x << ", " << y;
      ASSERT_EQ(!mosaic.AllBands(x, y, 90), covered) << x << ", " << y;
      ASSERT_EQ(mask[static_cast<std::size_t>(y) * kColumns + static_cast<std::size_t>(x)] != 0,
                covered)
          << x << ", " << y;
      holes += covered ? 0 : 1;
    }
  }
  EXPECT_GT(holes, 1000);
}

TEST_F(Mosaicking, DoesNotDependOnThreadsMemoryTilesOrPieces) {
  WriteScenes(ThreeScenes());
  const Arguments common{"--overwrite",  "--feather",        "15", "--balance", "dodging",
                         "--source-map", folder_ / "map.tif"};
  const auto with = [&](const Arguments& more) {
    Arguments all = common;
    all.insert(all.end(), more.begin(), more.end());
    return all;
  };
  const Image expected = Mosaic(common);
  const Image map = Read(folder_ / "map.tif");
  for (const Arguments& variant : std::vector<Arguments>{{"--threads", "1"},
                                                         {"--threads", "4"},
                                                         {"--tile-size", "48"},
                                                         {"--memory", "1", "--tile-size", "112"}}) {
    SCOPED_TRACE(variant.back());
    EXPECT_EQ(Difference(expected, Mosaic(with(variant))), "");
    EXPECT_EQ(Difference(map, Read(folder_ / "map.tif")), "");
  }
  // With room for a few blocks only the scenes are surveyed in pieces.
  setenv("GDAL_CACHEMAX", "100000", 1);
  EXPECT_EQ(Difference(expected, Mosaic(with({"--threads", "4"}))), "");
  unsetenv("GDAL_CACHEMAX");

  Run(Command(with({"--tile-size", "64"}), "one.tif"));
  const std::string oneMap = BytesOf(folder_ / "map.tif");
  const std::string plan = folder_ / "job.json";
  Arguments planning = Command(with({"--tile-size", "64"}), "pieces.tif");
  planning.insert(planning.begin() + 1, {"plan", "-o", plan});
  Run(planning);
  // 5 x 4 tiles; two processes share some, and one comes too late.
  Program late({"mosaic", "run", plan, "--tiles", "9-16"});
  Program early({"mosaic", "run", plan, "--tiles", "1-12", "--threads", "1"});
  EXPECT_EQ(late.Wait().status, 0);
  EXPECT_EQ(early.Wait().status, 0);
  const Arguments finish{"mosaic", "finish", plan, "--overwrite"};
  ExpectOneLine(RunProgram(finish), 1, "4 of 20 tiles are missing");
  // A tile of another plan does not count, and those that are there are not made again.
  fs::copy_file(folder_ / "job.json.tiles/tile_000001.tif",
                folder_ / "job.json.tiles/tile_000017.tif");
  const OpenDataset stale(
      GDALDataset::Open((folder_ / "job.json.tiles/tile_000017.tif").c_str(), GDAL_OF_UPDATE));
  ASSERT_EQ(stale->SetMetadataItem("ZARN_PLAN", "other"), CE_None);
  stale->FlushCache(true);
  // Neither does one that was cut off.
  const std::string cut = folder_ / "job.json.tiles/tile_000005.tif";
  fs::resize_file(cut, fs::file_size(cut) / 2);
  const auto before = fs::last_write_time(folder_ / "job.json.tiles/tile_000003.tif");
  Run({"mosaic", "run", plan});
  EXPECT_EQ(fs::last_write_time(folder_ / "job.json.tiles/tile_000003.tif"), before);
  Run(finish);
  EXPECT_EQ(BytesOf(folder_ / "pieces.tif") == BytesOf(folder_ / "one.tif"), true);
  EXPECT_EQ(BytesOf(folder_ / "map.tif") == oneMap, true);
  EXPECT_EQ(Difference(expected, Read(folder_ / "pieces.tif")), "");

  Run({"mosaic", "finish", plan, "--overwrite", "--of", "COG"});
  EXPECT_EQ(Difference(expected, Read(folder_ / "pieces.tif")), "");
  EXPECT_STREQ(OpenImage(folder_ / "pieces.tif")->GetMetadataItem("LAYOUT", "IMAGE_STRUCTURE"),
               "COG");
  Run({"mosaic", "finish", plan, "--overwrite", "--of", "VRT"});
  EXPECT_EQ(Difference(expected, Read(folder_ / "pieces.tif")), "");
}

TEST_F(Mosaicking, AVrtOfTilesIsDescribedAndFilledLikeAnyOtherOutput) {
  WriteScenes(ThreeScenes());
  const OpenDataset scene(GDALDataset::Open(files_[0].c_str(), GDAL_OF_UPDATE));
  scene->SetMetadataItem("SENSOR", "one");
  scene->GetRasterBand(2)->SetDescription("green");
  scene->FlushCache(true);
  // A no-data pixel that is not the same in all bands.
  const Arguments options{"--dst-nodata", "0,7,255", "--tile-size", "128", "--order", "reverse"};
  Run(Command(options, "whole.tif"));
  const std::string plan = folder_ / "job.json";
  Arguments planning = Command(options, "tiles.vrt");
  planning.insert(planning.begin() + 1, {"plan", "-o", plan});
  Run(planning);
  Run({"mosaic", "run", plan});
  Run({"mosaic", "finish", plan});
  EXPECT_EQ(Difference(Read(folder_ / "whole.tif"), Read(folder_ / "tiles.vrt")), "");
  for (const char* const name : {"whole.tif", "tiles.vrt"}) {
    SCOPED_TRACE(name);
    const OpenDataset output = OpenImage(folder_ / name);
    EXPECT_STREQ(output->GetMetadataItem("SENSOR"), "one");
    EXPECT_STREQ(output->GetMetadataItem("NODATA_VALUES"), "0 7 255");
    EXPECT_STREQ(output->GetRasterBand(2)->GetDescription(), "green");
  }
}

TEST_F(Mosaicking, SeamsThatWereWrittenGiveTheSameMosaicAgain) {
  WriteScenes(ThreeScenes());
  const Image expected = Mosaic(
      {"--feather", "11", "--balance", "gain-offset", "--write-cutlines", folder_ / "seams.gpkg"});
  EXPECT_EQ(
      Difference(expected, Mosaic({"--overwrite", "--feather", "11", "--balance", "gain-offset",
                                   "--cutlines", folder_ / "seams.gpkg", "--fill-gaps"})),
      "");
}

// The scenes differ by gains and offsets only, so that balanced ones are alike.
TEST_F(Mosaicking, BalancingTakesTheSeamsAway) {
  const std::vector<Scene> scenes = ThreeScenes(GDT_UInt16);
  WriteScenes(scenes);
  const auto residual = [&](const Arguments& options) {
    const Image mosaic = Mosaic(options);
    double sum = 0;
    int count = 0;
    for (int y = 0; y < kRows; ++y) {
      for (int x = 0; x < kColumns; ++x) {
        // Pixels that are 0 in a band for no reason of the land.
        if (mosaic.AllBands(x, y, 0) || mosaic.At(x, y, 0) == 0) continue;
        sum += std::abs(mosaic.At(x, y, 0) - 64 * Land(x, y, 0));
        ++count;
      }
    }
    return sum / count / 64;
  };
  const double plain = residual({});
  const double balanced = residual({"--overwrite", "--balance", "gain-offset"});
  const double dodged = residual({"--overwrite", "--balance", "dodging", "--reference", files_[0]});
  EXPECT_GT(plain, 2);
  EXPECT_LT(balanced, plain / 10);
  EXPECT_LT(dodged, plain / 5);
}

TEST_F(Mosaicking, BringsScenesOntoTheGridThatIsAskedFor) {
  WriteScenes(ThreeScenes());
  Run({"resample", "-r", "cubic", "--t-srs", "EPSG:32632", files_[1], folder_ / "moved.tif"});
  const std::string other = files_[1];
  files_ = {folder_ / "moved.tif"};
  Run(Command({"--t-srs", "EPSG:32632"}, "copied.tif"));
  EXPECT_EQ(Difference(Read(folder_ / "moved.tif"), Read(folder_ / "copied.tif")), "");
  // The other way: what the mosaic computes is what resampling computes.
  files_ = {other};
  const OpenDataset moved = OpenImage(folder_ / "moved.tif");
  double t[6];
  moved->GetGeoTransform(t);
  const auto text = [](double value) {
    std::string digits(32, '\0');
    digits.resize(static_cast<std::size_t>(snprintf(digits.data(), digits.size(), "%.17g", value)));
    return digits;
  };
  Run(Command(
      {"--t-srs", "EPSG:32632", "--te", text(t[0]), text(t[3] + moved->GetRasterYSize() * t[5]),
       text(t[0] + moved->GetRasterXSize() * t[1]), text(t[3])},
      "resampled.tif"));
  EXPECT_EQ(Difference(Read(folder_ / "moved.tif"), Read(folder_ / "resampled.tif")), "");
}

TEST_F(Mosaicking, TakesOptionsFromAFile) {
  WriteScenes(ThreeScenes());
  WriteCutlines();
  const Image expected =
      Mosaic({"--cutlines", folder_ / "cutlines.gpkg", "--feather", "9", "--order", "reverse"});
  const auto configure = [&](const std::string& content) {
    std::ofstream(folder_ / "config.json") << content;
  };
  configure(R"({"scenes": [")" + files_[0] + R"(", ")" + files_[1] + R"(", ")" + files_[2] +
            R"(", ")" + (folder_ / "mosaic.tif") + R"("], "cutlines": ")" +
            (folder_ / "cutlines.gpkg") +
            R"(", "feather": 4, "order": "reverse", "overwrite": true})");
  Run({"mosaic", "--config", folder_ / "config.json", "--feather", "9"});
  EXPECT_EQ(Difference(expected, Read(folder_ / "mosaic.tif")), "");
  Run({"mosaic", "--config", folder_ / "config.json", "--feather", "9", folder_ / "other.tif"});
  EXPECT_TRUE(fs::exists(folder_ / "other.tif"));
  configure(R"({"feather": 3, "feather": 4})");
  ExpectOneLine(RunProgram(Command({"--config", folder_ / "config.json"}, "x.tif")), 2,
                "'feather' is there twice");
  configure(R"({"fether": 3})");
  ExpectOneLine(RunProgram(Command({"--config", folder_ / "config.json"}, "x.tif")), 2,
                "there is no option 'fether'");
  configure(R"({"feather": "wide"})");
  ExpectOneLine(RunProgram(Command({"--config", folder_ / "config.json"}, "x.tif")), 2,
                "'feather': ");
}

TEST_F(Mosaicking, RefusesWhatCannotWorkBeforeItBegins) {
  std::vector<Scene> scenes = ThreeScenes();
  WriteScenes(scenes);
  WriteCutlines();
  Write(scenes[1].image, folder_ / "nowhere.tif");
  Write(Image(30, 30, 2, GDT_Byte), folder_ / "bands.tif", {}, Georeference(0, 0, kNoData));
  Write(Image(30, 30, 3, GDT_UInt16), folder_ / "type.tif", {}, Georeference(0, 0, kNoData));
  Write(scenes[1].image, folder_ / "far.tif", {}, Georeference(5000, 0, kNoData));
  WriteFeatures({{OnMap({Rectangle(900, 900, 950, 950)}), "west"}, {OnMap(East()), "east"}},
                folder_ / "missing.gpkg", "GPKG", 32633, "scene");
  // Around the scene, but not on it.
  const Polygon around{Rectangle(-50, -50, 400, 400), Rectangle(-20, -20, 350, 350)};
  WriteFeatures({{OnMap(around), "west"}}, folder_ / "around.gpkg", "GPKG", 32633, "scene");
  struct Case {
    Arguments arguments;
    int status;
    std::string part;
  };
  const std::string out = folder_ / "mosaic.tif";
  const std::string cutlines = folder_ / "cutlines.gpkg";
  const std::vector<Case> cases{
      {{files_[0], folder_ / "nowhere.tif", out}, 1, "nowhere.tif: it does not say where it lies"},
      {{files_[0], folder_ / "bands.tif", out}, 1, "bands.tif has 2 bands"},
      {{files_[0], folder_ / "type.tif", out}, 1, "type.tif is UInt16"},
      {{files_[0], folder_ / "far.tif", out, "--balance", "gain-offset"},
       1,
       "far.tif does not overlap"},
      {{files_[0], files_[1], out, "--cutlines", folder_ / "missing.gpkg"}, 1, "west.tif in "},
      {{files_[0], files_[2], out, "--cutlines", folder_ / "missing.gpkg"}, 1, "misses it"},
      {{files_[2], out, "--cutlines", folder_ / "missing.gpkg"}, 1, "has no cutline for"},
      {{files_[0], out, "--cutlines", folder_ / "around.gpkg"}, 1, "misses it"},
      {{files_[0], out, "--cutlines", cutlines, "--cutline-id", "fid2"}, 2, "has no field 'fid2'"},
      {{files_[0], out, "--stop-on-nodata"}, 2, "needs --cutlines"},
      {{files_[0], files_[1], out, "--feather", "3", "--seams", "none"}, 2, "no cutlines"},
      {{files_[0], out, "--filter-size", "5"}, 2, "needs --filter"},
      {{files_[0], out, "--write-cutlines", folder_ / "x.gpkg"}, 2, "has no seams"},
      {{files_[0], files_[1], out, "--cutlines", cutlines, "--stop-on-nodata"},
       1,
       "inside of its cutline"},
      {{files_[0], cutlines}, 1, "exists"},
      {{files_[0], files_[0], "--overwrite"}, 2, "is the input"},
      {{files_[0], out, "--source-map", folder_ / "./mosaic.tif"}, 2, "two outputs"},
      {{files_[0], files_[1], "--overwrite", "--balance", "gain-offset", "--reference", files_[1]},
       2,
       "is the input"},
      {{files_[0], out, "--of", "NOPE"}, 2, "NOPE"},
      {{files_[0], folder_ / "none/x.tif"}, 1, "there is no folder"},
      {{files_[0], files_[1], out, "plan", "-o", folder_ / "p.json"}, 2, "has to come after"},
      {{out}, 2, "give at least one scene"},
      {{files_[0], folder_ / "x.vrt"}, 2, "VRT"},
      {{files_[0], out, "--te", "0", "0", "10", "10"}, 1, "no scene lies within --te"},
      {{"run", folder_ / "none.json"}, 2, "cannot read the plan"},
      {{"run", files_[0]}, 2, "is no plan"}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.part);
    Arguments arguments{"mosaic", "-q"};
    if (c.arguments.front() == "run") arguments.pop_back();
    arguments.insert(arguments.end(), c.arguments.begin(), c.arguments.end());
    ExpectOneLine(RunProgram(arguments), c.status, c.part);
    EXPECT_FALSE(fs::exists(out));
  }
}

TEST_F(Mosaicking, APlanHoldsOnlyAsLongAsItsInputs) {
  WriteScenes(ThreeScenes());
  Arguments planning = Command({"--tile-size", "128"});
  const std::string plan = folder_ / "job.json";
  planning.insert(planning.begin() + 1, {"plan", "-o", plan});
  Run(planning);
  ExpectOneLine(RunProgram({"mosaic", "run", plan, "--tiles", "3-99"}), 2, "has 6 tiles");
  ExpectOneLine(RunProgram({"mosaic", "run", plan, "--tiles", "2-1"}), 2, "A-B");
  fs::last_write_time(files_[1], fs::last_write_time(files_[1]) + std::chrono::seconds(2));
  ExpectOneLine(RunProgram({"mosaic", "run", plan}), 1, "east.tif has changed since the plan");
  fs::remove(files_[1]);
  ExpectOneLine(RunProgram({"mosaic", "run", plan}), 1, "east.tif is gone since the plan");
}

TEST_F(Mosaicking, AKilledRunLeavesNothingBroken) {
  WriteScenes(ThreeScenes());
  const std::set<std::string> before = folder_.Names();
  for (const int number : {SIGINT, SIGTERM}) {
    Program program(Command({"--tile-size", "16", "--threads", "1"}));
    while (folder_.Names() == before) {
    }
    program.Signal(number);
    const Outcome outcome = program.Wait();
    if (outcome.status == 0) continue;  // it was faster
    EXPECT_EQ(folder_.Names(), before);
  }
}

}  // namespace
}  // namespace zarn::testsupport
