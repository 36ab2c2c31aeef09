// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <optional>
#include <string>
#include <vector>

#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"

namespace zarn::testsupport {
namespace {

using Arguments = std::vector<std::string>;
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

class Average : public testing::Test {
 protected:
  /// The output of `zarn average` with the given options on in.tif.
  Image Filter(Arguments options) {
    options.insert(options.begin(), "average");
    options.insert(options.end(), {"--overwrite", folder_ / "in.tif", folder_ / "out.tif"});
    const Outcome outcome = RunProgram(options);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    warnings_ = outcome.err;
    return Read(folder_ / "out.tif");
  }
  void WriteInput(const Image& image, const Decorate& decorate = nullptr,
                  const std::vector<std::string>& options = {}) {
    Write(image, folder_ / "in.tif", options, decorate);
  }

  TemporaryFolder folder_;
  std::string warnings_;
};

TEST_F(Average, IsTheMeanOfTheValidNeighboursInEveryType) {
  struct Case {
    GDALDataType type;
    int bands;
    int size;
    std::optional<double> noData;
    bool signedByte = false;
  };
  const std::vector<Case> cases{
      {GDT_Byte, 1, 3, 0},       {GDT_Byte, 3, 5, 0},        {GDT_Byte, 3, 4, {}},
      {GDT_UInt16, 3, 7, 65535}, {GDT_UInt16, 1, 1, 0},      {GDT_Int16, 2, 5, -32768},
      {GDT_UInt32, 1, 15, 0},    {GDT_Int32, 1, 3, -1},      {GDT_Float32, 2, 5, -9999},
      {GDT_Float64, 1, 9, 1e20}, {GDT_Byte, 1, 5, -7, true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string(GDALGetDataTypeName(c.type)) + " " + std::to_string(c.bands) +
                 " bands, size " + std::to_string(c.size));
    Image image = NoiseImage(67, 45, c.bands, c.type, c.noData, 11);
    if (c.signedByte) {
      image.signedByte = true;
      for (std::size_t i = 0; i < image.values.size(); i += 2) image.values[i] *= -1;
      for (double& value : image.values) value = value == 7 ? -7 : value;
    }
    WriteInput(image, c.noData ? DeclareNoData(*c.noData) : Decorate());
    const Image expected = ReferenceMean(
        image, c.size, [&](int x, int y) { return !c.noData || !image.AllBands(x, y, *c.noData); },
        c.noData);
    EXPECT_EQ(Difference(expected, Filter({"--size", std::to_string(c.size)})), "");
  }
}

TEST_F(Average, DoesNotDependOnWindowsThreadsMemoryOrFileLayout) {
  const Image image = NoiseImage(1100, 90, 3, GDT_UInt16, 0, 5);
  Image mask(1100, 90, 1, GDT_Byte);
  for (int y = 0; y < 90; ++y) {
    for (int x = 0; x < 1100; ++x) mask.At(x, y, 0) = (x / 50 + y / 20) % 4 == 0 ? 0 : 1;
  }
  Write(mask, folder_ / "mask.tif");
  const Arguments common{"--size", "9", "--mask", folder_ / "mask.tif"};
  WriteInput(image, DeclareNoData(0));
  const Image expected = Filter(common);
  const std::vector<Arguments> variants{
      {"--threads", "1"},
      {"--threads", "2"},
      {"--window", "7x5", "--co", "COMPRESS=NONE"},
      {"--window", "1100x1"},
      {"--window", "256x256", "--threads", "1"},
      {"--window", "5000x5000"},
      // Too little memory for the full width: several columns.
      {"--memory", "3", "--co", "BLOCKXSIZE=64", "--co", "BLOCKYSIZE=64"},
      {"--co", "INTERLEAVE=BAND"},
      {"--co", "TILED=NO"},
  };
  for (const std::vector<std::string>& layout :
       {std::vector<std::string>{"TILED=YES", "BLOCKXSIZE=32", "BLOCKYSIZE=16"},
        std::vector<std::string>{"INTERLEAVE=BAND", "COMPRESS=LZW"}}) {
    WriteInput(image, DeclareNoData(0), layout);
    for (Arguments variant : variants) {
      SCOPED_TRACE(layout.front() + " " + variant[0] + " " + variant[1]);
      variant.insert(variant.end(), common.begin(), common.end());
      EXPECT_EQ(Difference(expected, Filter(variant)), "");
    }
  }
}

TEST_F(Average, SeesTheWholeImageFromASizeOnThatReachesBeyondIt) {
  const Image image = NoiseImage(13, 9, 1, GDT_Byte, 0, 3);
  WriteInput(image, DeclareNoData(0));
  const Image expected = ReferenceMean(
      image, 27, [&](int x, int y) { return image.At(x, y, 0) != 0; }, 0);
  for (const char* const size : {"25", "26", "1001", "2147483647", "99999999999999999999"}) {
    EXPECT_EQ(Difference(expected, Filter({"--size", size})), "") << size;
  }
}

TEST_F(Average, LeavesBackgroundAlone) {
  const Image image = NoiseImage(40, 30, 3, GDT_Byte, 7, 3);
  WriteInput(image);
  const auto isValid = [&](int x, int y) { return !image.AllBands(x, y, 7); };
  EXPECT_EQ(Difference(ReferenceMean(image, 3, isValid), Filter({"--background", "7"})), "");
}

TEST_F(Average, KeepsNaNOutOfEveryMean) {
  Image image = NoiseImage(40, 30, 2, GDT_Float32, {}, 9);
  for (int i = 5; i < 25; ++i) image.At(i, 12, 0) = image.At(i, i, 1) = kNaN;
  const auto isValid = [&](int x, int y) {
    return !std::isnan(image.At(x, y, 0)) && !std::isnan(image.At(x, y, 1));
  };
  const Image mean = ReferenceMean(image, 5, isValid);
  for (const bool declared : {false, true}) {
    WriteInput(image, declared ? DeclareNoData(kNaN) : Decorate());
    EXPECT_EQ(Difference(mean, Filter({"--size", "5"})), "") << "declared: " << declared;
  }

  Image translated = mean;
  for (int y = 0; y < 30; ++y) {
    for (int x = 0; x < 40; ++x) {
      if (!isValid(x, y)) translated.At(x, y, 0) = translated.At(x, y, 1) = -9999;
    }
  }
  EXPECT_EQ(Difference(translated, Filter({"--size", "5", "--dst-nodata", "-9999"})), "");
  EXPECT_EQ(OpenImage(folder_ / "out.tif")->GetRasterBand(2)->GetNoDataValue(), -9999);
}

TEST_F(Average, TreatsTransparentPixelsAsInvalidAndCopiesAlpha) {
  Image image = NoiseImage(40, 30, 4, GDT_Byte, {}, 21);
  for (int y = 0; y < 30; ++y) {
    for (int x = 0; x < 40; ++x) image.At(x, y, 3) = (x + y) % 5 == 0 ? 0 : 100 + x;
  }
  WriteInput(image, nullptr, {"PHOTOMETRIC=RGB", "ALPHA=YES"});
  const auto isValid = [&](int x, int y) { return image.At(x, y, 3) != 0; };
  Image expected = ReferenceMean(image, 3, isValid);
  for (int i = 3; i < static_cast<int>(image.values.size()); i += 4) {
    expected.values[static_cast<std::size_t>(i)] = image.values[static_cast<std::size_t>(i)];
  }
  EXPECT_EQ(Difference(expected, Filter({})), "");
  EXPECT_EQ(OpenImage(folder_ / "out.tif")->GetRasterBand(4)->GetColorInterpretation(),
            GCI_AlphaBand);

  // A layout whose bands GDAL confuses when several threads decode them.
  WriteInput(image, nullptr, {"PHOTOMETRIC=RGB", "ALPHA=YES", "INTERLEAVE=BAND", "BLOCKYSIZE=7"});
  EXPECT_EQ(Difference(expected, Filter({"--threads", "2"})), "");

  for (int y = 0; y < 30; ++y) {
    for (int x = 0; x < 40; ++x) {
      for (int band = 0; band < 3 && !isValid(x, y); ++band) expected.At(x, y, band) = 200;
    }
  }
  EXPECT_EQ(Difference(expected, Filter({"--dst-nodata", "200", "--window", "9x7"})), "");
}

TEST_F(Average, UsesAndCarriesTheMaskBandOfTheFile) {
  const Image image = NoiseImage(50, 40, 1, GDT_Int16, {}, 4);
  std::vector<std::uint8_t> mask(std::size_t{50} * 40, 255);
  for (std::size_t i = 0; i < mask.size(); i += 7) mask[i] = 0;
  WriteInput(image, [&](GDALDataset& dataset) {
    CPLSetThreadLocalConfigOption("GDAL_TIFF_INTERNAL_MASK", "YES");
    ASSERT_EQ(dataset.CreateMaskBand(GMF_PER_DATASET), CE_None);
    ASSERT_EQ(dataset.GetRasterBand(1)->GetMaskBand()->RasterIO(GF_Write, 0, 0, 50, 40, mask.data(),
                                                                50, 40, GDT_Byte, 0, 0, nullptr),
              CE_None);
  });
  const auto isValid = [&](int x, int y) {
    return mask[static_cast<std::size_t>(y * 50 + x)] != 0;
  };
  for (const char* const window : {"50x40", "16x11"}) {
    EXPECT_EQ(
        Difference(ReferenceMean(image, 5, isValid), Filter({"--size", "5", "--window", window})),
        "");
    const OpenDataset output = OpenImage(folder_ / "out.tif");
    EXPECT_EQ(output->GetRasterBand(1)->GetMaskFlags(), GMF_PER_DATASET);
    std::vector<std::uint8_t> carried(mask.size());
    ASSERT_EQ(output->GetRasterBand(1)->GetMaskBand()->RasterIO(
                  GF_Read, 0, 0, 50, 40, carried.data(), 50, 40, GDT_Byte, 0, 0, nullptr),
              CE_None);
    EXPECT_EQ(carried, mask);
    EXPECT_EQ(folder_.Names(), (std::set<std::string>{"in.tif", "out.tif"}));
  }
}

TEST_F(Average, LeavesPixelsThatAMaskFileExcludes) {
  const Image image = NoiseImage(50, 40, 2, GDT_Byte, 0, 8);
  WriteInput(image, DeclareNoData(0));
  Image mask(50, 40, 1, GDT_Float32);
  const std::vector<double> values{0, 1, -1, 0.25, kNaN, 300};
  for (std::size_t i = 0; i < mask.values.size(); ++i) {
    mask.values[i] = values[i % values.size()];
  }
  Write(mask, folder_ / "mask.tif");
  const auto isProcessed = [&](int x, int y) {
    return mask.At(x, y, 0) != 0 && !std::isnan(mask.At(x, y, 0));
  };
  const auto isValid = [&](int x, int y) { return isProcessed(x, y) && !image.AllBands(x, y, 0); };
  EXPECT_EQ(
      Difference(ReferenceMean(image, 3, isValid, 0), Filter({"--mask", folder_ / "mask.tif"})),
      "");

  // Another no-data value: it replaces the file's own under the mask too, and nothing else there.
  Image translated = ReferenceMean(image, 3, isValid, 255);
  for (int y = 0; y < 40; ++y) {
    for (int x = 0; x < 50; ++x) {
      if (image.AllBands(x, y, 0)) translated.At(x, y, 0) = translated.At(x, y, 1) = 255;
    }
  }
  EXPECT_EQ(Difference(translated, Filter({"--mask", folder_ / "mask.tif", "--dst-nodata", "255"})),
            "");
}

TEST_F(Average, TakesNoDataValuesFromTheFileOrTheCommandLine) {
  // Band 1 has 5 and band 2 has 9 where the pixel is no-data; the file declares 5 for both.
  Image image = NoiseImage(30, 20, 2, GDT_Byte, 5, 6);
  for (int y = 0; y < 20; ++y) {
    for (int x = 0; x < 30; ++x) {
      if (image.AllBands(x, y, 5) && (x + y) % 2 == 0) image.At(x, y, 1) = 9;
    }
  }
  WriteInput(image, DeclareNoData(5));
  const auto mean = [&](double first, double second) {
    return ReferenceMean(image, 3, [&, first, second](int x, int y) {
      return image.At(x, y, 0) != first || image.At(x, y, 1) != second;
    });
  };
  const auto declared = [&] {
    int has = FALSE;
    const double value = OpenImage(folder_ / "out.tif")->GetRasterBand(1)->GetNoDataValue(&has);
    return has != FALSE ? value : kNaN;
  };
  // With dst-nodata none nothing is avoided and nothing declared.
  EXPECT_EQ(Difference(mean(5, 5), Filter({"--dst-nodata", "none"})), "");
  EXPECT_TRUE(std::isnan(declared()));
  EXPECT_EQ(Difference(mean(5, 9), Filter({"--src-nodata", "5,9", "--dst-nodata", "none"})), "");
  EXPECT_EQ(Difference(ReferenceMean(image, 3, [](int, int) { return true; }),
                       Filter({"--src-nodata", "none"})),
            "");
  EXPECT_TRUE(std::isnan(declared()));

  // One value per band survives a format that has one for all, and is found again in the output.
  Filter({"--src-nodata", "5,9"});
  EXPECT_STREQ(OpenImage(folder_ / "out.tif")->GetMetadataItem("NODATA_VALUES"), "5 9");
  const Image once = Read(folder_ / "out.tif");
  std::filesystem::rename(folder_ / "out.tif", folder_ / "in.tif");
  EXPECT_EQ(
      Difference(ReferenceMean(once, 1, [](int, int) { return false; }), Filter({"--size", "1"})),
      "");
  EXPECT_STREQ(OpenImage(folder_ / "out.tif")->GetMetadataItem("NODATA_VALUES"), "5 9");

  WriteInput(image, DeclareNoData(5));
  for (const char* const impossible : {"-9999", "nan", "0.5", "5,300"}) {
    EXPECT_EQ(Difference(ReferenceMean(image, 3, [](int, int) { return true; }),
                         Filter({"--src-nodata", impossible})),
              "");
    EXPECT_EQ(std::count(warnings_.begin(), warnings_.end(), '\n'), 1) << warnings_;
    EXPECT_NE(warnings_.find("--src-nodata"), std::string::npos);
    EXPECT_TRUE(std::isnan(declared())) << impossible;
    Filter({"--src-nodata", impossible, "-q"});
    EXPECT_EQ(warnings_, "");
  }
}

}  // namespace
}  // namespace zarn::testsupport
