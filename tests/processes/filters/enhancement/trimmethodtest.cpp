// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdint>
#include <utility>
#include <vector>

#include "processes/filters/enhancement/trimmethod.h"

namespace zarn::processes::filters {
namespace {

using Range = std::pair<int, int>;

struct Trimming {
  std::vector<std::uint64_t> histogram;
  double left;
  double right;
  bool ignoreFirst = false;
  bool ignoreLast = false;
  std::int64_t total = -1;
};

Range Trim(TrimMethod method, const Trimming& t) {
  const TrimMethodPtr trim(CreateTrimMethod(method));
  EXPECT_EQ(trim->GetMethod(), static_cast<int>(method));
  Range range{-77, -77};
  trim->Trim(t.histogram.data(), t.left, t.right, static_cast<unsigned>(t.histogram.size()),
             t.ignoreFirst, t.ignoreLast, t.total, range.first, range.second);
  return range;
}

TEST(TrimMethod, TextsInAnyCaseAndNothingElse) {
  for (const char* const text : {"Percentage", "PERCENTAGE", "percentage", "perCENTage"}) {
    EXPECT_EQ(StringToTrimMethod(text), TrimMethod::kPercentage) << text;
  }
  EXPECT_EQ(StringToTrimMethod("mean AND n sigma"), TrimMethod::kMeanNSigma);
  for (const char* const text : {"", " percentage", "percentage ", "mean  and n sigma", "\xE9"}) {
    EXPECT_EQ(StringToTrimMethod(text), TrimMethod::kUnknown) << text;
  }
  for (const int value : {0, 1}) {
    const auto method = static_cast<TrimMethod>(value);
    EXPECT_EQ(StringToTrimMethod(TrimMethodToString(method)), method);
  }
  for (const int value : {2, 7, -1}) {
    EXPECT_EQ(TrimMethodToString(static_cast<TrimMethod>(value)), "Unknown");
    EXPECT_EQ(CreateTrimMethod(static_cast<TrimMethod>(value)), nullptr);
  }
}

TEST(TrimMethod, PercentageCutsShares) {
  constexpr auto kMethod = TrimMethod::kPercentage;
  const std::vector<std::uint64_t> steps = {10, 10, 1, 400, 500, 59, 11, 9};
  // 1000 pixels: 20.5 are passed by the first three bins, and by the last two less than all three.
  EXPECT_EQ(Trim(kMethod, {steps, 0.02, 0.02}), Range(2, 5));
  EXPECT_EQ(Trim(kMethod, {steps, 0.02, 0.0}), Range(2, 7));
  EXPECT_EQ(Trim(kMethod, {steps, 0.0, 0.0}), Range(0, 7));
  EXPECT_EQ(Trim(kMethod, {steps, 0.0, 0.0, true, true}), Range(1, 6));
  // The sum without the ends is 981; given ones are taken as they are.
  EXPECT_EQ(Trim(kMethod, {steps, 0.011, 0.011, true, true}), Range(3, 5));
  EXPECT_EQ(Trim(kMethod, {steps, 0.02, 0.02, false, false, 100}), Range(0, 7));
  EXPECT_EQ(Trim(kMethod, {steps, 0.02, 0.02, false, false, 10000}), Range(3, 4));
  // Off either end, and past the ignored last bin.
  EXPECT_EQ(Trim(kMethod, {steps, 2.0, 2.0}), Range(8, -1));
  EXPECT_EQ(Trim(kMethod, {{0, 0, 0, 5}, 0.1, 0.1, false, true, 5}), Range(3, -1));
  EXPECT_EQ(Trim(kMethod, {{}, 0.1, 0.1}), Range(0, -1));
  // Counts above 2^63 are not negative.
  EXPECT_EQ(Trim(kMethod, {{1, std::uint64_t{1} << 63, 1}, 0.1, 0.1}), Range(1, 1));
}

TEST(TrimMethod, MeanAndSigmaInWholeLevels) {
  constexpr auto kMethod = TrimMethod::kMeanNSigma;
  std::vector<std::uint64_t> histogram(256);
  EXPECT_EQ(Trim(kMethod, {histogram, 2, 2, true, true}), Range(1, 254)) << "no pixels";
  histogram[90] = 17;
  EXPECT_EQ(Trim(kMethod, {histogram, 3, 3}), Range(90, 90));
  // 80 and 101: mean 90.5 counts as 90, the variance 8320 - 8100 = 220 as a deviation of 14.
  histogram.assign(256, 0);
  histogram[80] = histogram[101] = 5;
  EXPECT_EQ(Trim(kMethod, {histogram, 1.5, 2.5}), Range(69, 125));
  histogram[0] = 1000;
  histogram[255] = 1000;
  EXPECT_EQ(Trim(kMethod, {histogram, 1.5, 2.5, true, true, 3}), Range(69, 125));
  EXPECT_EQ(Trim(kMethod, {histogram, 9, 9, true, true}), Range(0, 216));
  EXPECT_EQ(Trim(kMethod, {histogram, 99, 99, true, true}), Range(0, 255));
  // The square of 65535 needs all 32 bits.
  std::vector<std::uint64_t> words(65536);
  words[65535] = 1;
  words[65533] = 1;
  EXPECT_EQ(Trim(kMethod, {words, 1, 1}), Range(65533, 65535));
}

}  // namespace
}  // namespace zarn::processes::filters
