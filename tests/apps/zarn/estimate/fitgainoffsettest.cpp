// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <fstream>
#include <limits>
#include <set>
#include <string>
#include <vector>

#include "tests/apps/zarn/estimate/estimatescene.h"
#include "tests/apps/zarn/program.h"
#include "tests/support/randomnumbers.h"

namespace zarn::testsupport {
namespace {

using Arguments = std::vector<std::string>;

constexpr Place kReferencePlace{1000, 2000, 1};
constexpr Place kFirstPlace{1120.3, 2010.7, 1.25};
constexpr Place kSecondPlace{1300.6, 1990.1, 1};

double Land(double x, double y, int band) { return 2000 + 800 * GroundAt(x, y, band); }

// (gain, offset) that undo what the scenes below do to the land.
double UndoGain(int scene, int band) { return scene == 1 ? 0.8 + 0.1 * band : 1.3 - 0.1 * band; }
double UndoOffset(int scene, int band) { return scene == 1 ? 150.0 - 40 * band : -200; }

Image Scene(int scene, int width, int height, const Place& place) {
  RandomNumbers random(static_cast<std::uint64_t>(scene));
  Image image = Paint(width, height, 2, GDT_UInt16, place, [&](double x, double y, int band) {
    const double seen = scene == 0
                            ? Land(x, y, band)
                            : (Land(x, y, band) - UndoOffset(scene, band)) / UndoGain(scene, band);
    return std::round(seen + 60 * random.Fraction());
  });
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      const bool collar = x + y < 30 || x > width - 6;
      for (int band = 0; band < 2 && collar; ++band) image.At(x, y, band) = 0;
    }
  }
  return image;
}

// Lies over a quarter of what the scene has in common with the reference.
void AddCloud(Image& image) {
  for (int y = image.height / 2; y < image.height; ++y) {
    for (int x = 0; x < image.width / 5; ++x) {
      for (int band = 0; band < image.bands; ++band) image.At(x, y, band) = 9000 + x % 7;
    }
  }
}

TEST(FitGainOffset, ScenesTiedInAChainRecoverTheirGainsUnderACloud) {
  const TemporaryFolder folder;
  Write(Scene(0, 250, 220, kReferencePlace), folder / "ref.tif", {}, PutAt(kReferencePlace));
  Image first = Scene(1, 240, 180, kFirstPlace);
  AddCloud(first);
  Write(first, folder / "first.tif", {}, PutAt(kFirstPlace));
  Write(Scene(2, 230, 210, kSecondPlace), folder / "second.tif", {"TILED=YES"},
        PutAt(kSecondPlace));  // overlaps only the first
  const Outcome outcome =
      RunProgram({"fit-gain-offset", folder / "ref.tif", folder / "second.tif",
                  folder / "first.tif", "--out-dir", folder / ".", "--damping", "0"});
  ASSERT_EQ(outcome.status, 0) << outcome.err;
  EXPECT_NE(outcome.out.find("second.tif: "), std::string::npos) << outcome.out;
  for (const int scene : {1, 2}) {
    const nlohmann::json channels =
        ReadJson(folder / (scene == 1 ? "first.gain-offset.json" : "second.gain-offset.json"))
            .at("channels");
    ASSERT_EQ(channels.size(), 2U);
    for (int band = 0; band < 2; ++band) {
      const auto index = static_cast<std::size_t>(band);
      const double gain = channels[index].at("gain");
      const double offset = channels[index].at("offset");
      SCOPED_TRACE("scene " + std::to_string(scene) + " band " + std::to_string(band));
      EXPECT_NEAR(gain / UndoGain(scene, band), 1, 0.02);
      const double seen = (2000 - UndoOffset(scene, band)) / UndoGain(scene, band);
      EXPECT_NEAR(gain * seen + offset, 2000, 15);
    }
  }
}

TEST(FitGainOffset, InvalidPixelsOfAnyKindDoNotCount) {
  const TemporaryFolder folder;
  const Place place{0, 0, 1};
  const auto land = [](double x, double y, int band) { return 0.5 + 0.25 * GroundAt(x, y, band); };
  Image reference = Paint(160, 160, 1, GDT_Float32, place, land);
  Image input = Paint(160, 160, 2, GDT_Float32, place, [&](double x, double y, int band) {
    return band == 0 ? 2 * land(x, y, 0) - 0.125 : 1;  // the second one is alpha
  });
  for (int y = 0; y < 160; ++y) {
    for (int x = 0; x < 160; ++x) {
      if (x / 20 % 4 == 0) reference.At(x, y, 0) = std::numeric_limits<double>::quiet_NaN();
      if (y / 20 % 4 == 0) input.At(x, y, 1) = input.At(x, y, 0) = 0;
      if (x / 20 % 4 == 1) reference.At(x, y, 0) = std::numeric_limits<double>::infinity();
      if (y / 20 % 4 == 1) {  // masked by alpha alone
        input.At(x, y, 0) = 40;
        input.At(x, y, 1) = 0;
      }
    }
  }
  Write(reference, folder / "ref.tif", {}, PutAt(place));
  Write(input, folder / "in.tif", {"ALPHA=YES"}, [&](GDALDataset& dataset) {
    PutAt(place)(dataset);
    dataset.GetRasterBand(2)->SetColorInterpretation(GCI_AlphaBand);
  });
  const Outcome outcome = RunProgram({"fit-gain-offset", folder / "ref.tif", folder / "in.tif",
                                      "-q", "--damping", "0", "-o", folder / "out.json"});
  ASSERT_EQ(outcome.status, 0) << outcome.err;
  EXPECT_EQ(outcome.out, "");
  const nlohmann::json channel = ReadJson(folder / "out.json").at("channels").at(0);
  EXPECT_NEAR(channel.at("gain").get<double>(), 0.5, 1e-4);
  EXPECT_NEAR(channel.at("offset").get<double>(), 0.0625, 1e-4);
}

