// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <ogr_spatialref.h>

#include <array>
#include <cmath>
#include <limits>
#include <optional>
#include <string>
#include <vector>

#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"
#include "tests/support/resamplereference.h"

namespace zarn::testsupport {
namespace {

using Arguments = std::vector<std::string>;
using Transform = std::array<double, 6>;
using utils::ResampleMethod;

constexpr Transform kNorthUp{500000, 30, 0, 5100000, 0, -30};
const Arguments kMethods{"nearest", "bilinear", "cubic"};

Decorate Georeference(const Transform& transform, int epsg,
                      std::optional<double> noData = std::nullopt) {
  return [=](GDALDataset& dataset) {
    Transform copy = transform;
    dataset.SetGeoTransform(copy.data());
    OGRSpatialReference crs;
    crs.importFromEPSG(epsg);
    crs.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
    dataset.SetSpatialRef(&crs);
    if (noData) dataset.GetRasterBand(1)->SetNoDataValue(*noData);
  };
}

// A palette beside the place.
Decorate Colours() {
  return [place = Georeference(kNorthUp, 32633)](GDALDataset& dataset) {
    place(dataset);
    GDALColorTable table;
    for (int i = 0; i < 256; ++i) {
      const GDALColorEntry colour{static_cast<short>(i), static_cast<short>(i == 3 ? 250 : 9),
                                  static_cast<short>(i == 3 ? 40 : 9), 255};
      table.SetColorEntry(i, &colour);
    }
    dataset.GetRasterBand(1)->SetColorTable(&table);
  };
}

class Resampling : public testing::Test {
 protected:
  Image Run(Arguments arguments, const std::string& warning = {}) {
    arguments.insert(arguments.end(), {"--overwrite", folder_ / "in.tif", folder_ / "out.tif"});
    const Outcome outcome = RunProgram(arguments);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    if (warning.empty()) {
      EXPECT_EQ(outcome.err, "");
    } else {
      ExpectOneLine(outcome, 0, warning);
    }
    return outcome.status == 0 ? Read(folder_ / "out.tif") : Image(0, 0, 0, GDT_Byte);
  }
  Image Resample(Arguments options, const std::string& warning = {}) {
    options.insert(options.begin(), "resample");
    return Run(options, warning);
  }
  Transform GeoTransform() {
    Transform transform{};
    EXPECT_EQ(OpenImage(folder_ / "out.tif")->GetGeoTransform(transform.data()), CE_None);
    return transform;
  }
  /// One byte per pixel.
  std::vector<std::uint8_t> MaskOf(const std::string& name) {
    const OpenDataset dataset = OpenImage(folder_ / name);
    const int width = dataset->GetRasterXSize();
    const int height = dataset->GetRasterYSize();
    std::vector<std::uint8_t> mask(static_cast<std::size_t>(width) *
                                   static_cast<std::size_t>(height));
    EXPECT_EQ(
        dataset->GetRasterBand(1)->GetMaskBand()->RasterIO(
            GF_Read, 0, 0, width, height, mask.data(), width, height, GDT_Byte, 0, 0, nullptr),
        CE_None);
    return mask;
  }

