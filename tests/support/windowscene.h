// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <sstream>
#include <string>
#include <type_traits>
#include <vector>

#include "tests/support/randomnumbers.h"
#include "tests/support/testblock.h"
#include "tests/support/windowreference.h"

namespace zarn::testsupport {

/// What the samples of a scene look like.
enum class Values {
  kAny,       ///< the whole range of integers; a few thousand around zero for floating types
  kFew,       ///< five neighbouring values, so that many equal a no-data value or tie
  kLowest,    ///< all the type's lowest value
  kHighest,   ///< all its highest
  kExtremes,  ///< the two mixed
  // Floating types:
  kCancelling,  ///< +X, -X and small numbers: what the sum keeps of these depends on its order
  kBorderline,  ///< +X, -X and numbers of 24 digits: some sums just pass 53 bits
  kMagnitudes,  ///< 120 binary orders of magnitude
  kSpecials,    ///< NaN, infinities, zeros of both signs, the largest and the smallest numbers
  kDenormals,
  kInfinite,  ///< nothing but zeros, the largest numbers and infinities
};

/// Where the pixels lie that do not count.
enum class Holes {
  kNone,
  kSpecks,   ///< one in fifty
  kHalf,     ///< every second one, at random
  kMost,     ///< nine in ten
  kRuns,     ///< rows cut into random runs
  kRows,     ///< whole rows
  kColumns,  ///< whole columns
  kAll,      ///< every pixel
  kAllBut,   ///< every pixel but one
  kBorder,   ///< the outermost pixels of the block and the margins around it
  kCollar,   ///< a slanting edge
  kPatches,  ///< rectangles and specks
};

/// What a filter accepts.
struct SceneLimits {
  std::vector<int> kernelSizes = {-1, 0, 1, 2, 3, 3,  3,  3,  4,  5,  5, 5,
                                  6,  7, 7, 8, 9, 11, 13, 15, 16, 17, 31};
  bool tallerInput = true;
  bool needsBackground = false;
};

/// A block with parameters that suit it, drawn from one seed.
template <typename T>
class WindowScene {
 public:
  WindowParameters parameters;
  Shape inputShape;
  Shape outputShape;
  TestBlock<T> input{Shape{}};
  std::vector<std::uint8_t> mask;

  explicit WindowScene(std::uint64_t seed, const SceneLimits& limits = {})
      : random_(seed * 1000003 + sizeof(T)), seed_(seed) {
    ChooseShape(limits);
    ChooseParameters(limits);
    input = TestBlock<T>(inputShape, random_.Below(4));
    values_ = random_.Pick(
        std::is_floating_point_v<T>
            ? std::vector<Values>{Values::kAny, Values::kFew, Values::kCancelling,
                                  Values::kBorderline, Values::kMagnitudes, Values::kSpecials,
                                  Values::kDenormals, Values::kInfinite}
            : std::vector<Values>{Values::kAny, Values::kAny, Values::kFew, Values::kLowest,
                                  Values::kHighest, Values::kExtremes});
    holes_ = static_cast<Holes>(random_.Below(static_cast<std::uint32_t>(Holes::kPatches) + 1));
    FillValues();
    if (random_.Percent(90)) PunchHoles();
    Poison();
  }

  /// An output block with distinct values, to see what stays unwritten.
  TestBlock<T> MakeOutput() const { return TestBlock<T>(outputShape, seed_ % 4); }

  std::string Describe() const {
    std::ostringstream text;
    const auto list = [&](const char* name, const std::vector<double>& values) {
      text << ", " << name;
      for (const double value : values) text << " " << value;
    };
    text << "seed " << seed_ << ": kernel " << parameters.kernelSize << ", input "
         << inputShape.width << "x" << inputShape.height << "x" << inputShape.channels << " +"
         << inputShape.marginX << "+" << inputShape.marginY << ", output " << outputShape.width
         << "x" << outputShape.height << " +" << outputShape.marginX << "+" << outputShape.marginY
         << ", values " << static_cast<int>(values_) << ", holes " << static_cast<int>(holes_)
         << (mask.empty() ? "" : ", masked");
    list("no-data", parameters.inputNoData);
    list("written", parameters.outputNoData);
    if (parameters.background) list("background", {*parameters.background});
    return text.str();
  }

 private:
  using Limits = std::numeric_limits<T>;
  static constexpr bool kFloating = std::is_floating_point_v<T>;

  std::ptrdiff_t Half() const { return parameters.kernelSize / 2; }