TEST(FitGainOffset, DampingKeepsTheContrastOfUncorrelatedScenes) {
  const TemporaryFolder folder;
  const Place place{0, 0, 1};
  Write(Paint(200, 200, 1, GDT_UInt16, place,
              [](double x, double y, int) { return 3000 + 500 * GroundAt(x, y, 0); }),
        folder / "ref.tif", {}, PutAt(place));
  Write(Paint(200, 200, 1, GDT_UInt16, place,
              [](double x, double y, int) {
                return 1000 + 300 * GroundAt(y - 70, x, 3) + 30 * GroundAt(x, y, 0);
              }),
        folder / "in.tif", {}, PutAt(place));
  const auto fit = [&](const std::string& damping) {
    const Outcome outcome =
        RunProgram({"fit-gain-offset", folder / "ref.tif", folder / "in.tif", "--overwrite", "-q",
                    "--damping", damping, "-o", folder / "out.json"});
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    return ReadJson(folder / "out.json").at("channels").at(0);
  };
  EXPECT_LT(fit("0").at("gain"), 0.6);
  const nlohmann::json damped = fit("1");
  EXPECT_GT(damped.at("gain"), 0.8);
  EXPECT_LT(damped.at("gain"), 1.25);
}

TEST(FitGainOffset, WrongInputEndsInOneLineAndLeavesNothing) {
  const TemporaryFolder folder;
  const auto scene = [&](const std::string& name, const Place& place, GDALDataType type,
                         int bands) {
    Write(Paint(90, 90, bands, type, place,
                [](double x, double y, int band) { return 100 + 50 * GroundAt(x, y, band); }),
          folder / name, {}, PutAt(place));
  };
  scene("ref.tif", {0, 0, 1}, GDT_Byte, 1);
  scene("in.tif", {20, 10, 1}, GDT_Byte, 1);
  scene("far.tif", {5000, 0, 1}, GDT_Byte, 1);
  scene("far2.tif", {5010, 0, 1}, GDT_Byte, 1);
  scene("zone34.tif", {20, 10, 1, 32634}, GDT_Byte, 1);
  scene("nowhere.tif", {20, 10, 1, 0}, GDT_Byte, 1);
  scene("u16.tif", {20, 10, 1}, GDT_UInt16, 1);
  scene("two.tif", {20, 10, 1}, GDT_Byte, 2);
  Write(Image(90, 90, 1, GDT_Int64), folder / "int64.tif", {}, PutAt({0, 0, 1}));
  std::ofstream(folder / "old.json") << "precious";
  const std::set<std::string> before = folder.Names();
  struct Case {
    Arguments arguments;  ///< after the reference
    int status;
    std::string message;
  };
  const std::string in = folder / "in.tif";
  const std::string out = folder / "out.json";
  const std::vector<Case> cases{
      {{in}, 2, "either -o FILE or --out-dir DIR"},
      {{in, "-o", out, "--out-dir", folder / "."}, 2, "either -o FILE or --out-dir DIR"},
      {{in, folder / "far.tif", "-o", out}, 2, "-o is for one IN"},
      {{in, in, "--out-dir", folder / "."}, 2, "in.gain-offset.json"},
      {{in, "-o", in, "--overwrite"}, 2, "is a file of the input"},
      {{in, "-o", folder / "old.json"}, 1, "--overwrite"},
      {{in, "--out-dir", folder / "none"}, 1, "there is no folder"},
      {{in, "-o", out, "--damping", "-1"}, 2, "--damping"},
      {{in, folder / "far.tif", folder / "far2.tif", "--out-dir", folder / "."},
       1,
       "far.tif, " + (folder / "far2.tif")},
      {{folder / "zone34.tif", "-o", out}, 1, "gdalwarp -t_srs"},
      {{folder / "nowhere.tif", "-o", out}, 1, "names no coordinate system"},
      {{folder / "u16.tif", "-o", out}, 1, "is UInt16, but"},
      {{folder / "two.tif", "-o", out}, 1, "has 2 bands"},
      {{folder / "missing.tif", "-o", out}, 1, "missing.tif"},
      {{in, "-o", out, "--src-nodata", "1,2"}, 2, "--src-nodata"},
  };
  for (const Case& c : cases) {
    Arguments arguments{"fit-gain-offset", folder / "ref.tif"};
    arguments.insert(arguments.end(), c.arguments.begin(), c.arguments.end());
    const Outcome outcome = RunProgram(arguments);
    SCOPED_TRACE(c.message);
    EXPECT_EQ(outcome.status, c.status);
    EXPECT_NE(outcome.err.find(c.message), std::string::npos) << outcome.err;
    EXPECT_EQ(std::count(outcome.err.begin(), outcome.err.end(), '\n'), 1) << outcome.err;
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(folder.Names(), before);
  }
  const Outcome outcome =
      RunProgram({"fit-gain-offset", folder / "int64.tif", folder / "int64.tif", "-o", out});
  EXPECT_EQ(outcome.status, 1);
  EXPECT_NE(outcome.err.find("is Int64"), std::string::npos) << outcome.err;
}

}  // namespace
}  // namespace zarn::testsupport