  TemporaryFolder folder_;
};

TEST_F(Resampling, OntoItsOwnGridGivesTheImageInEveryTypeAndMethod) {
  // A size that no double holds exactly.
  const Transform thirds{-113.2, 1.0 / 1200, 0, 37.5, 0, -1.0 / 1200};
  for (const GDALDataType type :
       {GDT_Byte, GDT_UInt16, GDT_Int16, GDT_UInt32, GDT_Int32, GDT_Float32, GDT_Float64}) {
    const Image image = NoiseImage(150, 70, 2, type, 7, 3);
    Write(image, folder_ / "in.tif", {}, Georeference(thirds, 4326, 7));
    for (const std::string& method : kMethods) {
      SCOPED_TRACE(std::string(GDALGetDataTypeName(type)) + " " + method);
      EXPECT_EQ(Difference(image, Resample({"-r", method, "--like", folder_ / "in.tif"})), "");
      EXPECT_EQ(GeoTransform(), thirds);
    }
  }
}

// The output grid turned by 0.3 rad against the input's: the positions are those of an affine map.
TEST_F(Resampling, FollowsTheDefinitionAtTurnedPositions) {
  const Image image = NoiseImage(160, 130, 3, GDT_Byte, 0, 5);
  Write(image, folder_ / "in.tif", {}, Georeference(kNorthUp, 32633, 0));
  const double c = 24 * std::cos(0.3);
  const double s = 24 * std::sin(0.3);
  const Transform turned{499500, c, s, 5098900, s, -c};
  Write(Image(260, 240, 1, GDT_Byte), folder_ / "grid.tif", {}, Georeference(turned, 32633));

  Picture<std::uint8_t> source{160, 130, 3};
  for (const double value : image.values)
    source.samples.push_back(static_cast<std::uint8_t>(value));
  for (int y = 0; y < 130; ++y) {
    for (int x = 0; x < 160; ++x) source.mask.push_back(image.AllBands(x, y, 0) ? 0 : 1);
  }
  const struct {
    const char* name;
    ResampleMethod method;
  } kCases[] = {{"nearest", ResampleMethod::kNearest},
                {"bilinear", ResampleMethod::kBilinear},
                {"cubic", ResampleMethod::kCubic}};
  for (const auto& c2 : kCases) {
    const Image result = Resample({"-r", c2.name, "--like", folder_ / "grid.tif"});
    int different = 0;
    int covered = 0;
    for (int y = 0; y < 240; ++y) {
      for (int x = 0; x < 260; ++x) {
        const double east = turned[0] + (x + 0.5) * turned[1] + (y + 0.5) * turned[2];
        const double north = turned[3] + (x + 0.5) * turned[4] + (y + 0.5) * turned[5];
        const auto expected = ReferencePixel<std::uint8_t>(
            source, c2.method, (east - kNorthUp[0]) / 30, (kNorthUp[3] - north) / 30, 0);
        if (expected) ++covered;
        for (int band = 0; band < 3; ++band) {
          const double wanted = expected ? (*expected)[static_cast<std::size_t>(band)] : 0;
          if (result.At(x, y, band) != wanted) ++different;
        }
      }
    }
    // Positions differ in their last bits, which decides ties and halves.
    EXPECT_LE(different, 30) << c2.name;
    EXPECT_GT(covered, 20000);
    EXPECT_EQ(OpenImage(folder_ / "out.tif")->GetRasterBand(3)->GetNoDataValue(), 0);
  }
}

TEST_F(Resampling, DoesNotDependOnWindowsThreadsOrMemory) {
  Write(NoiseImage(700, 600, 2, GDT_UInt16, 0, 8), folder_ / "in.tif",
        {"TILED=YES", "BLOCKXSIZE=64", "BLOCKYSIZE=64"}, Georeference(kNorthUp, 32633, 0));
  const Arguments common{"-r", "cubic", "--t-srs", "EPSG:4326"};
  const Image expected = Resample(common);
  for (const Arguments& variant : std::vector<Arguments>{{"--window", "37x11"},
                                                         {"--window", "2000x3"},
                                                         {"--memory", "1"},
                                                         {"--memory", "4", "--threads", "2"},
                                                         {"--threads", "1"}}) {
    Arguments options = common;
    options.insert(options.end(), variant.begin(), variant.end());
    EXPECT_EQ(Difference(expected, Resample(options)), "") << variant[0] << " " << variant[1];
  }
}

TEST_F(Resampling, KeepsPositionsWithinTheThreshold) {
  // The samples are the column, so that differences of values are differences of positions.
  Image image(900, 500, 1, GDT_Float64);
  for (int y = 0; y < 500; ++y) {
    for (int x = 0; x < 900; ++x) image.At(x, y, 0) = x;
  }
  Transform coarse = kNorthUp;
  coarse[1] = 900;
  coarse[5] = -900;
  Write(image, folder_ / "in.tif", {}, Georeference(coarse, 32633, -1));
  const auto at = [&](const char* threshold) {
    return Resample({"-r", "bilinear", "--t-srs", "EPSG:3035", "--error-threshold", threshold});
  };
  const Image exact = at("0");
  const Image close = at("0.125");
  ASSERT_EQ(exact.values.size(), close.values.size());
  double largest = 0;
  int uncovered = 0;
  for (std::size_t i = 0; i < exact.values.size(); ++i) {
    if ((exact.values[i] == -1) != (close.values[i] == -1)) ++uncovered;
    if (exact.values[i] == -1 || close.values[i] == -1) continue;
    largest = std::max(largest, std::abs(exact.values[i] - close.values[i]));
  }
  EXPECT_GT(largest, 1e-4);
  EXPECT_LE(largest, 0.125);
  EXPECT_LT(uncovered, 600);
  EXPECT_NE(Difference(exact, close), "");
}

TEST_F(Resampling, ChoosesTheGridThatIsAskedFor) {
  Write(NoiseImage(100, 80, 1, GDT_Byte, {}, 8), folder_ / "in.tif", {},
        Georeference(kNorthUp, 32633));
  const struct {
    Arguments options;
    int width, height;
    Transform transform;
  } kCases[] = {
      {{}, 100, 80, kNorthUp},
      {{"--tr", "60", "15"}, 50, 160, {500000, 60, 0, 5100000, 0, -15}},
      {{"--te", "500300", "5098800", "501200", "5099400"},
       30,
       20,
       {500300, 30, 0, 5099400, 0, -30}},
      {{"--te", "-10", "5099000", "501000", "5099010", "--tr", "1000", "3"},
       501,
       3,
       {-10, 1000, 0, 5099010, 0, -3}},
  };
  for (const auto& c : kCases) {
    const Image result = Resample(c.options);
    EXPECT_EQ(result.width, c.width);
    EXPECT_EQ(result.height, c.height);
    const Transform transform = GeoTransform();
    for (std::size_t i = 0; i < 6; ++i) EXPECT_NEAR(transform[i], c.transform[i], 1e-6) << i;
  }
}

TEST_F(Resampling, MarksUncoveredPixelsByAMaskWhereNothingElseTells) {
  const Image image = NoiseImage(20, 10, 1, GDT_Byte, {}, 8);
  Write(image, folder_ / "in.tif", {}, Georeference(kNorthUp, 32633));
  const Arguments wider{"--te", "499850", "5099700", "500600", "5100000"};
  const Image result = Resample(wider);
  const std::vector<std::uint8_t> mask = MaskOf("out.tif");
  for (int y = 0; y < 10; ++y) {
    for (int x = 0; x < 25; ++x) {
      ASSERT_EQ(mask[static_cast<std::size_t>(y * 25 + x)], x < 5 ? 0 : 255);
      ASSERT_EQ(result.At(x, y, 0), x < 5 ? 0 : image.At(x - 5, y, 0));
    }
  }
  Arguments declared = wider;
  declared.insert(declared.end(), {"--dst-nodata", "200"});
  EXPECT_EQ(Resample(declared).At(4, 3, 0), 200);
  EXPECT_EQ(OpenImage(folder_ / "out.tif")->GetRasterBand(1)->GetMaskFlags(), GMF_NODATA);

  // A mask of the file and a mask file take pixels out; the mask band goes along.
  Image half(20, 10, 1, GDT_Byte);
  for (int y = 0; y < 10; ++y) {
    for (int x = 10; x < 20; ++x) half.At(x, y, 0) = 1;
  }
  Write(half, folder_ / "half.tif");
  Arguments masked = wider;
  masked.insert(masked.end(), {"--mask", folder_ / "half.tif"});
  Resample(masked);
  EXPECT_EQ(MaskOf("out.tif")[14], 0);
  EXPECT_EQ(MaskOf("out.tif")[15], 255);
}

TEST_F(Resampling, TakesTransparentPixelsOutAndResamplesAlpha) {
  Image image = NoiseImage(20, 10, 4, GDT_Byte, {}, 8);
  for (int y = 0; y < 10; ++y) {
    for (int x = 0; x < 20; ++x) image.At(x, y, 3) = x == 7 ? 0 : 255;
  }
  Write(image, folder_ / "in.tif", {"PHOTOMETRIC=RGB", "ALPHA=YES"}, Georeference(kNorthUp, 32633));
  const Image result =
      Resample({"-r", "bilinear", "--te", "499910", "5099700", "500600", "5100000"});
  for (const int x : {0, 2, 10}) EXPECT_EQ(result.At(x, 4, 3), 0) << x;
  EXPECT_EQ(result.At(3, 4, 3), 255);
  EXPECT_EQ(result.At(9, 4, 1), image.At(6, 4, 1));
  EXPECT_EQ(OpenImage(folder_ / "out.tif")->GetRasterBand(1)->GetMaskFlags(),
            GMF_ALPHA | GMF_PER_DATASET);
}

TEST_F(Resampling, LocatesByControlPointsAndByRpc) {
  const Image image = NoiseImage(60, 40, 1, GDT_Byte, {}, 8);
  Write(image, folder_ / "in.tif", {}, [](GDALDataset& dataset) {
    OGRSpatialReference crs;
    crs.importFromEPSG(32633);
    GDAL_GCP points[4] = {};
    const double corners[4][2] = {{0, 0}, {60, 0}, {0, 40}, {60, 40}};
    for (int i = 0; i < 4; ++i) {
      points[i].pszId = points[i].pszInfo = const_cast<char*>("");
      points[i].dfGCPPixel = corners[i][0];
      points[i].dfGCPLine = corners[i][1];
      points[i].dfGCPX = 500000 + 30 * corners[i][0];
      points[i].dfGCPY = 5100000 - 30 * corners[i][1];
    }
    dataset.SetGCPs(4, points, &crs);
  });
  const Arguments grid{"--te", "500000", "5098800", "501800", "5100000", "--tr", "30", "30"};
  EXPECT_EQ(Difference(image, Resample(grid)), "");
  const OpenDataset placed = OpenImage(folder_ / "out.tif");
  EXPECT_EQ(placed->GetGCPCount(), 0);
  EXPECT_STREQ(placed->GetSpatialRef()->GetAuthorityCode(nullptr), "32633");

  // Lines run with latitude and samples with longitude, a hundredth of a degree for each.
  const std::string zeros = " 0 0 0 0 0 0 0 0 0 0 0 0 0 0 0 0 0";
  const auto writeWithRpc = [&](const char* height) {
    const std::vector<std::pair<const char*, std::string>> items{
        {"LINE_OFF", "19.5"},
        {"SAMP_OFF", "29.5"},
        {"LAT_OFF", "40"},
        {"LONG_OFF", "10"},
        {"HEIGHT_OFF", "0"},
        {"LINE_SCALE", "20"},
        {"SAMP_SCALE", "30"},
        {"LAT_SCALE", "0.2"},
        {"LONG_SCALE", "0.3"},
        {"HEIGHT_SCALE", "100"},
        {"LINE_NUM_COEFF", "0 0 -1" + zeros},
        {"LINE_DEN_COEFF", "1 0 0" + zeros},
        {"SAMP_NUM_COEFF", "0 1 0 " + std::string(height) + zeros.substr(2)},
        {"SAMP_DEN_COEFF", "1 0 0" + zeros}};
    Write(image, folder_ / "in.tif", {}, [&](GDALDataset& dataset) {
      for (const auto& [key, value] : items) dataset.SetMetadataItem(key, value.c_str(), "RPC");
    });
  };
  writeWithRpc("0");
  const Arguments degrees{"--te", "9.7", "39.8", "10.3", "40.2", "--tr", "0.01", "0.01"};
  EXPECT_EQ(Difference(image, Resample(degrees)), "");
  EXPECT_EQ(OpenImage(folder_ / "out.tif")->GetMetadata("RPC"), nullptr);

  // 30 samples for every 100 m of height: the image moves by 3 where the heights are 10.
  writeWithRpc("1");
  Image heights(100, 80, 1, GDT_Float32);
  for (int y = 40; y < 80; ++y) {
    for (int x = 0; x < 100; ++x) heights.At(x, y, 0) = 10;
  }
  Write(heights, folder_ / "heights.tif", {}, Georeference({9.5, 0.01, 0, 40.4, 0, -0.01}, 4326));
  Arguments raised = degrees;
  raised.insert(raised.end(), {"--rpc-dem", folder_ / "heights.tif", "--dst-nodata", "255"});
  const Image result = Resample(raised);
  for (int y = 0; y < 40; ++y) {
    for (int x = 0; x < 60; ++x) {
      const int from = y < 20 ? x : x + 3;
      ASSERT_EQ(result.At(x, y, 0), from < 60 ? image.At(from, y, 0) : 255) << x << " " << y;
    }
  }
}

TEST_F(Resampling, GivesTheOutputsNoDataToAllThatHasNoValue) {
  const Image image = NoiseImage(40, 30, 2, GDT_Int16, -5, 8);
  Write(image, folder_ / "in.tif", {}, Georeference(kNorthUp, 32633, -5));
  for (const Arguments& command :
       std::vector<Arguments>{{"shift", "--dx", "2"},
                              {"resample", "--te", "500060", "5099100", "501260", "5100000"}}) {
    for (const char* const values : {"77", "77,-78", "none"}) {
      Arguments arguments = command;
      arguments.insert(arguments.end(), {"--dst-nodata", values});
      const Image result = Run(arguments);
      const std::vector<std::uint8_t> mask = MaskOf("out.tif");
      for (int y = 0; y < 30; ++y) {
        for (int x = 0; x < 40; ++x) {
          SCOPED_TRACE(command[0] + " " + values + " at " + std::to_string(x) + " " +
                       std::to_string(y));
          const bool covered = x < 38 && !image.AllBands(x + 2, y, -5);
          const auto pixel = static_cast<std::size_t>(y * 40 + x);
          if (covered) {
            ASSERT_EQ(result.At(x, y, 0), image.At(x + 2, y, 0));
            ASSERT_EQ(result.At(x, y, 1), image.At(x + 2, y, 1));
          } else if (std::string(values) != "none") {
            ASSERT_EQ(result.At(x, y, 0), 77);
            ASSERT_EQ(result.At(x, y, 1), std::string(values) == "77" ? 77 : -78);
          }
          if (std::string(values) == "none") {
            ASSERT_EQ(mask[pixel], covered ? 255 : 0);
          }
        }
      }
    }
  }
}

TEST_F(Resampling, ComplexImagesKnowNoDataAsRealOnesDo) {
  const Arguments variants[] = {
      {"shift", "--dx", "-3", "--dst-nodata", "77,-78"},
      {"resample", "-r", "cubic", "--te", "499900", "5099110", "501200", "5100010"},
      {"resample", "-r", "bilinear", "--te", "499900", "5099110", "501200", "5100010",
       "--dst-nodata", "77,-78"}};
  Image image = NoiseImage(40, 30, 2, GDT_Int16, -5, 8);
  for (const Arguments& arguments : variants) {
    image.type = GDT_Int16;
    Write(image, folder_ / "in.tif", {}, Georeference(kNorthUp, 32633, -5));
    Image expected = Run(arguments);
    image.type = expected.type = GDT_CInt16;
    Write(image, folder_ / "in.tif", {}, Georeference(kNorthUp, 32633, -5));
    EXPECT_EQ(Difference(expected, Run(arguments)), "") << arguments[0];
  }
}

TEST_F(Resampling, ComputedPixelsNeverBecomeNoData) {
  // Half a pixel further every pixel is the mean of its neighbours, the no-data pixel of the
  // output.
  Image image(6, 1, 2, GDT_Byte);
  for (int x = 0; x < 6; ++x) {
    image.At(x, 0, 0) = x % 2 == 0 ? 99 : 101;
    image.At(x, 0, 1) = x % 2 == 0 ? 48 : 52;
  }
  Write(image, folder_ / "in.tif", {}, Georeference(kNorthUp, 32633));
  const Image result = Resample({"-r", "bilinear", "--dst-nodata", "100,50", "--te", "500015",
                                 "5099970", "500165", "5100000"});
  for (int x = 0; x < 5; ++x) {
    EXPECT_EQ(result.At(x, 0, 0), 101);
    EXPECT_EQ(result.At(x, 0, 1), 51);
  }
}

TEST_F(Resampling, RefusesWhatMakesNoGrid) {
  Write(NoiseImage(20, 10, 1, GDT_Byte, {}, 8), folder_ / "in.tif", {},
        Georeference(kNorthUp, 32633));
  Write(NoiseImage(20, 10, 1, GDT_Byte, {}, 8), folder_ / "bare.tif");
  const std::string in = folder_ / "in.tif";
  const std::string bare = folder_ / "bare.tif";
  const std::string nowhere = folder_ / "nowhere.tif";
  const std::string palette = folder_ / "palette.tif";
  Write(NoiseImage(20, 10, 1, GDT_Byte, {}, 8), nowhere, {}, [](GDALDataset& dataset) {
    Transform transform = kNorthUp;
    dataset.SetGeoTransform(transform.data());
  });
  Write(Image(20, 10, 1, GDT_Byte), palette, {}, Colours());
  const struct {
    Arguments arguments;
    int status;
    const char* part;
  } kCases[] = {
      {{"-r", "lanczos", in}, 2, "lanczos not in {nearest,bilinear,cubic}"},
      {{"--t-srs", "EPSG:0", in}, 2, "EPSG:0"},
      {{"--te", "1", "2", "1", "3", in}, 2, "--te"},
      {{"--te", "1", "2", "3", "nan", in}, 2, "--te"},
      {{"--tr", "0", "1", in}, 2, "--tr"},
      {{"--tr", "1e-9", "1e-9", in}, 2, "--tr"},
      {{"--like", bare, in}, 2, "bare.tif"},
      {{"--like", in, "--tr", "1", "1", in}, 2, "--like"},
      {{"--like", folder_ / "none.tif", in}, 1, "none.tif"},
      {{"--rpc-dem", in, in}, 2, "--rpc-dem"},
      {{"--error-threshold", "-1", in}, 2, "'-1' is not a finite number of at least 0"},
      {{"--error-threshold", "nan", in}, 2, "'nan' is not a finite number of at least 0"},
      {{bare}, 1, "bare.tif: it does not say where it lies"},
      {{"--t-srs", "EPSG:4326", nowhere}, 1, "nowhere.tif: it names no coordinate system"},
      {{"--like", in, nowhere}, 1, "nowhere.tif: it names no coordinate system"},
      {{"-r", "cubic", palette}, 1, "palette.tif, band 1, has a palette"},
  };
  for (const auto& c : kCases) {
    Arguments arguments = c.arguments;
    arguments.insert(arguments.begin(), "resample");
    arguments.push_back(folder_ / "out.tif");
    ExpectOneLine(RunProgram(arguments), c.status, c.part);
  }
  ExpectOneLine(RunProgram({"shift", "--mask", in, in, folder_ / "out.tif"}), 2, "--mask");
  EXPECT_EQ(folder_.Names(),
            (std::set<std::string>{"in.tif", "bare.tif", "nowhere.tif", "palette.tif"}));
}

TEST_F(Resampling, CopiedPixelsKeepTheirPalette) {
  const Image image = NoiseImage(20, 10, 1, GDT_Byte, {}, 8);
  Write(image, folder_ / "in.tif", {}, Colours());
  const struct {
    Arguments arguments;
    int shift;
  } kCases[] = {{{"shift", "--dx", "1"}, 1},
                {{"shift", "--of", "PNG"}, 0},
                {{"resample", "--te", "500030", "5099700", "500600", "5100000"}, 1}};
  for (const auto& c : kCases) {
    const Image result = Run(c.arguments);
    for (int x = 0; x < 19; ++x) EXPECT_EQ(result.At(x, 3, 0), image.At(x + c.shift, 3, 0));
    const OpenDataset output = OpenImage(folder_ / "out.tif");
    const GDALColorTable* const table = output->GetRasterBand(1)->GetColorTable();
    ASSERT_NE(table, nullptr) << c.arguments[1];
    EXPECT_EQ(table->GetColorEntry(3)->c2, 250);
    EXPECT_EQ(table->GetColorEntry(4)->c3, 9);
  }
}

TEST_F(Resampling, WarnsWhenNothingIsCovered) {
  Write(NoiseImage(20, 10, 1, GDT_Byte, {}, 8), folder_ / "in.tif", {},
        Georeference(kNorthUp, 32633));
  Resample({"--te", "1000", "2000", "1300", "2300"}, "no pixel of");
  Run({"shift", "--dx", "20"}, "no pixel of");
}

TEST_F(Resampling, ShiftMovesWholePixelsOnTheGrid) {
  const Image image = NoiseImage(90, 60, 2, GDT_Int16, -5, 8);
  Write(image, folder_ / "in.tif", {}, Georeference(kNorthUp, 32633, -5));
  for (const auto& [dx, dy] : {std::pair(3, -2), std::pair(-100, 0), std::pair(0, 59)}) {
    Image expected = image;
    for (int y = 0; y < 60; ++y) {
      for (int x = 0; x < 90; ++x) {
        const bool covered = x + dx >= 0 && x + dx < 90 && y + dy >= 0 && y + dy < 60;
        for (int band = 0; band < 2; ++band) {
          expected.At(x, y, band) = covered ? image.At(x + dx, y + dy, band) : -5;
        }
      }
    }
    for (const char* const window : {"16x7", "90x60"}) {
      const Arguments shift{"shift",    "--dx", std::to_string(dx), "--dy", std::to_string(dy),
                            "--window", window};
      EXPECT_EQ(Difference(expected, Run(shift, dx == -100 ? "no pixel of" : "")), "");
      EXPECT_EQ(GeoTransform(), kNorthUp);
    }
  }
}

TEST_F(Resampling, ShiftMovesTheMaskBand) {
  const Image image = NoiseImage(90, 60, 2, GDT_Int16, {}, 8);
  std::vector<std::uint8_t> mask(90 * 60, 255);
  for (std::size_t i = 0; i < mask.size(); i += 7) mask[i] = 0;
  Write(image, folder_ / "in.tif");
  Run({"shift", "--dx", "1"});
  EXPECT_EQ(MaskOf("out.tif")[88], 255);
  EXPECT_EQ(MaskOf("out.tif")[89], 0);

  Write(image, folder_ / "in.tif", {}, [&](GDALDataset& dataset) {
    dataset.CreateMaskBand(GMF_PER_DATASET);
    ASSERT_EQ(dataset.GetRasterBand(1)->GetMaskBand()->RasterIO(GF_Write, 0, 0, 90, 60, mask.data(),
                                                                90, 60, GDT_Byte, 0, 0, nullptr),
              CE_None);
  });
  const Image result = Run({"shift", "--dx", "-4", "--dy", "2", "--window", "16x7"});
  const std::vector<std::uint8_t> moved = MaskOf("out.tif");
  for (int y = 0; y < 60; ++y) {
    for (int x = 0; x < 90; ++x) {
      const bool exists = x >= 4 && y < 58;
      const int from = (y + 2) * 90 + x - 4;
      ASSERT_EQ(moved[static_cast<std::size_t>(y * 90 + x)],
                exists ? mask[static_cast<std::size_t>(from)] : 0)
          << x << " " << y;
      if (exists) {
        ASSERT_EQ(result.At(x, y, 1), image.At(x - 4, y + 2, 1));
      }
    }
  }
}

}  // namespace
}  // namespace zarn::testsupport
