// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <fstream>
#include <functional>
#include <limits>
#include <optional>
#include <string>
#include <vector>

#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"
#include "tests/support/conversionreference.h"

namespace zarn::testsupport {
namespace {

using Arguments = std::vector<std::string>;
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr int kColumns = 301;
constexpr int kRows = 67;

/// A sample of the image and its place.
struct Sample {
  int band;
  double x;
  double y;
  double v;
  GDALDataType type;
};

/// What a formula says about it: a number to be converted within bounds, or written as it is.
struct Corrected {
  double value = 0;
  double low = -kInfinity;
  double high = kInfinity;
  bool asIs = false;
};

struct Command {
  std::string name;
  Arguments options;
  std::string params;
  std::function<Corrected(const Sample&)> formula;
};

double Convert(GDALDataType type, const Corrected& result, std::optional<double> noData) {
  const auto to = [&]<typename T>(T) {
    return static_cast<double>(ReferenceResult<T>(result.value, result.low, result.high, noData));
  };
  if (result.asIs) return result.value;
  switch (type) {
    case GDT_Byte:
      return to(std::uint8_t{});
    case GDT_UInt16:
      return to(std::uint16_t{});
    case GDT_Int16:
      return to(std::int16_t{});
    case GDT_Int32:
      return to(std::int32_t{});
    case GDT_Float32:
      return to(float{});
    case GDT_Float64:
      return to(double{});
    default:
      ADD_FAILURE() << "no reference for " << GDALGetDataTypeName(type);
      return kNaN;
  }
}

std::uint8_t Entry(int band, int i) {
  return static_cast<std::uint8_t>(band == 0 ? i * 7 + 13 : 255 - i / 2);
}

std::string TableText(int band) {
  std::string text = "[";
  for (int i = 0; i < 256; ++i) text += (i == 0 ? "" : ",") + std::to_string(Entry(band, i));
  return text + "]";
}

Corrected LookedUp(const Sample& s) {
  const int index = static_cast<int>(std::clamp(s.v, 0.0, 255.0));
  return {.value = static_cast<double>(Entry(s.band, index)), .asIs = true};
}

Corrected LookedUpInRange(const Sample& s) {
  const double min = s.band == 0 ? 20 : -50.5;
  const double max = s.band == 0 ? 100 : 30000;
  const double low = Convert(s.type, {.value = std::trunc(min)}, {});
  const double high = Convert(s.type, {.value = std::trunc(max)}, {});
  const bool isFloat = s.type == GDT_Float32 || s.type == GDT_Float64;
  const double first = isFloat ? min : low;
  if (s.v > high) return {.value = high, .asIs = true};
  if (s.v < first) return {.value = first, .asIs = true};
  double above = s.v - first;
  if (s.type == GDT_Float32) above = static_cast<float>(above);
  const double scale = 255.0 / (max - min);
  const int index = static_cast<int>(std::min(above * scale, 255.0));
  return {.value = first + Entry(s.band, index) / scale, .low = first, .high = high};
}

Corrected LessHotSpot(const Sample& s, double columnDivisor, double rowDivisor) {
  const std::vector<double> p = s.band == 0 ? std::vector<double>{-60, 5, -61.5, 60, 59, 3}
                                            : std::vector<double>{9, -4, 8, 1, 2, -30};
  const double x = s.x / columnDivisor;
  const double y = s.y / rowDivisor;
  return {s.v - ((y * p[1] + p[3] + x * p[0]) * x + y * p[2] * y + y * p[4] + p[5])};
}

// Surfaces that are exactly linear between nodes 128 pixels apart.
double Gain(double x, double y) { return 0.5 + x / 256 + y / 512; }
double Offset(int band, double x) { return (band == 0 ? -8 : 3) + x / 128; }

void WriteSurface(const std::string& file, int bands, double turn,
                  const std::function<double(int band, double x, double y)>& value) {
  Image surface(4, 2, bands, GDT_Float32);
  for (int j = 0; j < 2; ++j) {
    for (int i = 0; i < 4; ++i) {
      for (int band = 0; band < bands; ++band) {
        surface.At(i, j, band) = value(band, 128 * i, 128 * j);
      }
    }
  }
  Write(surface, file, {}, [&](GDALDataset& dataset) {
    double transform[] = {-63.5, 128, turn, -63.5, -turn, 128};
    dataset.SetGeoTransform(transform);
  });
}

std::vector<Command> Commands() {
  const std::string spots =
      R"("channels":[{"coefficients":[-60,5,-61.5,60,59,3]},{"coefficients":[9,-4,8,1,2,-30]}]})";
  return {
      {"gain-offset",
       {"--gain", "1.25,-0.5", "--offset", "-3.5,300"},
       "",
       [](const Sample& s) {
         return Corrected{s.band == 0 ? s.v * 1.25 - 3.5 : s.v * -0.5 + 300};
       }},
      {"gain-offset",
       {"--offset", "-.5"},
       "",
       [](const Sample& s) { return Corrected{s.v - 0.5}; }},
      {"gain-offset",
       {},
       R"({"channels":[{"gain":0.5,"offset":7}]})",
       [](const Sample& s) { return Corrected{s.v * 0.5 + 7}; }},
      {"lut",
       {},
       R"({"channels":[{"table":)" + TableText(0) + R"(},{"table":)" + TableText(1) + "}]}",
       LookedUp},
      {"minmax-lut",
       {},
       R"({"channels":[{"min":20,"max":100,"table":)" + TableText(0) +
           R"(},{"min":-50.5,"max":30000,"table":)" + TableText(1) + "}]}",
       LookedUpInRange},
      {"polynomial",
       {},
       R"({"channels":[{"bias":2,"coefficients":[1.5,0.75]}]})",
       [](const Sample& s) { return Corrected{1.5 + 0.75 * (s.v + 2)}; }},
      {"polynomial",
       {},
       R"({"channels":[{"bias":0,"coefficients":[0,1,0.004,-0.001]},
                       {"bias":-4,"coefficients":[9,0.5,0.01,0.002]}]})",
       [](const Sample& s) {
         return Corrected{s.band == 0 ? 0 + (1 + 0.004 * s.y + -0.001 * s.x) * s.v
                                      : 9 + (0.5 + 0.01 * s.y + 0.002 * s.x) * (s.v - 4)};
       }},
      {"polynomial",
       {},
       R"({"channels":[{"bias":1,"coefficients":[2,0.9,0.001,0.002,3e-5,-4e-6,5e-6]}]})",
       [](const Sample& s) {
         const double gain = (3e-5 * s.y + 0.001 + 5e-6 * s.x) * s.y + (-4e-6 * s.x + 0.002) * s.x;
         return Corrected{(gain + 0.9) * (s.v + 1) + 2};
       }},
      {"hotspot",
       {},
       R"({"columnDivisor":150,"rowDivisor":70,)" + spots,
       [](const Sample& s) { return LessHotSpot(s, 150, 70); }},
      {"hotspot", {}, "{" + spots, [](const Sample& s) { return LessHotSpot(s, kColumns, kRows); }},
      {"dodge",
       {},
       R"({"type":2,"gainSurface":"gain.tif","offsetSurface":"offset.tif",
           "channels":[{"d0":60,"d1":4.5,"d2":30,"d3":7.5,"d4":0.75,"d5":1}]})",
       [](const Sample& s) {
         const double a = s.v * 0.75 + 1 - 60;
         return Corrected{a * 1.25 * Gain(s.x, s.y) + 60 + (4.5 + Offset(s.band, s.x))};
       }},
      {"dodge",
       {},
       R"({"type":0,"offsetSurface":"offset.tif","channels":[{"d1":2},{"d1":-3,"d4":0.5}]})",
       [](const Sample& s) {
         return Corrected{s.v * (s.band == 0 ? 1 : 0.5) +
                          ((s.band == 0 ? 2 : -3) + Offset(s.band, s.x))};
       }},
  };
}

