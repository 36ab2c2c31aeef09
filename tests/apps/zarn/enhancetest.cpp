// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <functional>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "processes/filters/enhancement/glut.h"
#include "processes/filters/enhancement/trimmethod.h"
#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"

namespace zarn::testsupport {
namespace {

namespace filters = processes::filters;
using Arguments = std::vector<std::string>;
using MatrixPtr = std::unique_ptr<filters::IGeoLUTMatrix>;
using IsValid = std::function<bool(int x, int y)>;

// An image as the library reads it.
class ImageReader : public datasources::IRasterReader {
 public:
  ImageReader(const Image& image, IsValid isValid) : image_(image), isValid_(std::move(isValid)) {}

  std::uint32_t Width() const override { return static_cast<std::uint32_t>(image_.width); }
  std::uint32_t Height() const override { return static_cast<std::uint32_t>(image_.height); }
  std::uint32_t Channels() const override { return static_cast<std::uint32_t>(image_.bands); }
  gobs::NativeDataTypeCode DataTypeCode() const override {
    return image_.type == GDT_Byte ? gobs::NativeDataTypeCode::kUInt8
                                   : gobs::NativeDataTypeCode::kUInt16;
  }
  datasources::AuxiliaryData Auxiliary() const override { return {}; }
  void Read(gobs::Raster& block, std::uint8_t* valid) override {
    std::size_t i = 0;
    for (std::uint32_t y = 0; y < block.Height(); ++y) {
      for (std::uint32_t x = 0; x < block.Width(); ++x) {
        const int column = static_cast<int>(block.OriginX() + x);
        const int row = static_cast<int>(block.OriginY() + y);
        *valid++ = isValid_(column, row) ? 1 : 0;
        for (int band = 0; band < image_.bands; ++band, ++i) {
          const double sample = image_.At(column, row, band);
          if (image_.type == GDT_Byte) {
            static_cast<std::uint8_t*>(block.Data())[i] = static_cast<std::uint8_t>(sample);
          } else {
            static_cast<std::uint16_t*>(block.Data())[i] = static_cast<std::uint16_t>(sample);
          }
        }
      }
    }
  }

 private:
  const Image& image_;
  IsValid isValid_;
};

struct Enhancing {
  int tile = 16;
  float power = 1;
  bool blends = true;
  double noData = -1;  ///< of the output
  IsValid isValid = [](int, int) { return true; };
};

MatrixPtr LoadedMatrix(const Image& image, const Enhancing& e) {
  MatrixPtr matrix(filters::GLUT::GetGLUTMatrix({.tileWidth = e.tile,
                                                 .tileHeight = e.tile,
                                                 .gridRows = (image.height + e.tile - 1) / e.tile,
                                                 .gridColumns = (image.width + e.tile - 1) / e.tile,
                                                 .channelCount = image.bands,
                                                 .power = e.power,
                                                 .pixelDepth = image.type == GDT_Byte ? 8 : 16}));
  ImageReader reader(image, e.isValid);
  matrix->LoadFromImage(reader);
  matrix->Clean(
      {.globalFilter = true, .localFilter = true, .fillsMasked = true, .interpolation = true});
  return matrix;
}

// Each pixel by the tables of the cells around it.
template <typename T>
Image ReferenceEnhancement(const Image& image, const Enhancing& e) {
  const MatrixPtr matrix = LoadedMatrix(image, e);
  std::vector<std::vector<T>> tables;
  for (int row = 0; row < matrix->GetGridRows(); ++row) {
    for (int column = 0; column < matrix->GetGridColumns(); ++column) {
      for (int band = 0; band < image.bands; ++band) {
        tables.emplace_back(static_cast<std::size_t>(matrix->GetLevelCount()));
        matrix->FillLUT(tables.back().data(), row, column, band);
      }
    }
  }
  Image result = image;
  for (int y = 0; y < image.height; ++y) {
    for (int x = 0; x < image.width; ++x) {
      if (!e.isValid(x, y)) continue;
      const auto tile = static_cast<float>(e.tile);
      const auto along = [&](int position, int cells, int& first, int& second) {
        const int halves = 2 * position + 1 - e.tile;
        first =
            e.blends ? static_cast<int>(std::floor(halves / (2.0 * e.tile))) : position / e.tile;
        const int rest = halves - first * 2 * e.tile;
        second = e.blends ? first + 1 : first;
        const bool isInside = first >= 0 && second < cells && first != second;
        first = std::clamp(first, 0, cells - 1);
        second = std::clamp(second, 0, cells - 1);
        return isInside ? static_cast<float>(rest) / (2.0F * tile) : 0.0F;
      };
      int left = 0;
      int right = 0;
      int above = 0;
      int below = 0;
      const float weightX = along(x, matrix->GetGridColumns(), left, right);
      const float weightY = along(y, matrix->GetGridRows(), above, below);
      for (int band = 0; band < image.bands; ++band) {
        const auto value = [&](int row, int column) {
          const int table = (row * matrix->GetGridColumns() + column) * image.bands + band;
          return static_cast<float>(tables[static_cast<std::size_t>(table)]
                                          [static_cast<std::size_t>(image.At(x, y, band))]);
        };
        const auto between = [](float first, float second, float weight) {
          return first + (second - first) * weight;
        };
        const float onLeft = between(value(above, left), value(below, left), weightY);
        const float onRight = between(value(above, right), value(below, right), weightY);
        result.At(x, y, band) = std::floor(between(onLeft, onRight, weightX) + 0.5F);
      }
      if (result.AllBands(x, y, e.noData)) {
        result.At(x, y, 0) += result.At(x, y, 0) == std::numeric_limits<T>::max() ? -1 : 1;
      }
    }
  }
  return result;
}

// Levels in bright and dark areas, with grain; from 1 on.
Image Scene(int width, int height, int bands, GDALDataType type) {
  Image image(width, height, bands, type);
  const int scale = type == GDT_Byte ? 1 : 180;
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      for (int band = 0; band < bands; ++band) {
        const int base = ((x / 23 + y / 17) % 2 == 0 ? 40 : 120) + 20 * band + y / 2;
        const int grain = (x * 31 + y * 57 + x * y * (band + 3)) % 41;
        image.At(x, y, band) = 1 + (base + grain) * scale;
      }
    }
  }
  return image;
}

