// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <ogr_spatialref.h>
#include <ogrsf_frmts.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <fstream>
#include <functional>
#include <iterator>
#include <limits>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tests/apps/zarn/cutlinereference.h"
#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"

namespace zarn::testsupport {
namespace {

using Arguments = std::vector<std::string>;
constexpr int kColumns = 300;
constexpr int kRows = 280;
// The source lies within the mosaic, from this pixel on.
constexpr int kLeft = 50;
constexpr int kTop = 40;
constexpr int kSourceColumns = 200;
constexpr int kSourceRows = 210;
constexpr double kSourceNoData = 7;
constexpr double kMosaicNoData = 0;

// A star with a hole, in pixels of the mosaic; it reaches beyond the source.
Polygon Star() {
  Ring ring;
  for (int i = 0; i <= 14; ++i) {
    const double angle = 2 * M_PI * (i % 14) / 14;
    const double radius = i % 2 == 0 ? 131.9 : 58.3;
    ring.emplace_back(Sixteenth(150.2 + radius * std::cos(angle)),
                      Sixteenth(139.6 + radius * std::sin(angle)));
  }
  return {ring, Rectangle(140.1875, 120.3125, 171.3125, 159.9375)};
}

/// Pixels of the mosaic and of the source that count as being without data.
using Without = std::function<bool(const Image&, int x, int y)>;

Without NoData(double value) {
  return [=](const Image& image, int x, int y) { return image.AllBands(x, y, value); };
}

struct Expected {
  Image mosaic;
  Image map{kColumns, kRows, 1, GDT_Byte};
};

Expected Blended(const Image& source, const Image& mosaic, const Polygon& polygon, int feather,
                 const Without& sourceWithout, const Without& mosaicWithout) {
  Expected result{mosaic};
  for (int y = 0; y < source.height; ++y) {
    for (int x = 0; x < source.width; ++x) {
      const double w = Weight(polygon, x + kLeft + 0.5, y + kTop + 0.5, feather);
      if (w <= -1 || sourceWithout(source, x, y)) continue;
      const bool whole = w >= 1 || mosaicWithout(mosaic, x + kLeft, y + kTop);
      const double a = whole ? 1 : 0.5 * w + 0.5;
      for (int band = 0; band < source.bands; ++band) {
        double& value = result.mosaic.At(x + kLeft, y + kTop, band);
        const double mixed =
            whole ? source.At(x, y, band) : source.At(x, y, band) * a + value * (1 - a);
        value = GDALDataTypeIsInteger(source.type) != FALSE ? std::trunc(mixed)
                                                            : static_cast<float>(mixed);
      }
      if (a >= 0.5) result.map.At(x + kLeft, y + kTop, 0) = 3;
    }
  }
  return result;
}

class Blending : public testing::Test {
 protected:
  void WriteScene(GDALDataType type, int bands = 3) {
    source_ = NoiseImage(kSourceColumns, kSourceRows, bands, type, kSourceNoData, 3);
    mosaic_ = NoiseImage(kColumns, kRows, bands, type, kMosaicNoData, 4);
    Write(source_, folder_ / "source.tif", {}, Georeference(kLeft, kTop, kSourceNoData));
    WriteMosaic();
  }
  void WriteMosaic(const Arguments& options = {"TILED=YES", "BLOCKXSIZE=64", "BLOCKYSIZE=32"}) {
    Write(mosaic_, folder_ / "mosaic.tif", options, Georeference(0, 0, kMosaicNoData));
  }
  Outcome Blend(Arguments options) {
    options.insert(options.begin(), {"blend", "--cutline", folder_ / "cutline.gpkg"});
    options.insert(options.end(), {folder_ / "source.tif", folder_ / "mosaic.tif"});
    return RunProgram(options);
  }
  /// The mosaic afterwards.
  Image Blended(const Arguments& options) {
    const Outcome outcome = Blend(options);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    EXPECT_EQ(outcome.err, "");
    return Read(folder_ / "mosaic.tif");
  }

