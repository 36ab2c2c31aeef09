// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <functional>
#include <limits>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"

namespace zarn::testsupport {
namespace {

using Arguments = std::vector<std::string>;

// What decides which neighbours are pooled, and what becomes of them.
struct Pooling {
  std::string statistic = "mean";
  int size = 3;
  bool disc = false;
  int factor = 1;  ///< pixels of the image to a label
  double tolerance = 0;
  std::optional<double> labelNoData = {};
  bool fill = false;
  std::function<bool(int x, int y)> isValid = [](int, int) { return true; };
  std::function<bool(int x, int y)> isWritable = [](int, int) { return true; };
};

double Reduce(std::vector<double> pool, const std::string& statistic, GDALDataType type) {
  std::sort(pool.begin(), pool.end());
  const std::size_t n = pool.size();
  if (statistic == "median") return pool[(n - 1) / 2];
  const std::size_t cut = statistic == "mean" ? 0 : n / 4;
  double sum = 0;
  for (std::size_t i = cut; i < n - cut; ++i) sum += pool[i];
  const double mean = sum / static_cast<double>(n - 2 * cut);
  if (type == GDT_Float32) return static_cast<float>(mean);
  return GDALDataTypeIsInteger(type) != FALSE ? std::trunc(mean) : mean;
}

Image ReferenceFilter(const Image& image, const Image* labels, const Pooling& p) {
  Image result = image;
  const auto shareLabel = [&](int x, int y, int nx, int ny) {
    if (labels == nullptr) return true;
    const double own = labels->At(x / p.factor, y / p.factor, 0);
    const double other = labels->At(nx / p.factor, ny / p.factor, 0);
    if (own == p.labelNoData || other == p.labelNoData) return true;
    return std::abs(other - own) <= p.tolerance;
  };
  const int half = p.size / 2;
  for (int y = 0; y < image.height; ++y) {
    for (int x = 0; x < image.width; ++x) {
      if (!p.isWritable(x, y) || (!p.fill && !p.isValid(x, y))) continue;
      for (int band = 0; band < image.bands; ++band) {
        std::vector<double> pool;
        for (int ny = std::max(0, y - half); ny <= std::min(image.height - 1, y + half); ++ny) {
          for (int nx = std::max(0, x - half); nx <= std::min(image.width - 1, x + half); ++nx) {
            const int distance = (nx - x) * (nx - x) + (ny - y) * (ny - y);
            if (p.disc && 4 * distance > p.size * p.size) continue;
            if (!p.isValid(nx, ny) || !shareLabel(x, y, nx, ny)) continue;
            pool.push_back(image.At(nx, ny, band));
          }
        }
        if (!pool.empty()) result.At(x, y, band) = Reduce(pool, p.statistic, image.type);
      }
    }
  }
  return result;
}

// Segments of tens of pixels with ragged borders, numbered from 0.
Image SegmentImage(int width, int height, GDALDataType type, int classes) {
  Image labels(width, height, 1, type);
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      labels.At(x, y, 0) = ((x + y % 3) / 7 * 5 + (y + x % 2) / 6 * 3) % classes;
    }
  }
  return labels;
}

class SegmentFilter : public testing::Test {
 protected:
  /// The output of `zarn segment-filter` with the given options on in.tif.
  Image Filter(Arguments options) {
    options.insert(options.begin(), "segment-filter");
    options.insert(options.end(), {"--overwrite", folder_ / "in.tif", folder_ / "out.tif"});
    const Outcome outcome = RunProgram(options);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    warnings_ = outcome.err;
    return Read(folder_ / "out.tif");
  }

  TemporaryFolder folder_;
  std::string warnings_;
};

