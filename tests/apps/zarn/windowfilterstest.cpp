// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "processes/filters/factories/medianfilterfactory.h"
#include "processes/filters/factories/noisefilterfactory.h"
#include "processes/filters/factories/removeblobfactory.h"
#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"
#include "tests/support/testblock.h"

namespace zarn::testsupport {
namespace {

namespace filters = processes::filters;
using Arguments = std::vector<std::string>;
using FilterPtr = std::unique_ptr<filters::IFilter>;

/// The whole image through a filter of the library as a single block, whose margins are masked like
/// the pixels that `isValid` refuses; those keep their values.
template <typename T>
Image FilterWhole(const Image& image, int size, filters::IFilter& filter,
                  const std::function<bool(int x, int y)>& isValid) {
  const auto half = static_cast<std::uint32_t>(size / 2);
  const Shape shape{.width = static_cast<std::uint32_t>(image.width),
                    .height = static_cast<std::uint32_t>(image.height),
                    .channels = static_cast<std::uint32_t>(image.bands),
                    .marginX = half,
                    .marginY = half};
  TestBlock<T> input(shape);
  TestBlock<T> output({.width = shape.width, .height = shape.height, .channels = shape.channels});
  std::vector<std::uint8_t> mask(input.SampleCount() / shape.channels, 0);
  for (int y = 0; y < image.height; ++y) {
    for (int x = 0; x < image.width; ++x) {
      for (int band = 0; band < image.bands; ++band) {
        input.At(x, y, band) = static_cast<T>(image.At(x, y, band));
        output.At(x, y, band) = input.At(x, y, band);
      }
      mask[static_cast<std::size_t>(shape.PixelIndex(x, y))] = isValid(x, y) ? 1 : 0;
    }
  }
  gobs::Raster target = output.Wrap();
  EXPECT_EQ(filter.Process(input.Wrap(), target, 0, 0, mask.data()).message, "");
  Image result = image;
  for (std::size_t i = 0; i < result.values.size(); ++i) {
    result.values[i] = static_cast<double>(output.Samples()[i]);
  }
  return result;
}

class WindowFilters : public testing::Test {
 protected:
  /// The output of a command with the given options on in.tif.
  Image Filter(const std::string& command, Arguments options) {
    options.insert(options.begin(), command);
    options.insert(options.end(), {"--overwrite", folder_ / "in.tif", folder_ / "out.tif"});
    const Outcome outcome = RunProgram(options);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    return Read(folder_ / "out.tif");
  }
  Outcome Fail(const std::string& command, Arguments options) {
    options.insert(options.begin(), command);
    options.insert(options.end(), {folder_ / "in.tif", folder_ / "none.tif"});
    return RunProgram(options);
  }

  TemporaryFolder folder_;
};

struct Command {
  const char* name;
  FilterPtr (*make)(int size, double background);
};
const Command kMedian{"median", [](int size, double) {
                        return FilterPtr(filters::MedianFilterFactory(size).GetCPUFilter());
                      }};
const Command kNoise{
    "noise", [](int size, double background) {
      return FilterPtr(filters::NoiseFilterFactory(size, background).GetCPUFilter());
    }};
const Command kBlobs{
    "remove-blobs", [](int size, double background) {
      return FilterPtr(filters::RemoveBlobFactory(size, background).GetCPUFilter());
    }};

TEST_F(WindowFilters, MakeOfAFileWhatTheLibraryMakesOfTheWholeImage) {
  struct Case {
    Command command;
    GDALDataType type;
    int bands;
    int size;
  };
  const std::vector<Case> cases{{kMedian, GDT_Byte, 3, 3},    {kMedian, GDT_UInt16, 1, 6},
                                {kMedian, GDT_Float32, 2, 5}, {kNoise, GDT_Byte, 1, 5},
                                {kNoise, GDT_UInt16, 3, 3},   {kNoise, GDT_Float32, 1, 9},
                                {kBlobs, GDT_Byte, 1, 3},     {kBlobs, GDT_Byte, 3, 7},
                                {kBlobs, GDT_UInt16, 1, 13},  {kBlobs, GDT_Float32, 2, 5}};
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string(c.command.name) + " " + GDALGetDataTypeName(c.type) + " size " +
                 std::to_string(c.size));
    const Image image = NoiseImage(97, 71, c.bands, c.type, 7, 23);
    Write(image, folder_ / "in.tif", {}, DeclareNoData(7));
    const auto isValid = [&](int x, int y) { return !image.AllBands(x, y, 7); };
    const FilterPtr filter = c.command.make(c.size, 7);
    const auto whole = [&]<typename T>(T) {
      return FilterWhole<T>(image, c.size, *filter, isValid);
    };
    const Image expected = c.type == GDT_Byte     ? whole(std::uint8_t{})
                           : c.type == GDT_UInt16 ? whole(std::uint16_t{})
                                                  : whole(float{});
    const std::string size = std::to_string(c.size);
    for (const Arguments& variant :
         {Arguments{"--threads", "1"}, Arguments{"--window", "11x7"}, Arguments{"--window", "97x1"},
          Arguments{"--window", "1x71"}, Arguments{"--window", "64x32", "--threads", "2"}}) {
      Arguments options = variant;
      options.insert(options.end(), {"--size", size});
      EXPECT_EQ(Difference(expected, Filter(c.command.name, options)), "") << variant[1];
    }
  }
}