/// Where pixels are invalid, and what they are to become.
struct Invalid {
  std::string name;
  GDALDataType type;
  std::optional<double> noData;  ///< declared by the file
  Arguments options;
  std::optional<double> becomes;  ///< nothing: they stay
  bool nan = false;
  bool alpha = false;
};

const std::vector<Invalid> kInvalid{
    {"no-data 0", GDT_Byte, 0, {}, 0},
    {"masked alone", GDT_Byte, {}, {}, {}},
    {"transparent", GDT_Byte, {}, {"--dst-nodata", "255"}, 255, false, true},
    {"transparent, kept", GDT_Int32, {}, {}, {}, false, true},
    {"another no-data value", GDT_UInt16, 0, {"--dst-nodata", "50"}, 50},
    {"no-data no longer", GDT_Int16, -32768, {"--dst-nodata", "none"}, {}},
    {"NaN, kept", GDT_Float32, {}, {}, {}, true},
    {"NaN to no-data", GDT_Float32, -9999, {}, -9999, true},
    {"double", GDT_Float64, 0.5, {}, 0.5},
};

Image InputOf(const Invalid& invalid) {
  Image image = NoiseImage(kColumns, kRows, 2, invalid.type, invalid.noData, 17);
  for (int i = 0; i < kRows && invalid.nan; ++i) image.At(3 * i, i, i % 2) = kNaN;
  if (!invalid.alpha) return image;
  Image withAlpha(kColumns, kRows, 3, invalid.type);
  for (int y = 0; y < kRows; ++y) {
    for (int x = 0; x < kColumns; ++x) {
      for (int band = 0; band < 2; ++band) withAlpha.At(x, y, band) = image.At(x, y, band);
      withAlpha.At(x, y, 2) = (x + y) % 5 == 0 ? 0 : 100;
    }
  }
  return withAlpha;
}

