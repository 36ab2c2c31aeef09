// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdint>
#include <set>
#include <string>
#include <vector>

#include "processes/filters/framework/structuringkernel.h"
#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"
#include "tests/support/morphologyreference.h"

namespace zarn::testsupport {
namespace {

using Arguments = std::vector<std::string>;
using Bytes = std::vector<std::uint8_t>;

class Morph : public testing::Test {
 protected:
  /// The output of `zarn morph` with the given options on in.tif.
  Image Filter(Arguments options) {
    options.insert(options.begin(), "morph");
    options.insert(options.end(), {"--overwrite", folder_ / "in.tif", folder_ / "out.tif"});
    const Outcome outcome = RunProgram(options);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    EXPECT_EQ(outcome.err, "");
    return Read(folder_ / "out.tif");
  }

  /// One row of pixels through the program.
  std::vector<double> FilterRow(const std::vector<double>& row, const Arguments& options) {
    Image image(static_cast<int>(row.size()), 1, 1, GDT_Byte);
    image.values = row;
    Write(image, folder_ / "in.tif");
    return Filter(options).values;
  }

  TemporaryFolder folder_;
};

// In each band, patches of three values beside wide areas with specks and holes.
Image PatchyImage(int width, int height, int bands) {
  Image image(width, height, bands, GDT_Byte);
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      for (int band = 0; band < bands; ++band) {
        const int patch = (x / 9) * 7 + (y / 6) * 13 + band;
        const bool isSpeck = (x * 37 + y * 91 + 17 * band) % 613 == 0;
        const bool isWide = x < 60 || x > 110;
        const bool matches = isWide ? (x < 60) != isSpeck : patch % 5 < 3;
        image.At(x, y, band) = matches ? 200 : patch % 2 == 0 ? 0 : 7;
      }
    }
  }
  return image;
}

// The operation on whole bands, step by step.
Image Reference(const Image& image, const std::string& op, int size,
                processes::filters::KernelShape shape) {
  MorphologyCase step{image.width, image.height, 1, 1, {}};
  processes::filters::SetupKernelSE(static_cast<float>(size), step.offsets, shape);
  Image result = image;
  for (int band = 0; band < image.bands; ++band) {
    const auto pixels = image.values.size() / static_cast<std::size_t>(image.bands);
    Bytes region(pixels);
    const auto valueOf = [&](std::size_t i) -> std::size_t {
      return i * static_cast<std::size_t>(image.bands) + static_cast<std::size_t>(band);
    };
    for (std::size_t i = 0; i < pixels; ++i) region[i] = image.values[valueOf(i)] == 200 ? 1 : 0;
    const auto apply = [&](bool erode, const Bytes& from) {
      Bytes to(pixels);
      ReferenceMorphology(step, erode, from.data(), to.data());
      return to;
    };
    const Bytes grown = apply(false, region);
    const Bytes shrunk = apply(true, region);
    const Bytes opened = apply(false, shrunk);
    const Bytes closed = apply(true, grown);
    for (std::size_t i = 0; i < pixels; ++i) {
      const bool in = op == "dilate"     ? grown[i]
                      : op == "erode"    ? shrunk[i]
                      : op == "open"     ? opened[i]
                      : op == "close"    ? closed[i]
                      : op == "gradient" ? grown[i] && !shrunk[i]
                      : op == "tophat"   ? region[i] && !opened[i]
                                         : closed[i] && !region[i];
      if (in) {
        result.values[valueOf(i)] = 90;
      } else if (region[i] != 0) {
        result.values[valueOf(i)] = 30;
      }
    }
  }
  return result;
}

TEST_F(Morph, EqualsTheStepsOnTheWholeImageForAllWindowsAndThreads) {
  const Image image = PatchyImage(150, 70, 2);
  Write(image, folder_ / "in.tif");
  std::set<std::vector<double>> results;
  for (const char* const op :
       {"dilate", "erode", "open", "close", "gradient", "tophat", "blackhat"}) {
    for (const Arguments& kernel : {Arguments{"--size", "3", "--shape", "square"},
                                    {"--size", "8", "--shape", "disc"},
                                    {"--size", "21"}}) {
      const auto shape = kernel.back() == "disc" ? processes::filters::KernelShape::kDisc
                                                 : processes::filters::KernelShape::kSquare;
      const Image expected = Reference(image, op, std::stoi(kernel[1]), shape);
      results.insert(expected.values);
      for (const Arguments& variant :
           {Arguments{"--threads", "1"}, {"--window", "23x9", "--threads", "2"}}) {
        SCOPED_TRACE(std::string(op) + " " + kernel[1] + " " + variant[1]);
        Arguments arguments{"--op", op, "--match", "200", "--set", "90", "--background", "30"};
        arguments.insert(arguments.end(), kernel.begin(), kernel.end());
        arguments.insert(arguments.end(), variant.begin(), variant.end());
        EXPECT_EQ(Difference(expected, Filter(arguments)), "");
      }
    }
  }
  EXPECT_GE(results.size(), 17U);  // otherwise the image tells too little
}