  TemporaryFolder folder_;
  Image source_{0, 0, 0, GDT_Byte};
  Image mosaic_{0, 0, 0, GDT_Byte};
};

TEST_F(Blending, FollowsTheFormulaWithHoleNoDataAndSourceMap) {
  WriteFeatures({{OnMap(Star())}}, folder_ / "cutline.gpkg");
  for (const GDALDataType type : {GDT_Byte, GDT_UInt16, GDT_Float32}) {
    for (const int feather : {0, 9}) {
      SCOPED_TRACE(std::string(GDALGetDataTypeName(type)) + " " + std::to_string(feather));
      WriteScene(type);
      const Expected expected = testsupport::Blended(source_, mosaic_, Star(), feather,
                                                     NoData(kSourceNoData), NoData(kMosaicNoData));
      const Image result = Blended({"--feather", std::to_string(feather), "--source-map",
                                    folder_ / "map.tif", "--source-id", "3"});
      EXPECT_EQ(Difference(expected.mosaic, result), "");
      EXPECT_EQ(Difference(expected.map, Read(folder_ / "map.tif")), "");
      std::filesystem::remove(folder_ / "map.tif");
    }
  }
}

TEST_F(Blending, TheTileCutsTheFeatherOff) {
  WriteFeatures({{OnMap(Star())}}, folder_ / "cutline.gpkg");
  WriteFeatures({{OnMap({Rectangle(100, 60, 190, 150)})}}, folder_ / "tile.geojson", "GeoJSON");
  WriteScene(GDT_Byte);
  Image expected = testsupport::Blended(source_, mosaic_, Star(), 9, NoData(kSourceNoData),
                                        NoData(kMosaicNoData))
                       .mosaic;
  for (int y = 0; y < kRows; ++y) {
    for (int x = 0; x < kColumns; ++x) {
      if (x >= 100 && x < 190 && y >= 60 && y < 150) continue;
      for (int band = 0; band < 3; ++band) expected.At(x, y, band) = mosaic_.At(x, y, band);
    }
  }
  EXPECT_EQ(Difference(expected, Blended({"--feather", "9", "--tile", folder_ / "tile.geojson"})),
            "");
}

TEST_F(Blending, DoesNotDependOnWindowsThreadsOrPlace) {
  WriteFeatures({{OnMap(Star())}}, folder_ / "cutline.gpkg");
  WriteScene(GDT_Byte);
  const Arguments common{"--feather",         "12",          "--source-map",
                         folder_ / "map.tif", "--source-id", "200"};
  const Image expected = Blended(common);
  const Image map = Read(folder_ / "map.tif");
  EXPECT_EQ(folder_.Names().size(), 4U);
  for (const Arguments& variant : std::vector<Arguments>{{"--window", "17x13"},
                                                         {"--window", "1000x3"},
                                                         {"--threads", "1"},
                                                         {"--threads", "2"},
                                                         {"--in-place"},
                                                         {"--memory", "5"}}) {
    SCOPED_TRACE(variant.front() + " " + variant.back());
    for (const Arguments& layout : {Arguments{"COMPRESS=DEFLATE"}, Arguments{"TILED=YES"}}) {
      WriteMosaic(layout);
      Write(Image(kColumns, kRows, 1, GDT_Byte), folder_ / "map.tif", {}, Georeference(0, 0));
      Arguments arguments = common;
      arguments.insert(arguments.end(), variant.begin(), variant.end());
      EXPECT_EQ(Difference(expected, Blended(arguments)), "");
      EXPECT_EQ(Difference(map, Read(folder_ / "map.tif")), "");
    }
  }
}

// Transparent source pixels stay out, transparent mosaic pixels are filled whole and become as
// opaque as the source there.
TEST_F(Blending, AlphaTellsWhatIsWithoutData) {
  WriteFeatures({{OnMap(Star())}}, folder_ / "cutline.gpkg");
  WriteScene(GDT_Byte, 4);
  const auto setAlpha = [](Image& image, int seed) {
    for (int y = 0; y < image.height; ++y) {
      for (int x = 0; x < image.width; ++x) {
        image.At(x, y, 3) = (x / 9 + y / 7 + seed) % 5 == 0 ? 0 : 255;
      }
    }
  };
  setAlpha(source_, 0);
  setAlpha(mosaic_, 2);
  const auto write = [&](const Image& image, const std::string& file, int left, int top) {
    Write(image, folder_ / file, {"ALPHA=YES", "PHOTOMETRIC=RGB"}, Georeference(left, top));
  };
  write(source_, "source.tif", kLeft, kTop);
  write(mosaic_, "mosaic.tif", 0, 0);
  const Without transparent = [](const Image& image, int x, int y) {
    return image.At(x, y, 3) == 0;
  };
  Expected expected = testsupport::Blended(source_, mosaic_, Star(), 9, transparent, transparent);
  // Alphas that are equal on both sides stay exactly so.
  for (int y = 0; y < kRows; ++y) {
    for (int x = 0; x < kColumns; ++x) {
      double& alpha = expected.mosaic.At(x, y, 3);
      alpha = alpha > 0 ? 255 : 0;
    }
  }
  const Image result =
      Blended({"--feather", "9", "--source-map", folder_ / "map.tif", "--source-id", "3"});
  EXPECT_EQ(Difference(expected.mosaic, result), "");
  EXPECT_EQ(Difference(expected.map, Read(folder_ / "map.tif")), "");
}

TEST_F(Blending, NaNMasksAndTheMaskFileCountAsWithoutData) {
  WriteFeatures({{OnMap(Star())}}, folder_ / "cutline.gpkg");
  WriteScene(GDT_Float32, 2);
  const double nan = std::numeric_limits<double>::quiet_NaN();
  Image mask(kSourceColumns, kSourceRows, 1, GDT_Byte);
  for (int i = 0; i < kSourceColumns * kSourceRows; ++i) {
    const auto pixel = static_cast<std::size_t>(i);
    mask.values[pixel] = i % 11 == 0 ? 0 : 1;
    if (i % 13 == 0) source_.values[2 * pixel + 1] = nan;
  }
  for (std::size_t i = 0; i < mosaic_.values.size(); i += 6) mosaic_.values[i] = nan;
  Write(source_, folder_ / "source.tif", {}, Georeference(kLeft, kTop));
  Write(mask, folder_ / "mask.tif");
  Write(mosaic_, folder_ / "mosaic.tif", {}, Georeference(0, 0));
  const auto hasNaN = [](const Image& image, int x, int y) {
    return std::isnan(image.At(x, y, 0)) || std::isnan(image.At(x, y, 1));
  };
  const Expected expected = testsupport::Blended(
      source_, mosaic_, Star(), 9,
      [&](const Image& image, int x, int y) {
        return hasNaN(image, x, y) || mask.At(x, y, 0) == 0;
      },
      hasNaN);
  EXPECT_EQ(
      Difference(expected.mosaic, Blended({"--feather", "9", "--mask", folder_ / "mask.tif"})), "");
}

TEST_F(Blending, FillsTheMaskOfTheMosaic) {
  WriteScene(GDT_Byte, 1);
  WriteFeatures({{OnMap({Rectangle(100, 100, 130, 120)})}}, folder_ / "cutline.gpkg");
  Write(source_, folder_ / "source.tif", {}, Georeference(kLeft, kTop));
  Write(mosaic_, folder_ / "mosaic.tif", {}, [](GDALDataset& dataset) {
    Georeference(0, 0)(dataset);
    dataset.CreateMaskBand(GMF_PER_DATASET);
    dataset.GetRasterBand(1)->GetMaskBand()->Fill(0);
  });
  const Image result = Blended({"--feather", "4"});
  const OpenDataset dataset = OpenImage(folder_ / "mosaic.tif");
  GDALRasterBand* const mask = dataset->GetRasterBand(1)->GetMaskBand();
  std::vector<std::uint8_t> valid(std::size_t{kColumns} * kRows);
  ASSERT_EQ(mask->RasterIO(GF_Read, 0, 0, kColumns, kRows, valid.data(), kColumns, kRows, GDT_Byte,
                           0, 0, nullptr),
            CE_None);
  for (int y = 0; y < kRows; ++y) {
    for (int x = 0; x < kColumns; ++x) {
      const bool touched = Weight({Rectangle(100, 100, 130, 120)}, x + 0.5, y + 0.5, 4) > -1;
      ASSERT_EQ(valid[static_cast<std::size_t>(y * kColumns + x)], touched ? 255 : 0);
      ASSERT_EQ(result.At(x, y, 0),
                touched ? source_.At(x - kLeft, y - kTop, 0) : mosaic_.At(x, y, 0));
    }
  }
}

// Where features meet there is no edge; features that --where excludes do not count. Rings need not
// be closed.
TEST_F(Blending, UnitesTheChosenFeatures) {
  WriteScene(GDT_Byte);
  WriteFeatures({{OnMap({Rectangle(90, 90, 160, 180)})}}, folder_ / "cutline.gpkg");
  const Image expected = Blended({"--feather", "10"});
  Ring open = Rectangle(120, 90, 160, 180);
  open.pop_back();
  WriteFeatures({{OnMap({Rectangle(90, 90, 130, 180)}), "in"},
                 {OnMap({open}), "in"},
                 {OnMap({Rectangle(200, 90, 240, 180)}), "out"},
                 {OnMap({{{92, 92}, {95, 95}, {92, 92}}}), "in"}},
                folder_ / "parts.geojson", "GeoJSON");
  WriteMosaic();
  const Outcome outcome =
      RunProgram({"blend", "-q", "--cutline", folder_ / "parts.geojson", "--where", "name = 'in'",
                  "--feather", "10", folder_ / "source.tif", folder_ / "mosaic.tif"});
  ASSERT_EQ(outcome.status, 0) << outcome.err;
  EXPECT_EQ(Difference(expected, Read(folder_ / "mosaic.tif")), "");
}

// Straight edges in degrees are bent on the map.
TEST_F(Blending, FollowsEdgesThroughTheReprojection) {
  constexpr double kWide = 6000;  // of a pixel here
  constexpr int kAcross = 150;
  constexpr int kDown = 140;
  const auto place = [&](GDALDataset& dataset) {
    double transform[] = {kEast, kWide, 0, kNorth, 0, -kWide};
    dataset.SetGeoTransform(transform);
    const OGRSpatialReference system = System(32633);
    dataset.SetSpatialRef(&system);
  };
  const Image ones = [] {
    Image image(kAcross, kDown, 1, GDT_Byte);
    std::fill(image.values.begin(), image.values.end(), 1);
    return image;
  }();
  Write(ones, folder_ / "source.tif", {}, place);
  Write(Image(kAcross, kDown, 1, GDT_Byte), folder_ / "mosaic.tif", {}, place);
  const Ring ring{{15.5, 39.1}, {25.5, 39.3}, {25.2, 45.6}, {15.7, 45.4}, {15.5, 39.1}};
  WriteFeatures({{{ring}}}, folder_ / "cutline.gpkg", "GPKG", 4326);
  const Image result = Blended({});

  const OGRSpatialReference from = System(4326);
  const OGRSpatialReference to = System(32633);
  const std::unique_ptr<OGRCoordinateTransformation> transformation(
      OGRCreateCoordinateTransformation(&from, &to));
  Ring dense;
  for (std::size_t i = 0; i + 1 < ring.size(); ++i) {
    for (int k = 0; k < 60; ++k) {
      double x = ring[i].first + (ring[i + 1].first - ring[i].first) * k / 60;
      double y = ring[i].second + (ring[i + 1].second - ring[i].second) * k / 60;
      transformation->Transform(1, &x, &y);
      dense.emplace_back((x - kEast) / kWide, (kNorth - y) / kWide);
    }
  }
  dense.push_back(dense.front());
  int pasted = 0;
  for (int y = 0; y < kDown; ++y) {
    for (int x = 0; x < kAcross; ++x) {
      const double w = Weight({dense}, x + 0.5, y + 0.5, 1);
      pasted += result.At(x, y, 0) > 0 ? 1 : 0;
      // An eighth of a pixel from the edge nothing is promised.
      if (std::abs(w) > 0.13) {
        ASSERT_EQ(result.At(x, y, 0), w > 0 ? 1 : 0) << x << ", " << y;
      }
    }
  }
  EXPECT_GT(pasted, 10000);
}

TEST_F(Blending, StopsAtNoDataAndLeavesEverythingAsItWas) {
  WriteScene(GDT_Byte);
  WriteFeatures({{OnMap(Star())}}, folder_ / "cutline.gpkg");
  Write(Image(kColumns, kRows, 1, GDT_Byte), folder_ / "map.tif", {}, Georeference(0, 0));
  const std::string mosaic = BytesOf(folder_ / "mosaic.tif");
  const std::string map = BytesOf(folder_ / "map.tif");
  const Arguments options{"--stop-on-nodata",  "--window",    "50x40", "--source-map",
                          folder_ / "map.tif", "--source-id", "9"};
  for (const Arguments& extra : {Arguments{}, Arguments{"--in-place"}}) {
    Arguments arguments = options;
    arguments.insert(arguments.end(), extra.begin(), extra.end());
    ExpectOneLine(Blend(arguments), 1, "Cutline operation aborted.");
    EXPECT_TRUE(BytesOf(folder_ / "mosaic.tif") == mosaic);
    EXPECT_TRUE(BytesOf(folder_ / "map.tif") == map);
    EXPECT_EQ(folder_.Names().size(), 4U);
  }
  // Without no-data there is nothing to stop at.
  EXPECT_EQ(Blend({"--stop-on-nodata", "--in-place", "--src-nodata", "none"}).status, 0);
}

TEST_F(Blending, SourceMapIsAsWideAsTheIdAndKeepsWhatItHolds) {
  WriteScene(GDT_Byte, 1);
  WriteFeatures({{OnMap({Rectangle(100, 100, 110, 110)})}}, folder_ / "cutline.gpkg");
  const auto run = [&](const std::string& map, const std::string& id) {
    return Blend({"--src-nodata", "none", "--source-map", folder_ / map, "--source-id", id});
  };
  EXPECT_EQ(run("a.tif", "300").status, 0);
  EXPECT_EQ(run("b.tif", "4294967295").status, 0);
  WriteFeatures({{OnMap({Rectangle(105, 100, 120, 110)})}}, folder_ / "next.gpkg");
  std::filesystem::rename(folder_ / "next.gpkg", folder_ / "cutline.gpkg");
  EXPECT_EQ(run("a.tif", "301").status, 0);
  const Image a = Read(folder_ / "a.tif");
  EXPECT_EQ(a.type, GDT_UInt16);
  EXPECT_EQ(a.At(104, 105, 0), 300);
  EXPECT_EQ(a.At(105, 105, 0), 301);
  EXPECT_EQ(a.At(119, 109, 0), 301);
  EXPECT_EQ(a.At(120, 105, 0), 0);
  EXPECT_EQ(Read(folder_ / "b.tif").At(104, 105, 0), 4294967295.0);
  ExpectOneLine(run("a.tif", "70000"), 1, "cannot hold 70000");
}

TEST_F(Blending, RefusesWhatCannotBeBlended) {
  WriteScene(GDT_Byte);
  const std::string source = folder_ / "source.tif";
  const std::string mosaic = folder_ / "mosaic.tif";
  const std::string cutline = folder_ / "cutline.gpkg";
  WriteFeatures({{OnMap(Star())}}, cutline);
  WriteFeatures({{OnMap({Rectangle(-90, -90, -50, -50)})}}, folder_ / "elsewhere.gpkg");
  WriteFeatures({{OnMap({Rectangle(2, 2, 20, 20)})}}, folder_ / "beside.gpkg");
  WriteFeatures({{OnMap({{{1, 1}, {2, 2}, {1, 1}}})}}, folder_ / "thin.gpkg");
  std::ofstream(folder_ / "line.geojson")
      << R"({"type":"LineString","coordinates":[[14.9,46],[15.1,46]]})";
  const double nan = std::numeric_limits<double>::quiet_NaN();
  WriteFeatures({{OnMap({{{1, 1}, {2, nan}, {3, 3}, {1, 1}}})}}, folder_ / "nan.gpkg");
  const Image small(40, 40, 3, GDT_Byte);
  Write(small, folder_ / "half.tif", {}, [](GDALDataset& dataset) {
    Georeference(0, 0)(dataset);
    double transform[] = {kEast + 15, kSize, 0, kNorth, 0, -kSize};
    dataset.SetGeoTransform(transform);
  });
  Write(small, folder_ / "far.tif", {}, Georeference(1000, 0));
  Write(Image(40, 40, 3, GDT_UInt16), folder_ / "short.tif", {}, Georeference(0, 0));
  Write(Image(40, 40, 1, GDT_Byte), folder_ / "grey.tif", {}, Georeference(0, 0));
  Write(small, folder_ / "other.tif", {}, Georeference(0, 0));
  const std::string before = BytesOf(mosaic);
  const struct {
    Arguments arguments;
    int status;
    const char* text;
  } kCases[] = {
      {{source, mosaic}, 2, "--cutline"},
      {{"--cutline", cutline, folder_ / "half.tif", mosaic}, 1, "(500015, 32, 0, 5100000, 0, -32)"},
      {{"--cutline", cutline, folder_ / "far.tif", mosaic}, 1, "no pixel in common"},
      {{"--cutline", cutline, folder_ / "short.tif", mosaic}, 1, "is UInt16, but"},
      {{"--cutline", cutline, folder_ / "grey.tif", mosaic}, 1, "has 1 bands"},
      {{"--cutline", cutline, mosaic, mosaic}, 2, "is a file of the input"},
      {{"--cutline", cutline, "--in-place", mosaic, mosaic}, 2, "is a file of the input"},
      {{"--cutline", folder_ / "none.gpkg", source, mosaic}, 1, "cannot open"},
      {{"--cutline", folder_ / "elsewhere.gpkg", source, mosaic}, 1, "misses"},
      {{"--cutline", folder_ / "beside.gpkg", source, mosaic}, 1, "nothing to paste"},
      {{"-q", "--cutline", folder_ / "thin.gpkg", source, mosaic}, 1, "has no polygon"},
      {{"--cutline", folder_ / "line.geojson", source, mosaic}, 1, "is a LINESTRING"},
      {{"--cutline", folder_ / "nan.gpkg", source, mosaic}, 1, "not finite"},
      {{"--cutline", cutline, "--layer", "nowhere", source, mosaic}, 2, "but: areas"},
      {{"--cutline", cutline, "--where", "height > 3", source, mosaic}, 2, "--where"},
      {{"--cutline", cutline, "--where", "name = 'x'", source, mosaic}, 1, "name = 'x'"},
      {{"--cutline", cutline, "--feather", "-1", source, mosaic}, 2, "--feather"},
      {{"--cutline", cutline, "--source-map", folder_ / "m.tif", source, mosaic}, 2, "--source-id"},
      {{"--cutline", cutline, "--source-map", mosaic, "--source-id", "1", source, mosaic},
       2,
       "is the mosaic"},
      {{"--cutline", cutline, "--source-map", folder_ / "grey.tif", "--source-id", "1", source,
        mosaic},
       1,
       "does not lie on the grid"},
      {{"--cutline", cutline, "--source-map", source, "--source-id", "1", source, mosaic},
       2,
       "is a file of the input"},
  };
  for (const auto& c : kCases) {
    Arguments arguments{"blend"};
    arguments.insert(arguments.end(), c.arguments.begin(), c.arguments.end());
    SCOPED_TRACE(c.text);
    ExpectOneLine(RunProgram(arguments), c.status, c.text);
    EXPECT_TRUE(BytesOf(mosaic) == before);
  }
}

}  // namespace
}  // namespace zarn::testsupport