bool IsValid(const Image& image, const Image& mask, const Invalid& invalid, int x, int y) {
  const double a = image.At(x, y, 0);
  const double b = image.At(x, y, 1);
  return mask.At(x, y, 0) != 0 && !(a == invalid.noData && b == invalid.noData) && !std::isnan(a) &&
         !std::isnan(b) && !(invalid.alpha && image.At(x, y, 2) == 0);
}

Image Expected(const Command& command, const Image& image, const Image& mask,
               const Invalid& invalid) {
  Image result = image;
  for (int y = 0; y < image.height; ++y) {
    for (int x = 0; x < image.width; ++x) {
      const bool valid = IsValid(image, mask, invalid, x, y);
      for (int band = 0; band < 2; ++band) {
        double& sample = result.At(x, y, band);
        const Sample input{band, static_cast<double>(x), static_cast<double>(y), sample,
                           image.type};
        if (valid) {
          sample = Convert(image.type, command.formula(input), invalid.becomes);
        } else {
          sample = invalid.becomes.value_or(sample);
        }
      }
    }
  }
  return result;
}

class PointFilter : public testing::Test {
 protected:
  std::string Params(const std::string& text) {
    std::ofstream(folder_ / "params.json") << text;
    return folder_ / "params.json";
  }
  /// The arguments that run a command on in.tif.
  Arguments Line(const std::string& name, const std::string& params, const Arguments& options) {
    Arguments line{name};
    if (!params.empty()) line.insert(line.end(), {"--params", Params(params)});
    line.insert(line.end(), options.begin(), options.end());
    line.insert(line.end(), {"--overwrite", folder_ / "in.tif", folder_ / "out.tif"});
    return line;
  }

  TemporaryFolder folder_;
};

TEST_F(PointFilter, EqualsItsFormulaInAnyWindowsAndThreads) {
  Image mask(kColumns, kRows, 1, GDT_Byte);
  for (std::size_t i = 0; i < mask.values.size(); ++i) mask.values[i] = i / 40 % 9 == 0 ? 0 : 1;
  Write(mask, folder_ / "mask.tif");
  WriteSurface(folder_ / "gain.tif", 1, 0, [](int, double x, double y) { return Gain(x, y); });
  WriteSurface(folder_ / "offset.tif", 2, 0,
               [](int band, double x, double) { return Offset(band, x); });
  // Shifted from case to case, so that every command meets all of them.
  const std::vector<Arguments> pieces{{"--threads", "2"},
                                      {"--window", "37x11", "--threads", "2"},
                                      {"--window", "301x1", "--threads", "1"},
                                      {"--window", "64x67"}};
  std::size_t turn = 0;
  for (const Invalid& invalid : kInvalid) {
    const Image image = InputOf(invalid);
    Write(image, folder_ / "in.tif", {}, [&](GDALDataset& dataset) {
      if (invalid.noData) dataset.GetRasterBand(1)->SetNoDataValue(*invalid.noData);
      if (invalid.alpha) dataset.GetRasterBand(3)->SetColorInterpretation(GCI_AlphaBand);
    });
    for (const Command& command : Commands()) {
      SCOPED_TRACE(invalid.name + ": " + command.name + " " + command.params.substr(0, 60));
      const Image expected = Expected(command, image, mask, invalid);
      Arguments options = command.options;
      for (const Arguments& more : {invalid.options, pieces[turn++ % pieces.size()]}) {
        options.insert(options.end(), more.begin(), more.end());
      }
      options.insert(options.end(), {"-q", "--mask", folder_ / "mask.tif"});
      const Outcome outcome = RunProgram(Line(command.name, command.params, options));
      ASSERT_EQ(outcome.status, 0) << outcome.err;
      ASSERT_EQ(Difference(expected, Read(folder_ / "out.tif")), "");
    }
    ++turn;
  }
}