class Enhance : public testing::Test {
 protected:
  Image Run(Arguments options) {
    options.insert(options.begin(), "enhance");
    options.insert(options.end(), {"--overwrite", folder_ / "in.tif", folder_ / "out.tif"});
    const Outcome outcome = RunProgram(options);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    EXPECT_EQ(outcome.err, "");
    return Read(folder_ / "out.tif");
  }

  TemporaryFolder folder_;
};

TEST_F(Enhance, BlendsTheTablesOfTheCellsAround) {
  const struct {
    GDALDataType type;
    int bands;
    Arguments options;
    Enhancing enhancing;
  } cases[] = {
      {GDT_Byte, 3, {"--tile-size", "16"}, {}},
      {GDT_Byte, 1, {"--tile-size", "15", "--power", "0.6"}, {.tile = 15, .power = 0.6F}},
      {GDT_Byte, 2, {"--tile-size", "16", "--no-interpolate"}, {.blends = false}},
      {GDT_UInt16, 2, {"--tile-size", "16", "--power", "1.5"}, {.power = 1.5F}},
      {GDT_UInt16, 1, {"--tile-size", "1000"}, {.tile = 75}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::PrintToString(c.options) + GDALGetDataTypeName(c.type));
    const Image image = Scene(75, 61, c.bands, c.type);
    Write(image, folder_ / "in.tif");
    const Image expected = c.type == GDT_Byte
                               ? ReferenceEnhancement<std::uint8_t>(image, c.enhancing)
                               : ReferenceEnhancement<std::uint16_t>(image, c.enhancing);
    for (const Arguments& how : {Arguments{}, {"--window", "13x11"}, {"--threads", "1"}}) {
      Arguments options = c.options;
      options.insert(options.end(), how.begin(), how.end());
      EXPECT_EQ(Difference(expected, Run(options)), "") << testing::PrintToString(how);
    }
  }
}

TEST_F(Enhance, LeavesNoDataAndMaskedPixelsAndMakesNone) {
  Image image = Scene(75, 61, 3, GDT_Byte);
  for (int y = 0; y < 61; ++y) {
    for (int x = 0; x < 75; ++x) {
      if (x + y < 40) {
        for (int band = 0; band < 3; ++band) image.At(x, y, band) = 0;
      }
    }
  }
  Write(image, folder_ / "in.tif", {}, DeclareNoData(0));
  Image mask(75, 61, 1, GDT_Byte);
  for (int y = 0; y < 61; ++y) {
    for (int x = 0; x < 75; ++x) mask.At(x, y, 0) = x < 70 ? 1 : 0;
  }
  Write(mask, folder_ / "mask.tif");
  const Enhancing enhancing{.noData = 0,
                            .isValid = [](int x, int y) { return x + y >= 40 && x < 70; }};
  const Image expected = ReferenceEnhancement<std::uint8_t>(image, enhancing);
  const Image enhanced = Run({"--tile-size", "16", "--mask", folder_ / "mask.tif"});
  EXPECT_EQ(Difference(expected, enhanced), "");
  int darkest = 0;
  for (int y = 0; y < 61; ++y) {
    for (int x = 0; x < 75; ++x) {
      EXPECT_EQ(enhanced.AllBands(x, y, 0), x + y < 40) << x << " " << y;
      darkest += enhanced.At(x, y, 0) == 1 && enhanced.At(x, y, 1) == 0 ? 1 : 0;
    }
  }
  EXPECT_GT(darkest, 0) << "nothing was moved off the no-data value";
}

