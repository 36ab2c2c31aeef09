// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <hwy/targets.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "processes/filters/framework/nodata.h"
#include "processes/filters/framework/samplerows_simd.h"
#include "tests/support/randomnumbers.h"

// The vector loops of every target of this CPU against plain ones.

namespace zarn::processes::filters {
namespace {

// More than twice the lanes of the widest vector, and than the rows that narrowing works on.
constexpr std::size_t kMost = 270;
constexpr std::size_t kPitch = kMost + kSampleRowPadding;

class SampleRows : public ::testing::TestWithParam<std::int64_t> {
 protected:
  void SetUp() override { Choose(GetParam()); }
  void TearDown() override { Choose(0); }

  template <typename T>
  void CompareType() {
    for (std::size_t count = 1; count <= kMost; count += count < 131 ? 1 : 7) {
      const std::size_t channels = 1 + count % 5;
      ASSERT_NO_FATAL_FAILURE(CompareReplacement<T>(count, channels));
      ASSERT_NO_FATAL_FAILURE(CompareFlags<T>(count, channels));
      ASSERT_NO_FATAL_FAILURE(CompareConversion<T>(count, channels));
    }
  }

  testsupport::RandomNumbers random_{3};

 private:
  static void Choose(std::int64_t target) {
    hwy::SetSupportedTargetsForTest(target);
    hwy::GetChosenTarget().DeInit();
  }

  template <typename T>
  std::vector<T> Samples(std::size_t count) {
    std::vector<T> samples(count);
    for (T& sample : samples) {
      sample = static_cast<T>(static_cast<double>(random_.Below(3)));
      if (random_.Percent(20)) sample = std::numeric_limits<T>::max();
      if (random_.Percent(20)) sample = std::numeric_limits<T>::lowest();
    }
    return samples;
  }

  // Pixels and masks have no element past the run: sanitizers see accesses, the sentinel writes.
  template <typename T>
  void CompareReplacement(std::size_t count, std::size_t channels) {
    const std::vector<T> pixels = Samples<T>(count * channels);
    std::vector<std::uint8_t> flags(kPitch, 255);
    for (std::size_t i = 0; i < count; ++i) flags[i] = random_.Percent(40) ? 255 : 0;
    const std::vector<T> value = Samples<T>(channels);
    std::vector<T> replaced = pixels;
    replaced.push_back(T{42});
    ReplaceExcluded(flags.data(), value.data(), count, channels, replaced.data());
    for (std::size_t i = 0; i < count * channels; ++i) {
      ASSERT_EQ(replaced[i], flags[i / channels] != 0 ? value[i % channels] : pixels[i]) << count;
    }
    ASSERT_EQ(replaced.back(), T{42});
  }

  template <typename T>
  void CompareFlags(std::size_t count, std::size_t channels) {
    // Around the tolerance, also where a float's difference is not exact.
    const T special = random_.Pick<T>({T{0}, T{1}, T{90}, static_cast<T>(1.7e-16)});
    const std::vector<T> noData(channels, special);
    for (const bool rare : {false, true}) {
      std::vector<T> pixels(count * channels);
      std::vector<std::uint8_t> mask(count);
      for (std::uint8_t& byte : mask) byte = random_.Percent(rare ? 0 : 30) ? 0 : 7;
      for (T& sample : pixels) {
        sample = rare || random_.Percent(30) ? T{3} : special;
        if (std::is_floating_point_v<T> && !rare && random_.Percent(30)) {
          sample += static_cast<T>(random_.Pick<double>({1e-16, -2.1e-16, 2.23e-16, -4e-16}));
        }
      }
      for (const bool masked : {false, true}) {
        std::vector<std::uint8_t> flags(kPitch, 9);
        const bool any = FlagExcluded(pixels.data(), count, channels, noData.data(),
                                      masked ? mask.data() : nullptr, flags.data());
        bool expectedAny = false;
        for (std::size_t i = 0; i < count; ++i) {
          const bool expected =
              (masked && mask[i] == 0) ||
              PixelNearlyEquals(pixels.data() + i * channels, noData.data(), channels);
          ASSERT_EQ(flags[i] != 0, expected) << count << ", pixel " << i;
          expectedAny = expectedAny || expected;
        }
        ASSERT_EQ(any, expectedAny) << count;
        if (masked || channels > 1) continue;
        // It may find some that are only near, but never misses one.
        const bool near = AnySampleNear(pixels.data(), count, special);
        ASSERT_TRUE(near || !expectedAny) << count;
        ASSERT_FALSE(near && rare) << count;
      }
    }
  }