TEST_F(SegmentFilter, PoolsNeighboursOfTheSameSegment) {
  const struct {
    GDALDataType type;
    int bands;
    GDALDataType labelType;
    Arguments options;
    Pooling pooling;
  } cases[] = {
      {GDT_Byte, 3, GDT_Byte, {}, {}},
      {GDT_UInt16,
       1,
       GDT_UInt16,
       {"--shape", "disc"},
       {.statistic = "median", .size = 5, .disc = true}},
      {GDT_Float32, 2, GDT_UInt32, {}, {.statistic = "trimmed-mean", .size = 4}},
      {GDT_Int16, 1, GDT_Byte, {"--label-tolerance", "2"}, {.size = 5, .tolerance = 2}},
      {GDT_Byte, 1, GDT_Int16, {"--label-tolerance", "2"}, {.size = 5, .tolerance = 2}},
      {GDT_Byte, 1, GDT_UInt32, {"--label-tolerance", "2.5"}, {.tolerance = 2.5}},
      {GDT_Byte, 1, GDT_Float64, {"--label-tolerance", "1.5"}, {.tolerance = 1.5}},
      {GDT_Byte, 1, GDT_Byte, {"--label-nodata", "4"}, {.statistic = "median", .labelNoData = 4}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(GDALGetDataTypeName(c.type)) + " " + GDALGetDataTypeName(c.labelType) +
                 " " + c.pooling.statistic);
    const Image image = NoiseImage(61, 43, c.bands, c.type, {}, 5);
    const Image labels = SegmentImage(61, 43, c.labelType, 9);
    Write(image, folder_ / "in.tif");
    Write(labels, folder_ / "labels.tif");
    Arguments options{"--statistic", c.pooling.statistic,
                      "--size",      std::to_string(c.pooling.size),
                      "--labels",    folder_ / "labels.tif"};
    options.insert(options.end(), c.options.begin(), c.options.end());
    EXPECT_EQ(Difference(ReferenceFilter(image, &labels, c.pooling), Filter(options)), "");
    EXPECT_EQ(warnings_, "");
  }
}

TEST_F(SegmentFilter, KnowsWhichLabelMeansNone) {
  const Image image = NoiseImage(40, 30, 1, GDT_Byte, {}, 5);
  Write(image, folder_ / "in.tif");
  for (const GDALDataType type : {GDT_Byte, GDT_Int16, GDT_UInt32, GDT_Float32}) {
    const Image labels = SegmentImage(40, 30, type, 5);
    const Arguments options{"--statistic", "mean", "--labels", folder_ / "labels.tif"};
    const auto with = [&](const Arguments& more) {
      Arguments all = options;
      all.insert(all.end(), more.begin(), more.end());
      return Filter(all);
    };
    const Image allLabelled = ReferenceFilter(image, &labels, {});
    const Image threeIsNone = ReferenceFilter(image, &labels, {.labelNoData = 3});
    const Image zeroIsNone = ReferenceFilter(image, &labels, {.labelNoData = 0});
    Write(labels, folder_ / "labels.tif");
    EXPECT_EQ(Difference(allLabelled, with({})), "") << GDALGetDataTypeName(type);
    EXPECT_EQ(Difference(zeroIsNone, with({"--label-nodata", "0"})), "");
    Write(labels, folder_ / "labels.tif", {}, DeclareNoData(3));
    EXPECT_EQ(Difference(threeIsNone, with({})), "");
    EXPECT_EQ(Difference(zeroIsNone, with({"--label-nodata", "0"})), "");
    EXPECT_EQ(Difference(allLabelled, with({"--label-nodata", "none"})), "");
  }
  EXPECT_EQ(warnings_, "");
  Write(SegmentImage(40, 30, GDT_Byte, 5), folder_ / "labels.tif");
  Filter({"--statistic", "mean", "--labels", folder_ / "labels.tif", "--label-nodata", "-1"});
  EXPECT_NE(warnings_.find("every pixel has a label"), std::string::npos) << warnings_;
}