TEST_F(Morph, KeepsAndReplacesValuesAsAsked) {
  const std::vector<double> row{9, 5, 5, 5, 0, 0, 5};
  using Row = std::vector<double>;
  EXPECT_EQ(FilterRow(row, {"--op", "erode", "--match", "5"}), (Row{9, 0, 5, 0, 0, 0, 0}));
  EXPECT_EQ(FilterRow(row, {"--op", "erode", "--match", "5", "--background", "5", "--set", "1"}),
            (Row{9, 5, 1, 5, 0, 0, 5}));
  EXPECT_EQ(FilterRow(row, {"--op", "dilate", "--match", "5"}), (Row{5, 5, 5, 5, 5, 5, 5}));
  EXPECT_EQ(FilterRow(row, {"--op", "erode", "--match", "0"}), (Row{9, 5, 5, 5, 255, 255, 5}));
  // Kernels that reach beyond the image.
  for (const char* const shape : {"square", "disc"}) {
    for (const char* const size : {"14", "16384"}) {
      const Arguments kernel{"--match", "5", "--size", size, "--shape", shape, "--op"};
      const auto with = [&](const char* op) {
        Arguments arguments = kernel;
        arguments.emplace_back(op);
        return FilterRow(row, arguments);
      };
      EXPECT_EQ(with("dilate"), Row(7, 5));
      EXPECT_EQ(with("erode"), (Row{9, 0, 0, 0, 0, 0, 0}));
      EXPECT_EQ(with("close"), Row(7, 5));
    }
  }
}

TEST_F(Morph, IgnoresMaskedPixelsAndCarriesPaletteAndNoData) {
  Image image(6, 1, 1, GDT_Byte);
  image.values = {1, 0, 1, 0, 1, 0};
  Write(image, folder_ / "in.tif", {}, [](GDALDataset& dataset) {
    GDALColorTable table;
    const GDALColorEntry red{255, 0, 0, 255};
    table.SetColorEntry(1, &red);
    dataset.GetRasterBand(1)->SetColorTable(&table);
    DeclareNoData(0)(dataset);
  });
  Image mask(6, 1, 1, GDT_Byte);
  mask.values = {1, 0, 1, 1, 0, 1};
  Write(mask, folder_ / "mask.tif");
  using Row = std::vector<double>;
  EXPECT_EQ(Filter({"--op", "erode", "--match", "1", "--mask", folder_ / "mask.tif"}).values,
            (Row{1, 0, 0, 0, 1, 0}));
  EXPECT_EQ(Filter({"--op", "dilate", "--match", "1", "--mask", folder_ / "mask.tif"}).values,
            (Row{1, 0, 1, 1, 1, 0}));
  const Image grown = Filter({"--op", "dilate", "--match", "1"});
  EXPECT_EQ(grown.values, Row(6, 1));
  const OpenDataset output = OpenImage(folder_ / "out.tif");
  EXPECT_EQ(output->GetRasterBand(1)->GetNoDataValue(), 0);
  ASSERT_NE(output->GetRasterBand(1)->GetColorTable(), nullptr);
  EXPECT_EQ(output->GetRasterBand(1)->GetColorTable()->GetColorEntry(1)->c1, 255);
}

TEST_F(Morph, RefusesWhatMakesNoSense) {
  Write(NoiseImage(20, 10, 1, GDT_Byte, {}, 1), folder_ / "in.tif");
  Write(NoiseImage(20, 10, 1, GDT_UInt16, {}, 1), folder_ / "words.tif");
  const std::set<std::string> before = folder_.Names();
  const std::string in = folder_ / "in.tif";
  const std::string out = folder_ / "out.tif";
  const struct {
    Arguments arguments;
    int status;
    std::string message;
  } cases[] = {
      {{"--op", "erode", "--match", "1", folder_ / "words.tif", out}, 1, "Masks must be Byte."},
      {{"--op", "shrink", "--match", "1", in, out}, 2, "shrink"},
      {{"--op", "erode", "--match", "256", in, out}, 2, "'256'"},
      {{"--op", "erode", in, out}, 2, "--match"},
      {{"--match", "1", in, out}, 2, "--op"},
      {{"--op", "open", "--match", "1", "--size", "0", in, out}, 2, "from 1 to 16384"},
      {{"--op", "open", "--match", "1", "--size", "16385", in, out}, 2, "from 1 to 16384"},
      {{"--op", "open", "--match", "1", "--shape", "ring", in, out}, 2, "ring"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.message);
    Arguments arguments = c.arguments;
    arguments.insert(arguments.begin(), "morph");
    ExpectOneLine(RunProgram(arguments), c.status, c.message);
    EXPECT_EQ(folder_.Names(), before);
  }
}

}  // namespace
}  // namespace zarn::testsupport