TEST_F(WindowFilters, TakeTheBackgroundFromTheNoDataValueOfTheOutput) {
  Image image(9, 9, 1, GDT_Byte);
  std::fill(image.values.begin(), image.values.end(), 100);
  image.At(4, 4, 0) = 250;
  for (int y = 0; y < 9; ++y) image.At(0, y, 0) = image.At(2, y, 0) = 5;
  Write(image, folder_ / "in.tif", {}, DeclareNoData(5));
  // A bright sample, and a column between two of no-data.
  const auto expect = [&](const std::string& command, const Arguments& options, double bright,
                          double alone, double noData) {
    const Image output = Filter(command, options);
    EXPECT_EQ(output.At(4, 4, 0), bright) << command;
    EXPECT_EQ(output.At(1, 4, 0), alone) << command;
    EXPECT_EQ(output.At(0, 4, 0), noData) << command;
  };
  expect("noise", {"--size", "5"}, 5, 100, 5);
  expect("noise", {"--size", "5", "--dst-nodata", "9"}, 9, 100, 9);
  expect("noise", {"--size", "5", "--background", "77"}, 77, 100, 5);
  expect("remove-blobs", {}, 250, 5, 5);
  expect("remove-blobs", {"--dst-nodata", "9"}, 250, 9, 9);
  expect("remove-blobs", {"--background", "77"}, 250, 77, 5);
  // A square that does not fit into the image.
  expect("remove-blobs", {"--size", "99999999999"}, 5, 5, 5);
}

TEST_F(WindowFilters, TakeForNoDataWhatEqualsItExactly) {
  Image image(9, 9, 1, GDT_Float32);
  std::fill(image.values.begin(), image.values.end(), 0);
  image.At(4, 4, 0) = image.At(0, 8, 0) = 1e-20;
  Write(image, folder_ / "in.tif", {}, DeclareNoData(0));
  for (const int size : {1, 3}) {
    const Image output =
        Filter("remove-blobs", {"--size", std::to_string(size), "--dst-nodata", "-9"});
    EXPECT_EQ(output.At(4, 4, 0), size == 1 ? 1e-20F : -9);
    EXPECT_EQ(output.At(3, 4, 0), -9);
  }
}

TEST_F(WindowFilters, SayWhatIsMissing) {
  const Image image = NoiseImage(9, 9, 2, GDT_Byte, {}, 1);
  Write(image, folder_ / "in.tif");
  for (const char* const command : {"noise", "remove-blobs"}) {
    ExpectOneLine(Fail(command, {}), 2, "--background");
    ExpectOneLine(Fail(command, {"--src-nodata", "1,2"}), 2, "different no-data values");
    ExpectOneLine(Fail(command, {"--background", "x"}), 2, "--background");
    // Not the no-data value in its place.
    for (const char* const value : {"none", "300"}) {
      ExpectOneLine(Fail(command, {"--dst-nodata", "9", "--background", value}), 2,
                    std::string("--background ") + value);
    }
  }
  ExpectOneLine(Fail("median", {"--size", "8"}), 2, "from 1 to 7");
}

}  // namespace
}  // namespace zarn::testsupport