TEST_F(SegmentFilter, TakesCoarserLabelsAsRepeatedOnesWhereverWindowsBegin) {
  const int width = 123;
  const int height = 58;
  const Image image = NoiseImage(width, height, 2, GDT_UInt16, 0, 5);
  const auto place = [](double x, double y, double pixel) {
    return [=](GDALDataset& dataset) {
      double transform[6] = {x, pixel, 0, y, 0, -pixel};
      dataset.SetGeoTransform(transform);
    };
  };
  for (const bool isPlaced : {false, true}) {
    Write(image, folder_ / "in.tif", {}, [&](GDALDataset& dataset) {
      DeclareNoData(0)(dataset);
      if (isPlaced) place(500, 900, 30)(dataset);
    });
    for (const int factor : {1, 2, 4}) {
      const Image labels =
          SegmentImage((width + factor - 1) / factor, (height + factor - 1) / factor, GDT_Byte, 11);
      Write(labels, folder_ / "labels.tif", {},
            isPlaced ? place(500, 900, 30 * factor) : Decorate());
      Pooling pooling{.statistic = "median", .size = 7, .factor = factor};
      pooling.isValid = [&](int x, int y) { return !image.AllBands(x, y, 0); };
      const Image expected = ReferenceFilter(image, &labels, pooling);
      for (const Arguments& variant : {Arguments{"--threads", "1"},
                                       {"--window", "5x3"},
                                       {"--window", "32x16", "--threads", "2"},
                                       {"--window", "123x1"}}) {
        SCOPED_TRACE(std::to_string(factor) + " " + variant[1]);
        Arguments options{"--statistic", "median",   "--size",
                          "7",           "--labels", folder_ / "labels.tif"};
        options.insert(options.end(), variant.begin(), variant.end());
        EXPECT_EQ(Difference(expected, Filter(options)), "");
      }
    }
  }
  // Labels of a larger area, which begin two pixels to the left of the image and one above it.
  const Image labels = SegmentImage(64, 30, GDT_Byte, 11);
  Write(labels, folder_ / "labels.tif", {}, place(440, 930, 60));
  Image repeated(width, height, 1, GDT_Byte);
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) repeated.At(x, y, 0) = labels.At((x + 2) / 2, (y + 1) / 2, 0);
  }
  Pooling pooling;
  pooling.isValid = [&](int x, int y) { return !image.AllBands(x, y, 0); };
  EXPECT_EQ(Difference(ReferenceFilter(image, &repeated, pooling),
                       Filter({"--statistic", "mean", "--labels", folder_ / "labels.tif",
                               "--window", "50x50"})),
            "");
}

TEST_F(SegmentFilter, LeavesInvalidPixelsOutAndAloneUnlessItFills) {
  Image image = NoiseImage(50, 40, 2, GDT_Float32, {}, 5);
  for (int i = 3; i < 35; ++i) {
    image.At(i, 12, 0) = std::numeric_limits<double>::quiet_NaN();
    image.At(i, i, 0) = image.At(i, i, 1) = -9999;
  }
  for (int y = 20; y < 28; ++y) {
    for (int x = 30; x < 38; ++x) image.At(x, y, 0) = image.At(x, y, 1) = -9999;
  }
  const Image labels = SegmentImage(50, 40, GDT_Byte, 4);
  Image inputMask(50, 40, 1, GDT_Byte);
  Image outputMask(50, 40, 1, GDT_Byte);
  for (int y = 0; y < 40; ++y) {
    for (int x = 0; x < 50; ++x) {
      inputMask.At(x, y, 0) = (x / 3 + y) % 7 == 0 ? 0 : 1;
      outputMask.At(x, y, 0) = x / 10 == 2 ? 0 : 255;
    }
  }
  Write(image, folder_ / "in.tif");
  Write(labels, folder_ / "labels.tif");
  Write(inputMask, folder_ / "inputmask.tif");
  Write(outputMask, folder_ / "outputmask.tif");
  Pooling pooling;
  pooling.isValid = [&](int x, int y) {
    return !std::isnan(image.At(x, y, 0)) && !image.AllBands(x, y, -9999) &&
           inputMask.At(x, y, 0) != 0;
  };
  pooling.isWritable = [&](int x, int y) { return outputMask.At(x, y, 0) != 0; };
  Arguments options{"--statistic",   "mean",
                    "--src-nodata",  "-9999",
                    "--labels",      folder_ / "labels.tif",
                    "--input-mask",  folder_ / "inputmask.tif",
                    "--output-mask", folder_ / "outputmask.tif"};
  EXPECT_EQ(Difference(ReferenceFilter(image, &labels, pooling), Filter(options)), "");
  pooling.fill = true;
  options.insert(options.end(), {"--fill", "--window", "20x20"});
  EXPECT_EQ(Difference(ReferenceFilter(image, &labels, pooling), Filter(options)), "");
}

