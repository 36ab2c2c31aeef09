// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <atomic>
#include <cmath>
#include <cstdint>
#include <limits>
#include <stdexcept>
#include <string>
#include <vector>

#include "host/core/exception.h"
#include "host/utils/affinepostfm.h"
#include "host/utils/resample.h"
#include "tests/support/randomnumbers.h"
#include "tests/support/resamplereference.h"
#include "tests/support/tabletransform.h"
#include "tests/support/testblock.h"
#if ZARN_SIMD
#include <hwy/targets.h>
#endif

namespace zarn::utils {
namespace {

using testsupport::Picture;
using testsupport::Position;
using testsupport::RandomNumbers;
using testsupport::TableTransform;
using enum ResampleMethod;
using Code = gobs::NativeDataTypeCode;

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr ResampleMethod kMethods[] = {kNearest, kBilinear, kCubic};

template <typename T>
constexpr Code CodeFor() {
  if constexpr (std::is_same_v<T, std::int64_t>) return Code::kInt64;
  if constexpr (std::is_same_v<T, std::uint64_t>) return Code::kUInt64;
  return testsupport::CodeFor<T>();
}

template <typename T>
unsigned char* Bytes(const std::vector<T>& samples) {
  return const_cast<unsigned char*>(reinterpret_cast<const unsigned char*>(samples.data()));
}

template <typename T>
ResampleBuffer Wrap(const Picture<T>& image, Code code = CodeFor<T>(), int channels = 0) {
  return {code,
          static_cast<int>(image.width),
          static_cast<int>(image.height),
          channels > 0 ? channels : static_cast<int>(image.channels),
          Bytes(image.samples),
          image.mask.empty() ? nullptr : Bytes(image.mask),
          false};
}

template <typename T>
Picture<T> Resampled(const Picture<T>& source, IBufPosTfm& transform, int width, int height,
                     const ResampleInfo& info, T before) {
  Picture<T> result{width, height, source.channels};
  result.samples.assign(result.Pixels() * static_cast<std::size_t>(source.channels), before);
  result.mask.assign(result.Pixels(), 77);
  ResampleBuffer destination = Wrap(result);
  Resample(Wrap(source), destination, &transform, info);
  return result;
}

// Values of the whole range and, where asked for, such that are not numbers.
template <typename T>
Picture<T> Noise(RandomNumbers& random, int width, int height, int channels, bool special) {
  Picture<T> image{width, height, channels};
  image.samples.resize(image.Pixels() * static_cast<std::size_t>(channels));
  for (T& sample : image.samples) {
    sample = static_cast<T>(random.Next());
    if constexpr (std::is_floating_point_v<T>) {
      sample = static_cast<T>(random.Fraction() * 100);
      if (special && random.Percent(3)) {
        sample = random.Pick<T>({static_cast<T>(kNaN), std::numeric_limits<T>::infinity(),
                                 std::numeric_limits<T>::max(), static_cast<T>(-0.0)});
      }
    } else {
      if (random.Percent(10)) sample = std::numeric_limits<T>::max();
      if (random.Percent(10)) sample = std::numeric_limits<T>::min();
    }
  }
  return image;
}

template <typename T>
void Mask(RandomNumbers& random, Picture<T>& image) {
  image.mask.assign(image.Pixels(), 255);
  for (std::size_t i = 0; i < image.mask.size(); ++i) {
    if (random.Percent(4) || i / 40 % 7 == 0) image.mask[i] = 0;
  }
}

// Smooth runs, broken by more or fewer positions on the edge, on centres, between columns, outside
// and nowhere.
std::vector<Position> Positions(RandomNumbers& random, int count, double width, double height) {
  std::vector<Position> positions;
  const double step = 0.4 + 0.8 * random.Fraction();
  const double slope = random.Fraction() * 0.2;
  const int wild = random.Pick<std::uint32_t>({0, 1, 12});
  for (int i = 0; i < count; ++i) {
    Position at{i * step + slope, height / 2 + slope * i + 0.3 * random.Fraction()};
    if (random.Percent(wild))
      at = {(random.Fraction() + 1) / 2 * width, random.Fraction() * height};
    if (random.Percent(wild)) at.x = std::floor(at.x) + 0.5;
    if (random.Percent(wild)) at.y = std::floor(at.y) + 0.5;
    if (random.Percent(wild)) {
      at.x = random.Pick<double>({-1e-9, 0, 0.25, width - 0.5, width, 1e300});
    }
    if (random.Percent(wild)) {
      at.y = random.Pick<double>({-0.5, 0, 1.5, height - 1e-9, kNaN, -1e300});
    }
    positions.push_back(at);
  }
  return positions;
}

#if ZARN_SIMD
std::vector<std::int64_t> Targets() { return hwy::SupportedAndGeneratedTargets(); }
void Choose(std::int64_t target) {
  hwy::SetSupportedTargetsForTest(target);
  hwy::GetChosenTarget().DeInit();
}
#else
std::vector<std::int64_t> Targets() { return {0}; }
void Choose(std::int64_t) {}
#endif

template <typename T>
class ResampleTypes : public ::testing::Test {
 protected:
  void TearDown() override { Choose(0); }

