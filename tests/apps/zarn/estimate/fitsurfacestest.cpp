// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <string>

#include "tests/apps/zarn/estimate/estimatescene.h"
#include "tests/apps/zarn/program.h"
#include "tests/support/randomnumbers.h"

namespace zarn::testsupport {
namespace {

constexpr Place kPlace{500, 900, 1};
constexpr int kWidth = 400;
constexpr int kHeight = 300;

double Bulge(double column, double row) {
  const double x = column / kWidth;
  const double y = row / kHeight;
  return -120 * x * x + 40 * x * y - 90 * y * y + 90 * x + 30 * y;
}

double Quadratic(const nlohmann::json& p, double column, double row, double width, double height) {
  const double x = column / width;
  const double y = row / height;
  return p[0].get<double>() * x * x + p[1].get<double>() * x * y + p[2].get<double>() * y * y +
         p[3].get<double>() * x + p[4].get<double>() * y + p[5].get<double>();
}

// Fields of four kinds, more of the bright kind in the east: a plain fit takes them for a bulge.
Image Fields(bool bulging) {
  RandomNumbers random(7);
  constexpr std::array<std::array<double, 3>, 4> kColors{
      {{60, 90, 50}, {120, 100, 80}, {90, 130, 60}, {140, 140, 100}}};
  Image image = Paint(kWidth, kHeight, 3, GDT_Byte, kPlace, [&](double x, double y, int band) {
    const auto field = static_cast<unsigned>((x - kPlace.left) / 40) * 31U +
                       static_cast<unsigned>((kPlace.top - y) / 40) * 17U;
    const bool east = (x - kPlace.left) / kWidth > 0.25 * (1 + field % 3);
    const double color =
        kColors[(field % 5 % 3) + (east ? 1U : 0U)][static_cast<std::size_t>(band)];
    const double bulge = bulging ? Bulge(x - kPlace.left - 0.5, kPlace.top - y - 0.5) : 0;
    return std::round(color + bulge + 3 * random.Fraction());
  });
  for (int y = 0; y < kHeight; ++y) {
    for (int x = 0; x < 40 + y / 5; ++x) {
      for (int band = 0; band < 3; ++band) image.At(x, y, band) = 0;
    }
  }
  return image;
}

// How far the fitted surface is from the true one, and its mean over the valid pixels.
struct Errors {
  double deviation = 0;
  double mean = 0;
};

Errors ErrorsOf(const nlohmann::json& parameters, const Image& image, std::size_t band) {
  const nlohmann::json& p = parameters.at("channels").at(band).at("coefficients");
  double count = 0;
  double sum = 0;
  double difference = 0;
  double squares = 0;
  for (int y = 0; y < image.height; ++y) {
    for (int x = 0; x < image.width; ++x) {
      if (image.AllBands(x, y, 0)) continue;
      const double h = Quadratic(p, x, y, parameters.at("columnDivisor").get<double>(),
                                 parameters.at("rowDivisor").get<double>());
      count += 1;
      sum += h;
      difference += Bulge(x, y) - h;
      squares += (Bulge(x, y) - h) * (Bulge(x, y) - h);
    }
  }
  difference /= count;
  return {std::sqrt(squares / count - difference * difference), sum / count};
}

TEST(FitHotSpot, FindsTheBulgeAndKeepsTheMeanLevel) {
  const TemporaryFolder folder;
  const Image image = Fields(true);
  Write(image, folder / "in.tif", {}, PutAt(kPlace));
  // Another radiometry, half the resolution, and not quite the same area.
  const Place coarse{kPlace.left - 20, kPlace.top + 15, 2};
  const Image even = Fields(false);
  Write(Paint(205, 150, 3, GDT_Byte, coarse,
              [&](double x, double y, int band) {
                const int column = std::clamp(static_cast<int>(x - kPlace.left), 0, kWidth - 1);
                const int row = std::clamp(static_cast<int>(kPlace.top - y), 0, kHeight - 1);
                return std::round(0.7 * even.At(column, row, band) + 20);
              }),
        folder / "ref.tif", {}, PutAt(coarse));
  const auto fit = [&](const std::vector<std::string>& options) {
    std::vector<std::string> arguments{"fit-hotspot", folder / "in.tif", "--overwrite", "-o",
                                       folder / "out.json"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    const Outcome outcome = RunProgram(arguments);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    return ReadJson(folder / "out.json");
  };
  const nlohmann::json plain = fit({"--classes", "1"});
  const nlohmann::json classes = fit({});
  const nlohmann::json reference = fit({"--reference", folder / "ref.tif"});
  for (std::size_t band = 0; band < 3; ++band) {
    SCOPED_TRACE("band " + std::to_string(band));
    EXPECT_GT(ErrorsOf(plain, image, band).deviation, 3) << "too easy a land";
    EXPECT_LT(ErrorsOf(classes, image, band).deviation, 1.0);
    EXPECT_LT(ErrorsOf(reference, image, band).deviation, 1.0);
    EXPECT_NEAR(ErrorsOf(classes, image, band).mean, 0, 1e-6);
    EXPECT_NEAR(ErrorsOf(reference, image, band).mean, 0, 1e-6);
  }
}

TEST(FitDodging, SurfacesBringASmoothlyDisturbedImageOntoTheReference) {
  const TemporaryFolder folder;
  const Place place{kPlace.left + 60, kPlace.top - 30, 1};
  const auto land = [](double x, double y, int band) { return 1000 + 300 * GroundAt(x, y, band); };
  Write(Paint(kWidth, kHeight, 2, GDT_Float32, kPlace, land), folder / "ref.tif", {},
        PutAt(kPlace));
  const Image input = Paint(kWidth, kHeight, 2, GDT_Float32, place, [&](double x, double y, int b) {
    const double east = (x - place.left) / kWidth;
    const double south = (place.top - y) / kHeight;
    return land(x, y, b) * (0.8 + 0.3 * east) + 200 * south - 100;
  });
  Write(input, folder / "in.tif", {}, PutAt(place));
  const Outcome outcome = RunProgram({"fit-dodging", folder / "ref.tif", folder / "in.tif", "-o",
                                      folder / "out.json", "--damping", "0.001"});
  ASSERT_EQ(outcome.status, 0) << outcome.err;
  const nlohmann::json parameters = ReadJson(folder / "out.json");
  EXPECT_EQ(parameters.at("type"), 2);
  const Image gains = Read(folder / parameters.at("gainSurface").get<std::string>());
  const Image offsets = Read(folder / parameters.at("offsetSurface").get<std::string>());
  const OpenDataset file = OpenImage(folder / "out.gain.tif");
  std::array<double, 6> transform{};
  ASSERT_EQ(file->GetGeoTransform(transform.data()), CE_None);
  // At its nodes, as far as they lie in the common part, a surface needs no interpolation.
  int nodes = 0;
  for (int row = 0; row < gains.height; ++row) {
    for (int column = 0; column < gains.width; ++column) {
      const double x = transform[0] + (column + 0.5) * transform[1];
      const double y = transform[3] + (row + 0.5) * transform[5];
      const bool common = x < kPlace.left + kWidth - 50 && y > kPlace.top - kHeight + 50;
      if (!common) continue;
      ++nodes;
      for (int band = 0; band < 2; ++band) {
        const auto index = static_cast<std::size_t>(band);
        const double d0 = parameters.at("channels").at(index).at("d0");
        const double east = (x - place.left) / kWidth;
        const double south = (place.top - y) / kHeight;
        for (const double level : {800.0, 1200.0}) {
          const double seen = level * (0.8 + 0.3 * east) + 200 * south - 100;
          const double balanced =
              (seen - d0) * gains.At(column, row, band) + d0 + offsets.At(column, row, band);
          EXPECT_NEAR(balanced, level, 40) << "node " << column << ", " << row;
        }
      }
    }
  }
  EXPECT_GT(nodes, 20);
}

}  // namespace
}  // namespace zarn::testsupport
