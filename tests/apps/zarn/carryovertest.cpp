// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <ogr_spatialref.h>

#include <cmath>
#include <fstream>
#include <string>

#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"

namespace zarn::testsupport {
namespace {

constexpr double kTransform[6] = {500000, 10, 0.5, 4600000, 0.25, -10};

void Dress(GDALDataset& dataset) {
  OGRSpatialReference utm;
  utm.importFromEPSG(32633);
  dataset.SetMetadataItem("AREA_OR_POINT", "Point");
  dataset.SetSpatialRef(&utm);
  double transform[6];
  std::copy(std::begin(kTransform), std::end(kTransform), transform);
  dataset.SetGeoTransform(transform);
  dataset.SetMetadataItem("ACQUIRED", "in spring");
  GDALRasterBand& band = *dataset.GetRasterBand(2);
  band.SetDescription("near infrared");
  band.SetMetadataItem("WAVELENGTH", "0.86");
  band.SetMetadataItem("STATISTICS_MEAN", "17");
  band.SetNoDataValue(3);
  band.SetOffset(-2);
  band.SetScale(0.5);
  band.SetUnitType("m");
}

void ExpectDressed(const std::string& file) {
  const OpenDataset dataset = OpenImage(file);
  double transform[6];
  ASSERT_EQ(dataset->GetGeoTransform(transform), CE_None);
  for (int i = 0; i < 6; ++i) EXPECT_DOUBLE_EQ(transform[i], kTransform[i]);
  ASSERT_NE(dataset->GetSpatialRef(), nullptr);
  EXPECT_STREQ(dataset->GetSpatialRef()->GetAuthorityCode(nullptr), "32633");
  EXPECT_STREQ(dataset->GetMetadataItem("AREA_OR_POINT"), "Point");
  EXPECT_STREQ(dataset->GetMetadataItem("ACQUIRED"), "in spring");
  GDALRasterBand& band = *dataset->GetRasterBand(2);
  EXPECT_STREQ(band.GetDescription(), "near infrared");
  EXPECT_STREQ(band.GetMetadataItem("WAVELENGTH"), "0.86");
  EXPECT_EQ(band.GetMetadataItem("STATISTICS_MEAN"), nullptr) << "of the unfiltered pixels";
  EXPECT_EQ(band.GetNoDataValue(), 3);
  EXPECT_EQ(band.GetOffset(), -2);
  EXPECT_EQ(band.GetScale(), 0.5);
  EXPECT_STREQ(band.GetUnitType(), "m");
}

TEST(CarryOver, KeepsWhatDescribesTheRasterInEveryFormat) {
  const TemporaryFolder folder;
  Write(NoiseImage(300, 200, 2, GDT_UInt16, 3, 1), folder / "in.tif", {}, Dress);
  const std::string input = folder / "in.tif";
  ASSERT_EQ(RunProgram({"average", input, folder / "plain.tif"}).status, 0);
  ExpectDressed(folder / "plain.tif");
  const Outcome cog = RunProgram({"average", "--of", "COG", input, folder / "cog.tif"});
  ASSERT_EQ(cog.status, 0) << cog.err;
  ExpectDressed(folder / "cog.tif");
  EXPECT_STREQ(OpenImage(folder / "cog.tif")->GetMetadataItem("LAYOUT", "IMAGE_STRUCTURE"), "COG");
  EXPECT_EQ(folder.Names(), (std::set<std::string>{"in.tif", "plain.tif", "cog.tif"}));
  EXPECT_EQ(Difference(Read(folder / "plain.tif"), Read(folder / "cog.tif")), "");

  // Formats that put headers and such beside the file: under the right names, and all of them.
  ASSERT_EQ(RunProgram({"average", input, folder / "copied.png"}).status, 0);
  EXPECT_STREQ(OpenImage(folder / "copied.png")->GetDriver()->GetDescription(), "PNG");
  ASSERT_EQ(RunProgram({"average", "--of", "ENVI", input, folder / "raw.img"}).status, 0);
  EXPECT_EQ(Difference(Read(folder / "plain.tif"), Read(folder / "raw.img")), "");
  EXPECT_TRUE(folder.Names().contains("raw.hdr"));
}

TEST(CarryOver, KeepsGroundControlPointsColoursAndCameraModels) {
  const TemporaryFolder folder;
  Write(NoiseImage(20, 20, 4, GDT_UInt16, {}, 1), folder / "in.tif", {}, [](GDALDataset& dataset) {
    OGRSpatialReference geographic;
    geographic.importFromEPSG(4326);
    const GDAL_GCP points[] = {
        {const_cast<char*>("1"), const_cast<char*>(""), 0.5, 0.5, 10, 50, 3},
        {const_cast<char*>("2"), const_cast<char*>(""), 19.5, 0.5, 11, 50, 4},
        {const_cast<char*>("3"), const_cast<char*>(""), 0.5, 19.5, 10, 49, 5}};
    dataset.SetGCPs(3, points, &geographic);
    dataset.GetRasterBand(4)->SetColorInterpretation(GCI_Undefined);
    const GDALColorInterp colours[] = {GCI_RedBand, GCI_GreenBand, GCI_BlueBand, GCI_Undefined};
    for (int i = 0; i < 4; ++i) dataset.GetRasterBand(i + 1)->SetColorInterpretation(colours[i]);
    const std::string twenty = "1 0 0 0 0 0 0 0 0 0 0 0 0 0 0 0 0 0 0 0";
    for (const char* const key :
         {"LINE_OFF", "SAMP_OFF", "LAT_OFF", "LONG_OFF", "HEIGHT_OFF", "LINE_SCALE", "SAMP_SCALE",
          "LAT_SCALE", "LONG_SCALE", "HEIGHT_SCALE"}) {
      dataset.SetMetadataItem(key, "42", "RPC");
    }
    for (const char* const key :
         {"LINE_NUM_COEFF", "LINE_DEN_COEFF", "SAMP_NUM_COEFF", "SAMP_DEN_COEFF"}) {
      dataset.SetMetadataItem(key, twenty.c_str(), "RPC");
    }
  });
  const Outcome outcome = RunProgram({"average", folder / "in.tif", folder / "out.tif"});
  ASSERT_EQ(outcome.status, 0) << outcome.err;
  const OpenDataset output = OpenImage(folder / "out.tif");
  ASSERT_EQ(output->GetGCPCount(), 3);
  EXPECT_EQ(output->GetGCPs()[2].dfGCPLine, 19.5);
  EXPECT_EQ(output->GetGCPs()[2].dfGCPZ, 5);
  ASSERT_NE(output->GetGCPSpatialRef(), nullptr);
  EXPECT_EQ(output->GetRasterBand(1)->GetColorInterpretation(), GCI_RedBand);
  EXPECT_EQ(output->GetRasterBand(3)->GetColorInterpretation(), GCI_BlueBand);
  EXPECT_EQ(output->GetRasterBand(4)->GetColorInterpretation(), GCI_Undefined);
  ASSERT_NE(output->GetMetadataItem("LAT_OFF", "RPC"), nullptr);
  EXPECT_EQ(std::stod(output->GetMetadataItem("LAT_OFF", "RPC")), 42);
}

TEST(CarryOver, DeclaresNoDataOnEveryBandAlsoWhereItIsNaN) {
  const TemporaryFolder folder;
  for (const bool declared : {true, false}) {
    Write(NoiseImage(20, 20, 2, GDT_Float32, {}, 1), folder / (declared ? "nan.tif" : "none.tif"),
          {}, declared ? DeclareNoData(std::nan("")) : Decorate());
  }
  struct Case {
    const char* input;
    std::vector<std::string> options;
  };
  const std::vector<Case> cases{{"nan.tif", {}},
                                {"nan.tif", {"--of", "COG"}},
                                {"none.tif", {"--src-nodata", "nan"}},
                                {"none.tif", {"--dst-nodata", "nan"}},
                                {"none.tif", {"--dst-nodata", "nan,nan"}}};
  for (const Case& c : cases) {
    std::vector<std::string> arguments{"average", "--overwrite", folder / c.input,
                                       folder / "out.tif"};
    arguments.insert(arguments.begin() + 1, c.options.begin(), c.options.end());
    SCOPED_TRACE(std::string(c.input) + (c.options.empty() ? "" : " " + c.options.back()));
    ASSERT_EQ(RunProgram(arguments).status, 0);
    const OpenDataset output = OpenImage(folder / "out.tif");
    for (const int band : {1, 2}) {
      int has = FALSE;
      EXPECT_TRUE(std::isnan(output->GetRasterBand(band)->GetNoDataValue(&has)));
      EXPECT_EQ(has, TRUE);
    }
    EXPECT_EQ(output->GetMetadataItem("NODATA_VALUES"), nullptr);
  }
}

TEST(CarryOver, DropsTheStaleCompanionsOfAReplacedFile) {
  const TemporaryFolder folder;
  Write(NoiseImage(20, 20, 1, GDT_Byte, {}, 1), folder / "in.tif");
  Write(NoiseImage(5, 5, 1, GDT_Byte, {}, 2), folder / "out.tif");
  for (const char* const suffix : {".aux.xml", ".ovr", ".msk"}) {
    std::ofstream(folder / (std::string("out.tif") + suffix)) << "of the old file";
  }
  ASSERT_EQ(RunProgram({"average", "--overwrite", folder / "in.tif", folder / "out.tif"}).status,
            0);
  EXPECT_EQ(folder.Names(), (std::set<std::string>{"in.tif", "out.tif"}));

  // A spill file belongs to the format that has one; beside another file it is somebody else's.
  const auto replace = [&](const std::vector<std::string>& options) {
    std::vector<std::string> arguments{"average", "--overwrite", folder / "in.tif",
                                       folder / "out.tif"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    EXPECT_EQ(RunProgram(arguments).status, 0);
  };
  replace({"--of", "HFA", "--co", "USE_SPILL=YES"});
  EXPECT_TRUE(folder.Names().contains("out.ige"));
  replace({});
  EXPECT_EQ(folder.Names(), (std::set<std::string>{"in.tif", "out.tif"}));
  std::ofstream(folder / "out.ige") << "of another raster";
  replace({});
  EXPECT_TRUE(folder.Names().contains("out.ige"));
}

TEST(CarryOver, WritesTheGeoTiffThatWasAskedFor) {
  const TemporaryFolder folder;
  Write(NoiseImage(600, 300, 1, GDT_Float32, {}, 1), folder / "in.tif");
  const auto layout = [&](std::vector<std::string> options) {
    options.insert(options.begin(), "average");
    options.insert(options.end(), {"--overwrite", folder / "in.tif", folder / "out.tif"});
    EXPECT_EQ(RunProgram(options).status, 0);
    const OpenDataset output = OpenImage(folder / "out.tif");
    int width = 0;
    int height = 0;
    output->GetRasterBand(1)->GetBlockSize(&width, &height);
    const char* const compression = output->GetMetadataItem("COMPRESSION", "IMAGE_STRUCTURE");
    return std::string(compression == nullptr ? "none" : compression) + " " +
           std::to_string(width) + "x" + std::to_string(height);
  };
  EXPECT_EQ(layout({}), "DEFLATE 256x256");
  EXPECT_EQ(layout({"--co", "compress=none", "--co", "TILED=NO", "--co", "BLOCKYSIZE=3"}),
            "none 600x3");
  EXPECT_EQ(layout({"--co", "COMPRESS=LZW"}), "LZW 256x256");
  // Samples of 12 bits, which the predictor cannot be used with.
  Write(NoiseImage(600, 300, 1, GDT_UInt16, {}, 1), folder / "in.tif");
  EXPECT_EQ(layout({"--co", "NBITS=12"}), "DEFLATE 256x256");
}

}  // namespace
}  // namespace zarn::testsupport