  void Compare(const Picture<T>& source, int count, const ResampleInfo& info) {
    std::vector<Position> positions = Positions(random_, count, static_cast<double>(source.width),
                                                static_cast<double>(source.height));
    TableTransform transform(count, positions);
    constexpr T kBefore = 99;
    const auto noData = static_cast<T>(info.noData);
    const Picture<T> result = Resampled(source, transform, count, 1, info, kBefore);
    for (int i = 0; i < count; ++i) {
      const Position at = positions[static_cast<std::size_t>(i)];
      const auto expected =
          ReferencePixel(source, info.method, at.x, at.y,
                         info.hasNoData ? std::optional<T>(noData) : std::nullopt);
      ASSERT_EQ(result.mask[static_cast<std::size_t>(i)], expected ? 1 : 0)
          << i << " of " << count << " at " << at.x << ", " << at.y;
      for (int c = 0; c < source.channels; ++c) {
        const T wanted = expected         ? (*expected)[static_cast<std::size_t>(c)]
                         : info.hasNoData ? noData
                                          : kBefore;
        ASSERT_TRUE(testsupport::SameSample(result.At(i, 0, c), wanted))
            << "method " << static_cast<int>(info.method) << ", channel " << c << " of "
            << source.channels << ", pixel " << i << " of " << count << " at " << at.x << ", "
            << at.y << ": " << +result.At(i, 0, c) << " instead of " << +wanted;
      }
    }
  }