TEST_F(Enhance, WritesTheClassesOfItsTiles) {
  Image image(64, 48, 1, GDT_UInt16);  // alike everywhere, so that no tile is an outlier
  for (int y = 0; y < 48; ++y) {
    for (int x = 0; x < 64; ++x) image.At(x, y, 0) = 1000 + (x % 16 * 31 + y % 16 * 57) % 41 * 100;
  }
  for (int y = 0; y < 16; ++y) {
    for (int x = 0; x < 16; ++x) {
      image.At(x, y, 0) = 0;
      image.At(x + 32, y + 16, 0) = 999;
    }
  }
  Write(image, folder_ / "in.tif", {}, [](GDALDataset& dataset) {
    DeclareNoData(0)(dataset);
    double transform[6] = {100, 2, 0, 500, 0, -2};
    dataset.SetGeoTransform(transform);
  });
  Run({"--tile-size", "16", "--diagnostic", folder_ / "tiles.tif"});
  const Image tiles = Read(folder_ / "tiles.tif");
  EXPECT_EQ(tiles.values, (std::vector<double>{0, 1, 1, 1, 1, 1, 2, 1, 1, 1, 1, 1}));
  const OpenDataset file = OpenImage(folder_ / "tiles.tif");
  double transform[6] = {};
  EXPECT_EQ(file->GetGeoTransform(transform), CE_None);
  EXPECT_EQ(transform[1], 32);
  EXPECT_EQ(transform[5], -32);
  EXPECT_EQ(file->GetRasterBand(1)->GetColorTable()->GetColorEntry(2)->c1, 255);
  EXPECT_STREQ(file->GetRasterBand(1)->GetCategoryNames()[1], "Valid GeoLUTs");
  EXPECT_STREQ(file->GetMetadataItem("GLUTTileSizes"), "16 16");
}

TEST_F(Enhance, RefusesWhatMakesNoSense) {
  Write(Scene(20, 20, 1, GDT_Byte), folder_ / "in.tif");
  Write(Scene(20, 20, 1, GDT_Float32), folder_ / "float.tif");
  Write(Image(20, 20, 1, GDT_Byte), folder_ / "flat.tif");
  const std::string in = folder_ / "in.tif";
  const std::string out = folder_ / "out.tif";
  const std::set<std::string> before = folder_.Names();
  const struct {
    Arguments arguments;
    int status;
    std::string message;
  } cases[] = {
      {{folder_ / "float.tif", out}, 1, "8 and 16 bits"},
      {{folder_ / "flat.tif", out}, 1, "no tile of"},
      {{"--left", "1.5", in, out}, 2, "--left"},
      {{"--trim", "sigma", "--right", "-1", in, out}, 2, "--right"},
      {{"--tile-size", "1", in, out}, 2, "--tile-size"},
      {{"--power", "0", in, out}, 2, "--power"},
      {{"--power", "nan", in, out}, 2, "--power"},
      {{"--max-gain", "-1", in, out}, 2, "--max-gain"},
      {{"--max-gain", "1,2", in, out}, 2, "--max-gain"},
      {{"--max-gain", "0.001", in, out}, 1, "--max-gain"},
      {{"--diagnostic", out, in, out}, 2, "--diagnostic"},
      {{"--overwrite", "--diagnostic", folder_ / "./in.tif", in, out}, 2, "--diagnostic"},
      {{"--diagnostic", folder_ / "flat.tif", in, out}, 1, "flat.tif"},
  };
  for (const auto& c : cases) {
    Arguments arguments = c.arguments;
    arguments.insert(arguments.begin(), "enhance");
    SCOPED_TRACE(testing::PrintToString(arguments));
    ExpectOneLine(RunProgram(arguments), c.status, c.message);
    EXPECT_EQ(folder_.Names(), before);
  }
}

}  // namespace
}  // namespace zarn::testsupport