TEST_F(PointFilter, HandlesWideIntegersWhereTheFilterDoes) {
  constexpr int kMasked = 25;
  Image mask(40, 30, 1, GDT_Byte);
  for (int i = 0; i < 40 * 30; ++i) mask.At(i % 40, i / 40, 0) = i / 40 == kMasked ? 0 : 1;
  Write(mask, folder_ / "mask.tif");
  // Beyond 32 bits, within what doubles hold.
  for (const GDALDataType type : {GDT_Int64, GDT_UInt64}) {
    SCOPED_TRACE(GDALGetDataTypeName(type));
    const bool isSigned = type == GDT_Int64;
    Image image = NoiseImage(40, 30, 2, GDT_Int32, {}, 2);
    image.type = type;
    for (double& value : image.values) value = isSigned ? value * 1000 : std::abs(value) * 1000;
    const double noData = isSigned ? -0x1p63 : 42;
    Image expected = image;
    for (double& value : expected.values) value = isSigned ? value + 7 : std::max(value - 7e9, 0.0);
    for (int x = 0; x < 40; ++x) {
      for (int band = 0; band < 2; ++band) image.At(x, x / 2, band) = noData;
      for (int band = 0; band < 2; ++band) expected.At(x, x / 2, band) = noData;
      for (int band = 0; band < 2; ++band) expected.At(x, kMasked, band) = noData;
    }
    Write(image, folder_ / "in.tif", {}, [&](GDALDataset& dataset) {
      GDALRasterBand& band = *dataset.GetRasterBand(1);
      isSigned ? band.SetNoDataValueAsInt64(std::numeric_limits<std::int64_t>::min())
               : band.SetNoDataValueAsUInt64(42);
    });
    const std::string bias = isSigned ? "7" : "-7e9";
    const Outcome outcome = RunProgram(
        Line("polynomial", R"({"channels":[{"bias":)" + bias + R"(,"coefficients":[0,1]}]})",
             {"--mask", folder_ / "mask.tif"}));
    ASSERT_EQ(outcome.status, 0) << outcome.err;
    EXPECT_EQ(outcome.err, "");
    EXPECT_EQ(Difference(expected, Read(folder_ / "out.tif")), "");
    const OpenDataset output = OpenImage(folder_ / "out.tif");
    GDALRasterBand& band = *output->GetRasterBand(2);
    EXPECT_EQ(isSigned ? static_cast<double>(band.GetNoDataValueAsInt64())
                       : static_cast<double>(band.GetNoDataValueAsUInt64()),
              noData);
  }
}

TEST_F(PointFilter, ReadsItsOwnExamples) {
  const Image image = NoiseImage(60, 40, 3, GDT_UInt16, 0, 3);
  Write(image, folder_ / "in.tif", {}, DeclareNoData(0));
  for (const char* const name :
       {"gain-offset", "lut", "minmax-lut", "polynomial", "hotspot", "dodge"}) {
    SCOPED_TRACE(name);
    const Outcome example = RunProgram({name, "--example"});
    ASSERT_EQ(example.status, 0) << example.err;
    EXPECT_EQ(example.err, "");
    const Outcome outcome = RunProgram(Line(name, example.out, {}));
    ASSERT_EQ(outcome.status, 0) << outcome.err;
    EXPECT_NE(Difference(image, Read(folder_ / "out.tif")), "");
  }
}