  template <typename T>
  void CompareConversion(std::size_t count, std::size_t channels) {
    using Limits = std::numeric_limits<T>;
    std::vector<T> samples = Samples<T>(count * channels);
    std::vector<double> values(kPitch * channels);
    WidenPixels(samples.data(), count, channels, samples.data(), values.data(), kPitch);
    for (std::size_t i = 0; i < count * channels; ++i) {
      ASSERT_EQ(values[i % channels * kPitch + i / channels], static_cast<double>(samples[i]));
    }
    const auto low = static_cast<double>(Limits::lowest());
    const auto high = static_cast<double>(Limits::max());
    const double infinity = std::numeric_limits<double>::infinity();
    for (double& value : values) {
      value =
          random_.Pick<double>({-0.5,       0.5,        1.5,
                                2.5,        1.49999999, 6.999995,
                                7.00002,    7.0,        low,
                                low - 0.5,  low - 1e9,  low + 0.5,
                                high,       high - 0.5, high + 0.5,
                                high + 1e9, infinity,   -infinity,
                                -0.0,       1e300,      std::numeric_limits<double>::quiet_NaN(),
                                99.5,       100.5});
    }
    const std::vector<OutputConverter<T>> all = {
        OutputConverter<T>(low, high), OutputConverter<T>(low, high, 7),
        OutputConverter<T>(1, 7, 7),   OutputConverter<T>(0, 100, 100),
        OutputConverter<T>(2, 90, 50), OutputConverter<T>(low, high, high)};
    for (std::size_t first = 0; first < all.size(); ++first) {
      std::vector<OutputConverter<T>> converters;
      for (std::size_t c = 0; c < channels; ++c)
        converters.push_back(all[(first + c) % all.size()]);
      const std::vector<ConverterConstants<T>> constants(converters.begin(), converters.end());
      samples.assign(count * channels + 1, T{42});
      NarrowPixels(values.data(), kPitch, count, channels, constants.data(), samples.data(),
                   samples.data());
      ASSERT_EQ(samples.back(), T{42});
      for (std::size_t i = 0; i < count * channels; ++i) {
        const double value = values[i % channels * kPitch + i / channels];
        const T expected = converters[i % channels](value);
        if (expected != expected && samples[i] != samples[i]) continue;
        ASSERT_EQ(samples[i], expected) << value << " of " << count;
        ASSERT_EQ(std::signbit(static_cast<double>(samples[i])),
                  std::signbit(static_cast<double>(expected)));
      }
    }
  }
};

TEST_P(SampleRows, EqualPlainLoops) {
  CompareType<std::uint8_t>();
  CompareType<std::int8_t>();
  CompareType<std::uint16_t>();
  CompareType<std::int16_t>();
  CompareType<std::uint32_t>();
  CompareType<std::int32_t>();
  CompareType<float>();
  CompareType<double>();
}

TEST_P(SampleRows, LookUpEveryByte) {
  std::vector<ByteTable> tables(5);
  for (ByteTable& table : tables) {
    for (std::uint8_t& entry : table) entry = static_cast<std::uint8_t>(random_.Below(256));
  }
  for (std::size_t count = 1; count <= 300; ++count) {
    const std::size_t channels = 1 + count % 5;
    std::vector<std::uint8_t> bytes(count * channels);
    for (std::size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<std::uint8_t>(i * 7);
    LookUpBytes(bytes.data(), count, channels, tables.data(), bytes.data());
    for (std::size_t i = 0; i < count * channels; ++i) {
      ASSERT_EQ(bytes[i], tables[i % channels][static_cast<std::uint8_t>(i * 7)]);
    }
  }
}

INSTANTIATE_TEST_SUITE_P(AllOfThisCPU, SampleRows,
                         ::testing::ValuesIn(hwy::SupportedAndGeneratedTargets()),
                         [](const auto& target) {
                           return std::string(hwy::TargetName(target.param));
                         });

}  // namespace
}  // namespace zarn::processes::filters