  RandomNumbers random_{17};
};

using AllTypes =
    ::testing::Types<std::uint8_t, std::int8_t, std::uint16_t, std::int16_t, std::uint32_t,
                     std::int32_t, float, std::int64_t, std::uint64_t, double>;
TYPED_TEST_SUITE(ResampleTypes, AllTypes, testsupport::TypeNames);

TYPED_TEST(ResampleTypes, FollowTheDefinitionWithAnyVectors) {
  using T = TypeParam;
  for (const std::int64_t target : Targets()) {
    Choose(target);
    for (int count = 1; count <= 150; count += 1 + count / 40) {
      const int channels = 1 + count % 5;
      Picture<T> source =
          Noise<T>(this->random_, 90 + count % 3, 3 + count % 29, channels, count % 4 == 0);
      for (const ResampleMethod method : kMethods) {
        for (const bool masked : {false, true}) {
          source.mask.clear();
          if (masked) Mask(this->random_, source);
          SCOPED_TRACE("target " + std::to_string(target) + (masked ? ", masked" : ""));
          ASSERT_NO_FATAL_FAILURE(this->Compare(
              source, count, {.method = method, .hasNoData = count % 2 == 0, .noData = 7}));
        }
      }
    }
  }
}

TYPED_TEST(ResampleTypes, ReproduceTheSourceUnderTheIdentity) {
  using T = TypeParam;
  Picture<T> source = Noise<T>(this->random_, 150, 9, 3, true);
  AffinePosTfm identity({0, 1, 0, 0, 0, 1});
  for (const ResampleMethod method : kMethods) {
    const Picture<T> result = Resampled(source, identity, 150, 9, {.method = method}, T{1});
    for (std::size_t i = 0; i < source.samples.size(); ++i) {
      ASSERT_TRUE(testsupport::SameSample(result.samples[i], source.samples[i])) << i;
    }
  }
}

// Independent of how the weights are written down: between pixels, bilinear interpolation is exact
// for planes and this cubic convolution for parabolas.
TEST(Resample, ReproducesThePolynomialsOfItsOrder) {
  const auto value = [](double x, double y, ResampleMethod method) {
    const double plane = 3 + 2 * x - 5 * y;
    return method == kCubic ? plane + 0.25 * x * x - 0.5 * y * y + x * y : plane;
  };
  RandomNumbers random(5);
  for (const ResampleMethod method : {kBilinear, kCubic}) {
    Picture<double> source{40, 30, 1};
    for (int y = 0; y < 30; ++y) {
      for (int x = 0; x < 40; ++x) source.samples.push_back(value(x + 0.5, y + 0.5, method));
    }
    std::vector<Position> positions;
    for (int i = 0; i < 500; ++i) {
      positions.push_back({20 + 17 * random.Fraction(), 15 + 12 * random.Fraction()});
    }
    TableTransform transform(500, positions);
    const Picture<double> result = Resampled(source, transform, 500, 1, {.method = method}, 0.0);
    for (std::size_t i = 0; i < 500; ++i) {
      ASSERT_NEAR(result.samples[i], value(positions[i].x, positions[i].y, method), 1e-10);
    }
  }
}

TEST(Resample, RoundsToEvenAndClampsOvershoot) {
  Picture<std::uint8_t> source{4, 1, 1};
  source.samples = {0, 255, 255, 0};
  TableTransform transform(3, {{1.5, 0.5}, {2.0, 0.5}, {1.0, 0.5}});
  // (-0 + 9 * 255 + 9 * 255 - 0) / 16 = 286.9; (9 * 0 + 9 * 255 - 255) / 16 over the weights that
  // exist, 17/16: 127.5 / 1.0625 = 120.
  EXPECT_EQ(Resampled(source, transform, 3, 1, {.method = kCubic}, std::uint8_t{9}).samples,
            (std::vector<std::uint8_t>{255, 255, 120}));
  source.samples = {2, 3, 4, 3};
  TableTransform halves(3, {{1.0, 0.5}, {2.0, 0.5}, {3.0, 0.5}});
  EXPECT_EQ(Resampled(source, halves, 3, 1, {.method = kBilinear}, std::uint8_t{9}).samples,
            (std::vector<std::uint8_t>{2, 4, 4}));
}

TEST(Resample, CoversFromHalfOfTheWeightOn) {
  // Pixels 10 20 / 30 40, of which the masked ones stand in `masked`.
  struct Case {
    std::vector<unsigned char> mask;
    Position at;
    ResampleMethod method;
    int expected;  ///< 0: uncovered
  };
  const Case kCases[] = {
      {{1, 1, 1, 1}, {1, 1}, kBilinear, 25},
      {{0, 1, 1, 1}, {1, 1}, kBilinear, 30},    // (20 + 30 + 40) / 3
      {{0, 1, 0, 1}, {1, 1}, kBilinear, 30},    // exactly half
      {{0, 1, 0, 1}, {0.99, 1}, kBilinear, 0},  // just below
      {{0, 0, 0, 1}, {1, 1}, kBilinear, 0},
      {{0, 0, 0, 1}, {1.5, 1.25}, kBilinear, 40},
      {{0, 1, 1, 1}, {1.5, 1}, kBilinear, 30},      // the masked column has no weight
      {{1, 1, 1, 1}, {0.01, 0.01}, kBilinear, 10},  // nothing is missing beyond the corner
      {{1, 1, 1, 1}, {1.99, 1.99}, kCubic, 44},     // goes on beyond the last centre
      {{1, 0, 1, 0}, {1.99, 0.5}, kCubic, 0},
      {{1, 0, 1, 1}, {0.99, 0.99}, kNearest, 10},
      {{1, 0, 1, 1}, {1, 0.99}, kNearest, 0},
      {{1, 1, 1, 1}, {2, 1}, kNearest, 0},
      {{1, 1, 1, 1}, {-0.001, 1}, kBilinear, 0},
      {{1, 1, 1, 1}, {1, kNaN}, kCubic, 0},
  };
  for (const Case& c : kCases) {
    Picture<std::uint8_t> source{2, 2, 1, {10, 20, 30, 40}, c.mask};
    TableTransform transform(1, {c.at});
    const auto result = Resampled(source, transform, 1, 1, {.method = c.method}, std::uint8_t{99});
    SCOPED_TRACE(testing::Message() << c.at.x << ", " << c.at.y);
    EXPECT_EQ(result.samples[0], c.expected == 0 ? 99 : c.expected);
    EXPECT_EQ(result.mask[0], c.expected == 0 ? 0 : 1);
  }
}

TEST(Resample, KeepsComputedPixelsOffTheNoDataValueAndCopiedOnesAsTheyAre) {
  Picture<std::uint8_t> source{2, 1, 2, {254, 254, 255, 255}};
  source.samples = {254, 10, 255, 255, 255, 255};
  source.width = 3;
  TableTransform transform(3, {{2.25, 0.5}, {1.5, 0.5}, {0.75, 0.5}});
  const ResampleInfo info{.method = kBilinear, .hasNoData = true, .noData = 255};
  // Computed as no-data; copied; equal in one channel only.
  EXPECT_EQ(Resampled(source, transform, 3, 1, info, std::uint8_t{0}).samples,
            (std::vector<std::uint8_t>{254, 254, 255, 255, 254, 71}));
}

TEST(Resample, TakesThePartsOfComplexSamplesEachForItself) {
  RandomNumbers random(3);
  const Picture<std::int16_t> pairs = Noise<std::int16_t>(random, 30, 20, 4, false);
  const std::vector<Position> positions = Positions(random, 64, 30, 20);
  for (const ResampleMethod method : kMethods) {
    TableTransform transform(64, positions);
    const ResampleInfo plain{.method = method};
    const auto expected = Resampled(pairs, transform, 64, 1, plain, std::int16_t{5});
    Picture<std::int16_t> result = expected;
    result.samples.assign(result.samples.size(), 5);
    ResampleBuffer destination = Wrap(result, Code::kComplexInt16, 2);
    Resample(Wrap(pairs, Code::kComplexInt16, 2), destination, &transform, plain);
    EXPECT_EQ(result.samples, expected.samples);

    Resample(Wrap(pairs, Code::kComplexInt16, 2), destination, &transform,
             {.method = method, .hasNoData = true, .noData = -9.5});
    for (std::size_t i = 0; i < 64; ++i) {
      if (expected.mask[i] != 0) continue;
      EXPECT_EQ(result.samples[4 * i + 2], -10);
      EXPECT_EQ(result.samples[4 * i + 3], 0);
    }
  }
}

// Notes who calls it; a row of its own may fail.
class Witness : public IBufPosTfm {
 public:
  explicit Witness(bool concurrent, int badRow = -1) : concurrent_(concurrent), badRow_(badRow) {}
  void Transform(int, int row, int count, double* x, double* y) override {
    if (++inside_ > 1) overlapped_ = true;
    if (row == badRow_) {
      --inside_;
      throw std::runtime_error("row " + std::to_string(row));
    }
    for (int i = 0; i < count; ++i) {
      x[i] = i * 0.9 + 0.1 * std::sin(row + i);
      y[i] = row * 0.9 + 0.3;
    }
    --inside_;
  }
  bool IsConcurrent() const override { return concurrent_; }
  bool Overlapped() const { return overlapped_; }