TEST_F(PointFilter, WarnsWhereTheTablesMakeNoData) {
  Write(NoiseImage(20, 10, 2, GDT_UInt16, 0, 3), folder_ / "in.tif", {}, DeclareNoData(0));
  const auto table = [](int first, int last) {
    std::string text = "\"table\":[" + std::to_string(first);
    for (int i = 1; i < 255; ++i) text += "," + std::to_string(i);
    return text + "," + std::to_string(last) + "]";
  };
  const auto both = [](const std::string& a, const std::string& b) {
    return R"({"channels":[{)" + a + "},{" + b + "}]}";
  };
  struct Case {
    const char* name;
    std::string params;
    const char* noData;
    bool warns;
  };
  const std::string identity = table(0, 255);
  const std::vector<Case> cases{
      {"lut", both(identity, identity), "0", false},
      {"lut", both(table(0, 0), identity), "0", true},
      {"lut", both(table(0, 0), table(1, 1)), "0", false},
      {"lut", both(identity, identity), "255", true},
      {"lut", both(table(0, 0), identity), "none", false},
      {"minmax-lut", both(R"("min":0,"max":400,)" + identity, R"("min":9,"max":99,)" + identity),
       "0", false},
      {"minmax-lut", both(R"("min":9,"max":400,)" + identity, R"("min":0,"max":9.5,)" + identity),
       "9", true},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name + (" " + c.params));
    const Outcome outcome = RunProgram(Line(c.name, c.params, {"--dst-nodata", c.noData}));
    EXPECT_EQ(outcome.status, 0);
    EXPECT_EQ(outcome.err.find("become no-data") != std::string::npos, c.warns) << outcome.err;
  }
}

