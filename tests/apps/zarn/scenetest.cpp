// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <omp.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "apps/zarn/scene.h"
#include "host/sys/openmp.h"
#include "processes/filters/framework/parallel.h"

namespace zarn::app {
namespace {

constexpr std::uint32_t kSeed = 3;
constexpr Window kEverything{0, 0, Landscape::kWidth, Landscape::kHeight};

struct Sample {
  Land land = RenderLand(Landscape(kSeed), kEverything);
  Picture truth = RenderTruth(land);
  std::array<Scene, 2> scenes = MakeScenes(kSeed);
  std::array<Picture, 2> pictures{RenderScene(scenes[0], land, scenes[0].Extent()),
                                  RenderScene(scenes[1], land, scenes[1].Extent())};
};

std::size_t SampleAt(const Window& window, std::int64_t column, std::int64_t row) {
  return static_cast<std::size_t>(((row - window.y) * window.width + column - window.x) * 3);
}

template <typename Visit>
void ForEachPixel(const Window& window, const Visit& visit) {
  for (std::int64_t row = window.y; row < window.y + window.height; ++row) {
    for (std::int64_t column = window.x; column < window.x + window.width; ++column) {
      visit(column, row);
    }
  }
}

std::uint64_t Checksum(const Picture& picture) {
  std::uint64_t sum = 0;
  for (const std::uint8_t sample : picture.bytes) sum = sum * 1000003u + sample;
  for (const std::uint16_t sample : picture.words) sum = sum * 1000003u + sample;
  return sum;
}

// Sets the threads of the following regions and makes sure that they are really given.
void SetThreads(int threads) {
  omp_set_dynamic(0);
  omp_set_num_threads(threads);
  std::vector<int> given(64);
  processes::filters::parallel::ForEachRowBand(
      64, 64, [&](std::ptrdiff_t band, std::ptrdiff_t, std::ptrdiff_t) {
        given[static_cast<std::size_t>(band)] = sys::OMPGetNumThreads();
      });
  ASSERT_EQ(given.front(), threads);
}

TEST(Scene, HasTheSameBitsForAnyThreadsAndWindows) {
  // Village, road, river, wood and the upper edge of the second scene.
  const Window window{1010, 60, 301, 97};
  const Scene scene = MakeScenes(kSeed)[1];
  const auto render = [&](const Window& part, int threads) {
    SetThreads(threads);
    return RenderScene(scene, RenderLand(Landscape(kSeed), part), part);
  };
  const int before = sys::OMPGetMaxThreads();
  const Picture serial = render(window, 1);
  // Other numbers on another machine or compiler break the promise of `zarn sample --seed`.
  EXPECT_EQ(Checksum(serial), 460043043749853824u);
  EXPECT_EQ(Checksum(render(window, 2)), Checksum(serial));

  const Window piece{1100, 75, 45, 33};
  const Picture part = render(piece, 2);
  ForEachPixel(piece, [&](std::int64_t column, std::int64_t row) {
    for (std::size_t channel = 0; channel < 3; ++channel) {
      ASSERT_EQ(part.words[SampleAt(piece, column, row) + channel],
                serial.words[SampleAt(window, column, row) + channel]);
    }
  });
  SetThreads(before);
}

void ExpectOnlyNoDataIsZero(const Sample& sample) {
  for (std::size_t i = 0; i < 2; ++i) {
    const Picture& picture = sample.pictures[i];
    ForEachPixel(picture.window, [&](std::int64_t column, std::int64_t row) {
      const bool valid = sample.scenes[i].IsValid(column, row);
      const std::size_t at = SampleAt(picture.window, column, row);
      for (std::size_t channel = 0; channel < 3; ++channel) {
        ASSERT_EQ(picture.bytes[at + channel] != 0, valid) << column << ' ' << row;
        ASSERT_EQ(picture.words[at + channel] != 0, valid) << column << ' ' << row;
      }
    });
  }
}

// Written out as sample.json states it.
double HotSpotShare(const HotSpot& spot, Vec p) {
  const double x = (p.x - spot.centre.x) / spot.radii.x;
  const double y = (p.y - spot.centre.y) / spot.radii.y;
  return 1.0 - (x * x + y * y);
}

void ExpectTruthBackWhenTheDisturbanceIsUndone(const Sample& sample) {
  for (std::size_t i = 0; i < 2; ++i) {
    const Scene& scene = sample.scenes[i];
    const Radiometry& radiometry = scene.Radiometry();
    const Picture& picture = sample.pictures[i];
    double squares = 0.0;
    double samples = 0.0;
    ForEachPixel(picture.window, [&](std::int64_t column, std::int64_t row) {
      if (!scene.IsValid(column, row) || scene.IsSpeck(column, row)) return;
      const Vec centre{static_cast<double>(column) + 0.5, static_cast<double>(row) + 0.5};
      const double share = HotSpotShare(radiometry.hotSpot, centre);
      const std::size_t at = SampleAt(picture.window, column, row);
      const std::size_t trueAt = SampleAt(kEverything, column, row);
      for (std::size_t channel = 0; channel < 3; ++channel) {
        const double gain = radiometry.gain[channel];
        const double added =
            radiometry.offset[channel] + share * radiometry.hotSpot.strength[channel];
        // The noise, and half a step of rounding in either picture.
        const double byteError =
            (picture.bytes[at + channel] - added) / gain - sample.truth.bytes[trueAt + channel];
        ASSERT_LE(std::abs(byteError), (scene.LargestNoise() + 0.5) / gain + 0.5)
            << column << ' ' << row;
        const double wordError = (picture.words[at + channel] / kWordScale - added) / gain -
                                 sample.truth.words[trueAt + channel] / kWordScale;
        ASSERT_LE(std::abs(wordError),
                  (scene.LargestNoise() + 0.5 / kWordScale) / gain + 0.5 / kWordScale)
            << column << ' ' << row;
        squares += wordError * gain * wordError * gain;
        samples += 1.0;
      }
    });
    EXPECT_NEAR(std::sqrt(squares / samples), radiometry.noise, 0.02 * radiometry.noise);
  }
}

// The least deviation from the mean within the blocks of 7 x 7 pixels.
double LeastDeviation(const Picture& picture, std::size_t channel) {
  constexpr std::int64_t kSide = 7;
  double least = 1e9;
  for (std::int64_t top = 0; top + kSide <= picture.window.height; top += kSide) {
    for (std::int64_t left = 0; left + kSide <= picture.window.width; left += kSide) {
      double sum = 0.0;
      double squares = 0.0;
      ForEachPixel({left, top, kSide, kSide}, [&](std::int64_t column, std::int64_t row) {
        const double value = picture.bytes[SampleAt(picture.window, column, row) + channel];
        sum += value;
        squares += value * value;
      });
      constexpr double kCount = kSide * kSide;
      least = std::min(least, std::sqrt(squares / kCount - sum * sum / kCount / kCount));
    }
  }
  return least;
}

void ExpectNowhereFlat(const Sample& sample) {
  for (std::size_t channel = 0; channel < 3; ++channel) {
    const double least = LeastDeviation(sample.truth, channel);
    testing::Test::RecordProperty("least" + std::to_string(channel), std::to_string(least));
    EXPECT_GT(least, sample.scenes[1].Radiometry().noise);
  }
}

// One test, because rendering takes longer than looking at every pixel.
TEST(Scene, EveryPixelIsAsPromised) {
  const Sample sample;
  ExpectNowhereFlat(sample);
  ExpectOnlyNoDataIsZero(sample);
  ExpectTruthBackWhenTheDisturbanceIsUndone(sample);
}

TEST(Cutline, SeamRunsWellInsideBothFrames) {
  const std::array<Scene, 2> scenes = MakeScenes(kSeed);
  std::size_t seamLength = 0;
  const std::vector<Vec> ring = MakeCutline(kSeed, scenes, &seamLength);
  ASSERT_GT(seamLength, 10u);

  // To both sides of every point of the seam, wherever the second scene has pixels.
  std::int64_t checked = 0;
  double left = 1e9;
  double right = 0.0;
  for (std::size_t i = 0; i + 1 < seamLength; ++i) {
    for (double t = 0.0; t < 1.0; t += 0.02) {
      const Vec p = ring[i] + t * (ring[i + 1] - ring[i]);
      left = std::min(left, p.x);
      right = std::max(right, p.x);
      const auto column = static_cast<std::int64_t>(p.x);
      const auto row = static_cast<std::int64_t>(p.y);
      if (!scenes[1].IsValid(column, row)) continue;
      ++checked;
      for (const std::int64_t side : {-60, 0, 60}) {
        ASSERT_TRUE(scenes[0].IsValid(column + side, row)) << p.x << ' ' << p.y;
      }
    }
  }
  EXPECT_GT(checked, 1000);
  EXPECT_GT(right - left, 60.0) << "the seam is straight";
}

}  // namespace
}  // namespace zarn::app