 private:
  bool concurrent_;
  int badRow_;
  std::atomic<int> inside_ = 0;
  std::atomic<bool> overlapped_ = false;
};

TEST(Resample, CallsATransformFromOneThreadUnlessItStandsMore) {
  RandomNumbers random(3);
  const auto source = Noise<float>(random, 300, 300, 1, false);
  const ResampleInfo info{.method = kCubic};
  Witness alone(false);
  Witness shared(true);
  const auto expected = Resampled(source, alone, 300, 300, info, 0.0F);
  EXPECT_FALSE(alone.Overlapped());
  EXPECT_EQ(Resampled(source, shared, 300, 300, info, 0.0F).samples, expected.samples);
  Witness failing(true, 120);
  EXPECT_THROW(Resampled(source, failing, 300, 300, info, 0.0F), std::runtime_error);
}

TEST(Resample, RefusesWhatItCannotResample) {
  std::vector<unsigned char> memory(64, 1);
  AffinePosTfm identity({0, 1, 0, 0, 0, 1});
  const auto message = [&](Code from, Code to, int channels, unsigned char* data,
                           ResampleMethod method, IBufPosTfm* transform) {
    const ResampleBuffer source(from, 2, 2, 1, data, nullptr, false);
    ResampleBuffer destination(to, 2, 2, channels, memory.data(), nullptr, false);
    try {
      Resample(source, destination, transform, {.method = method});
    } catch (const DataException& failure) {
      return failure.Message();
    }
    return std::string();
  };
  unsigned char* const data = memory.data() + 32;
  EXPECT_EQ(message(Code::kUInt8, Code::kUInt8, 1, data, kNearest, &identity), "");
  EXPECT_NE(message(Code::kUInt8, Code::kInt8, 1, data, kNearest, &identity), "");
  EXPECT_NE(message(Code::kUInt8, Code::kUInt8, 2, data, kNearest, &identity), "");
  EXPECT_NE(message(Code::kUInt8, Code::kUInt8, 1, nullptr, kNearest, &identity), "");
  EXPECT_NE(message(Code::kNone, Code::kNone, 1, data, kNearest, &identity), "");
  EXPECT_NE(message(Code::kUInt8, Code::kUInt8, 1, data, kDirectCopy, &identity), "");
  EXPECT_NE(message(Code::kUInt8, Code::kUInt8, 1, data, kNearest, nullptr), "");
}

}  // namespace
}  // namespace zarn::utils