TEST_F(PointFilter, RefusesWrongParametersInOneLine) {
  Write(NoiseImage(20, 10, 3, GDT_Byte, {}, 1), folder_ / "in.tif");
  Write(Image(6, 4, 1, GDT_CFloat32), folder_ / "complex.tif");
  Write(Image(6, 4, 1, GDT_Int64), folder_ / "int64.tif");
  const std::string complex = folder_ / "complex.tif";
  const std::string int64 = folder_ / "int64.tif";
  const std::string in = folder_ / "in.tif";
  const std::string good = R"({"channels":[{"gain":1,"offset":0}]})";
  const std::string table = R"("table":)" + TableText(0);
  const std::string entry = TableText(0).substr(0, 3) + ",300" + TableText(0).substr(6);
  const auto one = [](int, double, double) { return 1; };
  WriteSurface(folder_ / "turned.tif", 1, 9, one);
  WriteSurface(folder_ / "two.tif", 2, 0, one);
  WriteSurface(folder_ / "nan.tif", 1, 0, [](int, double x, double) { return x > 0 ? 1 : kNaN; });
  struct Case {
    const char* command;
    std::string params;
    Arguments more;
    int status;
    std::string message;
  };
  const std::vector<Case> cases{
      {"lut", "", {in}, 2, "--params is required"},
      {"gain-offset", "", {in}, 2, "--gain, --offset or --params"},
      {"gain-offset", "", {"--gain", "1,x", in}, 2, "'x' is not a number"},
      {"gain-offset", "", {"--gain", "1,inf,1", in}, 2, "not finite"},
      {"gain-offset", "", {"--gain", "1,2", in}, 2, "--gain has 2 values, but"},
      {"gain-offset", "", {"--gain", "1", "--offset", "1,2,3,4", in}, 2, "has 3 bands"},
      {"gain-offset", good, {"--gain", "1", in}, 2, "excludes"},
      {"gain-offset",
       good,
       {int64},
       1,
       "band 1 is Int64: Unknown raster block data type for color"},
      {"hotspot",
       R"({"channels":[{"coefficients":[0,0,0,0,0,0]}]})",
       {complex},
       1,
       "band 1 is CFloat32: Unknown raster block data type for color balancing"},
      {"polynomial",
       R"({"channels":[{"bias":0,"coefficients":[0,1]}]})",
       {complex},
       1,
       "band 1 is CFloat32: Invalid type requested."},
      {"gain-offset", " ", {in}, 2, "is not valid JSON"},
      {"gain-offset", "{\"channels\":[{\"gain\":NaN,\n\"offset\":0}]}", {in}, 2, "line 1"},
      {"gain-offset", R"({"channels":[{"gain":1e999,"offset":0}]})", {in}, 2, "1e999"},
      {"gain-offset",
       R"({"channels":[{"gain":1,"gain":2,"offset":0}]})",
       {in},
       2,
       "'gain' stands twice"},
      {"gain-offset",
       "[1]",
       {in},
       2,
       "json: expected an object with the keys 'channels', found [1]"},
      {"gain-offset", "{}", {in}, 2, "'channels': expected a list of objects, found nothing"},
      {"gain-offset", R"({"channels":[]})", {in}, 2, "'channels': expected"},
      {"gain-offset", R"({"channels":[7]})", {in}, 2, "channel 1: expected an object"},
      {"gain-offset",
       R"({"channels":[{"gain":1,"offset":0},{"gain":"1","offset":0}]})",
       {in},
       2,
       "channel 2, 'gain': expected a number, found \"1\""},
      {"gain-offset",
       R"({"channels":[{"gain":1}]})",
       {in},
       2,
       "channel 1, 'offset': expected a number"},
      {"gain-offset",
       R"({"channels":[{"gain":1,"offset":0,"ofset":1}]})",
       {in},
       2,
       "channel 1: unknown key 'ofset'"},
      {"gain-offset", R"({"channel":[{"gain":1,"offset":0}]})", {in}, 2, "unknown key 'channel'"},
      {"gain-offset",
       R"({"channels":[{"gain":1,"offset":0},{"gain":1,"offset":0}]})",
       {in},
       2,
       "has 2 channels, but"},
      {"lut",
       R"({"channels":[{"table":[1,2,3]}]})",
       {in},
       2,
       "256 whole numbers from 0 to 255, found"},
      {"lut", R"({"channels":[{"table":)" + entry + "}]}", {in}, 2, "'table[1]': expected"},
      {"minmax-lut",
       R"({"channels":[{"min":5,"max":5,)" + table + "}]}",
       {in},
       2,
       "more than 'min'"},
      {"polynomial",
       R"({"channels":[{"bias":0,"coefficients":[0,1,2]}]})",
       {in},
       2,
       "'coefficients': expected a list of 2, 4 or 7 numbers"},
      {"polynomial",
       R"({"channels":[{"bias":0,"coefficients":[0,1]},{"bias":0,"coefficients":[0,1,0,0]}]})",
       {in},
       2,
       "channel 2, 'coefficients': expected a list of 2 numbers"},
      {"hotspot",
       R"({"columnDivisor":0,"channels":[{"coefficients":[0,0,0,0,0,0]}]})",
       {in},
       2,
       "'columnDivisor': expected a whole number from 1"},
      {"hotspot",
       R"({"channels":[{"coefficients":[0,0,0,0,0,null]}]})",
       {in},
       2,
       "'coefficients[5]': expected a number, found null"},
      {"dodge", R"({"type":3,"channels":[{}]})", {in}, 2, "'type': expected 0, 1 or 2, found 3"},
      {"dodge", R"({"type":2,"channels":[{"d2":0}]})", {in}, 2, "'d2': expected a number other"},
      {"dodge",
       R"({"type":2,"gainSurface":"no.tif","channels":[{}]})",
       {in},
       1,
       "no.tif: No such file"},
      {"dodge", R"({"type":0,"offsetSurface":"turned.tif","channels":[{}]})", {in}, 1, "is turned"},
      {"dodge", R"({"type":0,"offsetSurface":"two.tif","channels":[{}]})", {in}, 1, "has 2 bands"},
      {"dodge", R"({"type":0,"offsetSurface":"nan.tif","channels":[{}]})", {in}, 1, "not finite"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.command + (" " + c.params.substr(0, 80)));
    Arguments line{c.command};
    if (!c.params.empty()) line.insert(line.end(), {"--params", Params(c.params)});
    line.insert(line.end(), c.more.begin(), c.more.end());
    line.push_back(folder_ / "out.tif");
    ExpectOneLine(RunProgram(line), c.status, c.message);
    EXPECT_FALSE(folder_.Names().contains("out.tif"));
  }
  for (const char* const missing : {"missing.json", "."}) {
    ExpectOneLine(RunProgram({"lut", "--params", folder_ / missing, in, folder_ / "out.tif"}), 2,
                  "cannot read");
  }
}

}  // namespace
}  // namespace zarn::testsupport
