// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <hwy/targets.h>

#include <algorithm>
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

// Around twice the lanes of the widest vector, and some more.
constexpr std::size_t kMost = 131;
constexpr std::size_t kPitch = kMost + kSampleRowPadding;

class SampleRows : public ::testing::TestWithParam<std::int64_t> {
 protected:
  void SetUp() override { Choose(GetParam()); }
  void TearDown() override { Choose(0); }

  template <typename T>
  void CompareType() {
    for (std::size_t count = 1; count <= kMost; ++count) {
      const std::size_t channels = 1 + count % 5;
      ASSERT_NO_FATAL_FAILURE(CompareLayout<T>(count, channels));
      ASSERT_NO_FATAL_FAILURE(CompareFlags<T>(count, channels));
      ASSERT_NO_FATAL_FAILURE(CompareConversion<T>(count));
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

  template <typename T>
  void CompareLayout(std::size_t count, std::size_t channels) {
    const std::vector<T> pixels = Samples<T>((count + kSampleRowPadding) * channels);
    std::vector<T> planes(kPitch * channels);
    SplitChannels(pixels.data(), count, channels, planes.data(), kPitch);
    for (std::size_t i = 0; i < count * channels; ++i) {
      ASSERT_EQ(planes[i % channels * kPitch + i / channels], pixels[i]) << count;
    }
    std::vector<std::uint8_t> flags(kPitch);
    for (std::uint8_t& flag : flags) flag = random_.Percent(40) ? 255 : 0;
    const std::vector<T> value = Samples<T>(channels);
    const std::vector<T> old = Samples<T>((count + kSampleRowPadding) * channels);
    for (const ExcludedPixels<T>& excluded : {ExcludedPixels<T>{},
                                              {flags.data(), value.data(), nullptr},
                                              {flags.data(), nullptr, old.data()}}) {
      std::vector<T> replaced = pixels;
      if (excluded.flags != nullptr) {
        ReplaceExcluded(excluded, count, channels, replaced.data());
      }
      std::vector<T> joined(kPitch * channels);
      JoinChannels(planes.data(), kPitch, count, channels, excluded, joined.data());
      for (std::size_t i = 0; i < count * channels; ++i) {
        const bool isExcluded = excluded.flags != nullptr && flags[i / channels] != 0;
        const T other = excluded.value != nullptr ? value[i % channels] : old[i];
        ASSERT_EQ(joined[i], isExcluded ? other : pixels[i]) << count;
        ASSERT_EQ(replaced[i], isExcluded ? other : pixels[i]) << count;
      }
    }
  }

  template <typename T>
  void CompareFlags(std::size_t count, std::size_t channels) {
    // What lies past the run equals the no-data value and is masked, but does not count.
    std::vector<T> planes(kPitch * channels);
    std::vector<std::uint8_t> mask(kPitch);
    const std::vector<T> noData(channels, T{0});
    for (const bool rare : {false, true}) {
      for (std::size_t i = 0; i < count; ++i) {
        mask[i] = random_.Percent(rare ? 0 : 30) ? 0 : 7;
        for (std::size_t c = 0; c < channels; ++c) {
          planes[c * kPitch + i] = static_cast<T>(rare || random_.Percent(50) ? 3 : 0);
          if constexpr (std::is_floating_point_v<T>) {
            if (random_.Percent(20)) planes[c * kPitch + i] = T(1e-16);
            if (random_.Percent(20)) planes[c * kPitch + i] = T(3e-16);
          }
        }
      }
      for (const bool masked : {false, true}) {
        std::vector<std::uint8_t> flags(kPitch, 9);
        const bool any = FlagExcluded(planes.data(), kPitch, count, channels, noData.data(),
                                      masked ? mask.data() : nullptr, flags.data());
        bool expectedAny = false;
        for (std::size_t i = 0; i < count; ++i) {
          std::vector<T> pixel;
          for (std::size_t c = 0; c < channels; ++c) pixel.push_back(planes[c * kPitch + i]);
          const bool expected =
              (masked && mask[i] == 0) || PixelNearlyEquals(pixel.data(), noData.data(), channels);
          ASSERT_EQ(flags[i] != 0, expected) << count << ", pixel " << i;
          expectedAny = expectedAny || expected;
        }
        ASSERT_EQ(any, expectedAny) << count;
        if (masked || channels > 1) continue;
        // It may find some that are only near, but never misses one.
        const bool near = AnySampleNear(planes.data(), count, T{0});
        ASSERT_TRUE(near || !expectedAny) << count;
        ASSERT_FALSE(near && rare && !std::is_floating_point_v<T>) << count;
      }
    }
  }

  template <typename T>
  void CompareConversion(std::size_t count) {
    using Limits = std::numeric_limits<T>;
    std::vector<T> samples = Samples<T>(count + kSampleRowPadding);
    std::vector<double> values(kPitch);
    WidenSamples(samples.data(), count, values.data());
    for (std::size_t i = 0; i < count; ++i) {
      ASSERT_EQ(values[i], static_cast<double>(samples[i]));
    }
    const auto low = static_cast<double>(Limits::lowest());
    const auto high = static_cast<double>(Limits::max());
    const double infinity = std::numeric_limits<double>::infinity();
    for (std::size_t i = 0; i < count; ++i) {
      values[i] =
          random_.Pick<double>({-0.5,       0.5,        1.5,
                                2.5,        1.49999999, 6.999995,
                                7.00002,    7.0,        low,
                                low - 0.5,  low - 1e9,  low + 0.5,
                                high,       high - 0.5, high + 0.5,
                                high + 1e9, infinity,   -infinity,
                                -0.0,       1e300,      std::numeric_limits<double>::quiet_NaN(),
                                99.5,       100.5});
    }
    for (const OutputConverter<T>& converter :
         {OutputConverter<T>(low, high), OutputConverter<T>(low, high, 7),
          OutputConverter<T>(1, 7, 7), OutputConverter<T>(0, 100, 100),
          OutputConverter<T>(2, 90, 50), OutputConverter<T>(low, high, high)}) {
      NarrowSamples(values.data(), count, converter, samples.data());
      for (std::size_t i = 0; i < count; ++i) {
        const T expected = converter(values[i]);
        if (expected != expected && samples[i] != samples[i]) continue;
        ASSERT_EQ(samples[i], expected) << values[i] << " of " << count;
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
    std::vector<std::uint8_t> bytes((count + kSampleRowPadding) * channels);
    for (std::size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<std::uint8_t>(i * 7);
    LookUpBytes(bytes.data(), count, channels, tables.data(), bytes.data());
    for (std::size_t i = 0; i < count * channels; ++i) {
      ASSERT_EQ(bytes[i], tables[i % channels][static_cast<std::uint8_t>(i * 7)]);
    }
  }
}

TEST_P(SampleRows, StreamAnyPlaceAndSize) {
  std::vector<std::byte> from(400);
  for (std::size_t i = 0; i < from.size(); ++i) from[i] = static_cast<std::byte>(i % 251);
  for (std::size_t shift = 0; shift < 65; shift += 3) {
    for (const std::size_t size : {0U, 1U, 63U, 64U, 65U, 128U, 300U}) {
      std::vector<std::byte> to(500);
      StreamBytes(from.data(), size, to.data() + shift);
      FinishStreaming();
      ASSERT_TRUE(std::equal(from.begin(), from.begin() + static_cast<std::ptrdiff_t>(size),
                             to.begin() + static_cast<std::ptrdiff_t>(shift)));
      ASSERT_EQ(to[shift + size], std::byte{0});
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