  void ChooseShape(const SceneLimits& limits) {
    parameters.kernelSize = random_.Pick(limits.kernelSizes);
    const bool large = parameters.kernelSize > 9;
    inputShape.width = random_.Between(1, 70);
    if (random_.Percent(40)) {
      const std::uint32_t lanes = random_.Pick(std::vector<std::uint32_t>{8, 16, 32, 64, 128, 256});
      inputShape.width = lanes + random_.Below(7) - 3;
    }
    if (large && inputShape.width > 80) inputShape.width = random_.Between(60, 72);
    outputShape.width = inputShape.width;
    outputShape.height = random_.Between(1, large ? 4 : 7);
    inputShape.height = outputShape.height + (random_.Percent(25) ? random_.Below(4) : 0);
    if (!limits.tallerInput) inputShape.height = outputShape.height;
    inputShape.channels = random_.Pick(std::vector<std::uint32_t>{1, 1, 1, 1, 2, 3, 3, 3, 4, 5});
    outputShape.channels = inputShape.channels;
    const auto half = static_cast<std::uint32_t>(Half());
    inputShape.marginX = half + (random_.Percent(50) ? random_.Below(4) : 0);
    inputShape.marginY = half + (random_.Percent(50) ? random_.Below(4) : 0);
    outputShape.marginX = random_.Percent(50) ? 0 : random_.Below(5);
    outputShape.marginY = random_.Percent(50) ? 0 : random_.Below(3);
  }

  double ChooseNoData() {
    if (random_.Percent(40)) {
      return static_cast<double>(random_.Pick(std::vector<T>{0, 1, 2, 3, 4}));
    }
    if constexpr (kFloating) {
      return random_.Pick(std::vector<double>{
          -9999, 0.1, -0.0, 1e300, -1e300, 1e-5, 255, static_cast<double>(Limits::max()),
          static_cast<double>(Limits::lowest()), Limits::infinity(), Limits::quiet_NaN()});
    } else {
      return random_.Pick(std::vector<double>{
          -9999, 1e300, 2.5, 3.49, -2.5, 100, static_cast<double>(Limits::max()),
          static_cast<double>(Limits::min()), static_cast<double>(Limits::max()) - 1,
          static_cast<double>(Limits::min()) + 1});
    }
  }

  void ChooseParameters(const SceneLimits& limits) {
    const auto list = [&] {
      // One value for all channels is the usual case; longer lists are allowed.
      std::vector<double> values(inputShape.channels + random_.Below(2), ChooseNoData());
      if (random_.Percent(30)) {
        for (double& value : values) value = ChooseNoData();
      }
      return values;
    };
    if (random_.Percent(60) || limits.needsBackground) parameters.background = ChooseNoData();
    if (random_.Percent(60)) parameters.inputNoData = list();
    if (random_.Percent(50)) parameters.outputNoData = list();
    if (random_.Percent(40)) {
      mask.assign(static_cast<std::size_t>(inputShape.FullWidth() * inputShape.FullHeight()), 1);
      for (std::uint8_t& byte : mask) byte = static_cast<std::uint8_t>(random_.Between(1, 255));
    }
  }

  T Draw(double scale) {
    constexpr T kLow = Limits::lowest();
    constexpr T kHigh = Limits::max();
    switch (values_) {
      case Values::kLowest:
        return kLow;
      case Values::kHighest:
        return kHigh;
      case Values::kExtremes:
        return random_.Percent(50) ? kLow : kHigh;
      case Values::kFew:
        return static_cast<T>(random_.Below(5));
      default:
        break;
    }
    if constexpr (!kFloating) return static_cast<T>(random_.Next());
    const double small = random_.Fraction();
    switch (values_) {
      case Values::kCancelling:
        return static_cast<T>(random_.Pick(std::vector<double>{scale, -scale, small}));
      case Values::kBorderline:
        if (random_.Percent(60)) return static_cast<T>(random_.Percent(50) ? scale : -scale);
        return static_cast<T>(1.5 + small / 2);
      case Values::kMagnitudes:
        return static_cast<T>(std::ldexp(small, static_cast<int>(random_.Below(120)) - 60));
      case Values::kSpecials:
        if (random_.Percent(85)) return static_cast<T>(small * 100);
        return random_.Pick(std::vector<T>{Limits::quiet_NaN(), Limits::infinity(),
                                           -Limits::infinity(), T(-0.0), T(0), kHigh, kLow,
                                           Limits::denorm_min(), Limits::min()});
      case Values::kInfinite:
        if (random_.Percent(70)) return T{0};
        return random_.Pick(std::vector<T>{Limits::infinity(), -Limits::infinity(), kHigh, kLow});
      case Values::kDenormals:
        return static_cast<T>(small) * Limits::min();
      default:
        return static_cast<T>(small * 5000);
    }
  }

  void FillValues() {
    const std::uint32_t most = values_ == Values::kBorderline ? 34 : 66;
    const double scale = std::ldexp(1.0, static_cast<int>(random_.Between(22, most)));
    for (std::size_t i = 0; i < input.SampleCount(); ++i) input.Samples()[i] = Draw(scale);
  }