TEST_F(SegmentFilter, RefusesWhatDoesNotFit) {
  const auto write = [&](const char* name, int width, int height, int bands, GDALDataType type,
                         std::optional<double> x = {}, double pixel = 10) {
    Write(NoiseImage(width, height, bands, type, {}, 1), folder_ / name, {},
          [=](GDALDataset& dataset) {
            double transform[6] = {x.value_or(0), pixel, 0, 400, 0, -pixel};
            if (x) dataset.SetGeoTransform(transform);
          });
  };
  write("in.tif", 60, 40, 1, GDT_Byte, 100);
  write("unplaced.tif", 60, 40, 1, GDT_Byte);
  write("int64.tif", 60, 40, 1, GDT_Int64, 100);
  write("shifted.tif", 60, 40, 1, GDT_Byte, 103);
  write("coarser.tif", 40, 27, 1, GDT_Byte, 100, 15);
  write("finer.tif", 120, 80, 1, GDT_Byte, 100, 5);
  write("small.tif", 29, 20, 1, GDT_Byte, 100, 20);
  write("beside.tif", 60, 40, 1, GDT_Byte, 110);
  write("size.tif", 25, 40, 1, GDT_Byte);
  write("three.tif", 60, 40, 3, GDT_Byte, 100);
  write("complex.tif", 60, 40, 1, GDT_CFloat32, 100);
  const std::set<std::string> before = folder_.Names();
  const std::string in = folder_ / "in.tif";
  const std::string out = folder_ / "out.tif";
  const auto labels = [&](const char* name) {
    return Arguments{"--statistic", "mean", "--labels", folder_ / name, in, out};
  };
  const struct {
    Arguments arguments;
    int status;
    std::string message;
  } cases[] = {
      {labels("missing.tif"), 1, "missing.tif"},
      {labels("shifted.tif"), 1,
       "geotransforms [103, 10, 0, 400, 0, -10] and [100, 10, 0, 400, 0, -10]"},
      {labels("coarser.tif"), 1, "[100, 15, 0, 400, 0, -15]"},
      {labels("finer.tif"), 1, "gdalwarp"},
      {labels("small.tif"), 1, "do not cover the image"},
      {labels("beside.tif"), 1, "do not cover the image"},
      {labels("size.tif"), 1, "25 x 40"},
      {labels("three.tif"), 1, "3 bands"},
      {labels("complex.tif"), 1, "CFloat32"},
      {labels("int64.tif"), 1, "Unknown attribute raster data type for average filter."},
      {{"--statistic", "trimmed-mean", folder_ / "int64.tif", out},
       1,
       "Unknown raster block data type for trimmed mean filter."},
      {{"--statistic", "mode", in, out}, 2, "mode"},
      {{in, out}, 2, "--statistic"},
      {{"--statistic", "mean", "--label-tolerance", "2", in, out}, 2, "--labels"},
      {{"--statistic", "mean", "--label-nodata", "2", in, out}, 2, "--labels"},
      {{"--statistic", "mean", "--labels", folder_ / "unplaced.tif", "--label-tolerance", "-1", in,
        out},
       2,
       "--label-tolerance"},
      {{"--statistic", "mean", "--labels", folder_ / "unplaced.tif", "--label-nodata", "x", in,
        out},
       2,
       "'x'"},
      {{"--statistic", "mean", "--size", "16385", in, out}, 2, "from 1 to 16384"},
      {{"--statistic", "mean", "--output-mask", folder_ / "small.tif", in, out}, 1, "29 x 20"},
      {{"--overwrite", "--statistic", "mean", "--labels", folder_ / "unplaced.tif", in,
        folder_ / "unplaced.tif"},
       2,
       "name another output"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.message);
    Arguments arguments = c.arguments;
    arguments.insert(arguments.begin(), "segment-filter");
    ExpectOneLine(RunProgram(arguments), c.status, c.message);
    EXPECT_EQ(folder_.Names(), before);
  }
}

}  // namespace
}  // namespace zarn::testsupport