  bool IsHole(std::ptrdiff_t x, std::ptrdiff_t y) {
    const auto width = static_cast<std::ptrdiff_t>(outputShape.width);
    const auto height = static_cast<std::ptrdiff_t>(outputShape.height);
    switch (holes_) {
      case Holes::kNone:
        return false;
      case Holes::kSpecks:
        return random_.Percent(2);
      case Holes::kHalf:
        return random_.Percent(50);
      case Holes::kMost:
        return random_.Percent(90);
      case Holes::kRuns:
        if (runLeft_-- == 0) {
          runLeft_ = random_.Below(random_.Percent(50) ? 6 : 45);
          inHole_ = !inHole_;
        }
        return inHole_;
      case Holes::kRows:
        return (static_cast<std::uint64_t>(y + 64) * 0x9E3779B9U >> 13 & 3) == 0;
      case Holes::kColumns:
        return (static_cast<std::uint64_t>(x + 64) * 0x9E3779B9U >> 13 & 3) == 0;
      case Holes::kAll:
        return true;
      case Holes::kAllBut:
        return x != static_cast<std::ptrdiff_t>(seed_ % outputShape.width) ||
               y != static_cast<std::ptrdiff_t>(seed_ % outputShape.height);
      case Holes::kBorder:
        return x <= 0 || y < 0 || x >= width - 1 || y >= height;
      case Holes::kCollar:
        return x < 3 * y + static_cast<std::ptrdiff_t>(seed_ % 23) - 5;
      case Holes::kPatches:
        return ((x + 64) / 9 + (y + 64) / 3) % 5 == 0 || random_.Percent(1);
    }
    return false;
  }

  // Makes a pixel one that does not count, in one of the ways that the parameters offer.
  void Punch(std::ptrdiff_t x, std::ptrdiff_t y) {
    const auto fill = [&](auto&& sampleOf) {
      for (std::size_t c = 0; c < inputShape.channels; ++c) input.Pixel(x, y)[c] = sampleOf(c);
    };
    std::vector<int> ways;
    if (!mask.empty()) ways.push_back(0);
    if (!parameters.inputNoData.empty()) ways.push_back(1);
    if (parameters.background) ways.push_back(2);
    if (ways.empty()) return;
    const int way = ways[oneWay_ ? seed_ % ways.size() : random_.Below(3) % ways.size()];
    if (way == 0) {
      mask[static_cast<std::size_t>(inputShape.PixelIndex(x, y))] = 0;
    } else if (way == 1) {
      fill([&](std::size_t c) { return ReferenceListEntry<T>(parameters.inputNoData[c]); });
    } else {
      fill([&](std::size_t) { return ReferenceBackground<T>(*parameters.background); });
    }
    // A pixel that differs in one channel counts again.
    if (way != 0 && random_.Percent(4)) {
      T& sample = input.Pixel(x, y)[random_.Below(inputShape.channels)];
      sample = static_cast<T>(sample == 7 ? 8 : 7);
    }
  }

  void PunchHoles() {
    oneWay_ = random_.Percent(60);
    const std::ptrdiff_t half = Half();
    for (std::ptrdiff_t y = -half; y < static_cast<std::ptrdiff_t>(outputShape.height) + half;
         ++y) {
      for (std::ptrdiff_t x = -half; x < static_cast<std::ptrdiff_t>(outputShape.width) + half;
           ++x) {
        if (IsHole(x, y)) Punch(x, y);
      }
    }
  }

  // Pixels beyond the reach of any window must not matter.
  void Poison() {
    const std::ptrdiff_t half = Half();
    const auto marginX = static_cast<std::ptrdiff_t>(inputShape.marginX);
    const auto marginY = static_cast<std::ptrdiff_t>(inputShape.marginY);
    const T poison = kFloating ? Limits::quiet_NaN() : Limits::max();
    for (std::ptrdiff_t y = -marginY; y < inputShape.FullHeight() - marginY; ++y) {
      for (std::ptrdiff_t x = -marginX; x < inputShape.FullWidth() - marginX; ++x) {
        const bool reached =
            x >= -half && x < static_cast<std::ptrdiff_t>(outputShape.width) + half && y >= -half &&
            y < static_cast<std::ptrdiff_t>(outputShape.height) + half;
        if (reached) continue;
        for (std::size_t c = 0; c < inputShape.channels; ++c) input.Pixel(x, y)[c] = poison;
      }
    }
  }

  RandomNumbers random_;
  std::uint64_t seed_;
  Values values_ = Values::kAny;
  Holes holes_ = Holes::kNone;
  std::uint32_t runLeft_ = 0;
  bool inHole_ = false;
  bool oneWay_ = true;
};

}  // namespace zarn::testsupport
