// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>
#include <omp.h>

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "processes/filters/framework/ifilter.h"
#include "tests/support/conversionreference.h"
#include "tests/support/randomnumbers.h"
#include "tests/support/testblock.h"

namespace zarn::testsupport {

/// Where a sample stands: its channel, and its pixel in the whole image.
struct Place {
  std::size_t channel;
  double column;
  double row;
};

/// A block for the filters that look at one pixel at a time, with no-data, masked and extreme
/// pixels, and what the filters' common rules make of it.
template <typename T>
class BalanceScene {
 public:
  BalanceScene(std::uint64_t seed, const Shape& shape) : random_(seed), input_(shape) {
    const std::size_t channels = shape.channels;
    const std::vector<double> extremes = {
        0.0, 1.0, static_cast<double>(std::numeric_limits<T>::lowest()),
        static_cast<double>(std::numeric_limits<T>::max()), 128.0};
    for (std::size_t c = 0; c < channels; ++c) {
      if (random_.Percent(60)) inputNoData.push_back(10.0 * static_cast<double>(c) + 7.5);
      if (random_.Percent(60)) outputNoData.push_back(random_.Pick(extremes));
    }
    if (inputNoData.size() < channels) inputNoData.clear();
    if (outputNoData.size() < channels) outputNoData.clear();
    // Entries that no channel has do not count.
    for (std::vector<double>* const list : {&inputNoData, &outputNoData}) {
      if (!list->empty() && random_.Percent(40)) list->insert(list->end(), {3.0, 99.0});
    }
    for (std::size_t i = 0; i < input_.SampleCount(); ++i) {
      input_.Samples()[i] = static_cast<T>(random_.Below(120));
      if (random_.Percent(3)) input_.Samples()[i] = Special();
    }
    if (random_.Percent(50)) mask.resize(Pixels(), 1);
    // Runs and single pixels.
    for (std::size_t i = 0; i < Pixels();) {
      const std::size_t end = std::min<std::size_t>(Pixels(), i + random_.Between(1, 90));
      const std::uint32_t fate = random_.Below(4);
      for (; i < end; ++i) {
        if (fate == 0 && !mask.empty()) mask[i] = 0;
        if (fate == 1 && !inputNoData.empty() && random_.Percent(90)) SetNoData(i);
      }
    }
  }

  /// Compares the filter's output with `balanced(sample, place)` brought into the sample type, or
  /// with `mapped(sample, place)` as it is; the block lies at `origin` of the whole image.
  template <typename Balanced>
  void ExpectBalanced(processes::filters::IFilter& filter, const gobs::BlockFrame& origin,
                      const Balanced& balanced) {
    ExpectMapped(filter, origin, [&](T v, const Place& place) {
      std::optional<double> noData;
      if (!outputNoData.empty()) noData = outputNoData[place.channel];
      return ReferenceResult<T>(balanced(static_cast<double>(v), place),
                                static_cast<double>(std::numeric_limits<T>::lowest()),
                                static_cast<double>(std::numeric_limits<T>::max()), noData);
    });
  }
  template <typename Mapped>
  void ExpectMapped(processes::filters::IFilter& filter, const gobs::BlockFrame& origin,
                    const Mapped& mapped) {
    filter.SetNoDataValues(&inputNoData, &outputNoData);
    const Shape& shape = input_.shape();
    for (const bool inPlace : {false, true}) {
      for (const int threads : {1, 3}) {
        TestBlock<T> expected(shape);
        if (inPlace) expected = input_;
        TestBlock<T> actual = expected;
        for (std::size_t i = 0; i < Pixels(); ++i) WritePixel(i, origin, mapped, expected);
        const TestBlock<T>& source = inPlace ? actual : input_;
        omp_set_num_threads(threads);
        const gobs::RasterInfo info(shape.width, shape.height, shape.channels, CodeFor<T>(),
                                    origin);
        const std::size_t bytes = input_.SampleCount() * sizeof(T);
        const gobs::Raster in = gobs::Raster::WrapConst(info, source.Samples(), bytes);
        gobs::Raster out(info, actual.Samples(), bytes);
        const auto result = filter.Process(in, out, origin.originX, origin.originY,
                                           mask.empty() ? nullptr : mask.data());
        ASSERT_EQ(result.code, 1) << result.message;
        ASSERT_TRUE(SameBlocks(actual, expected))
            << shape.width << "x" << shape.height << "x" << shape.channels << ", " << threads
            << " threads, " << (inPlace ? "in place" : "apart") << (mask.empty() ? "" : ", mask")
            << (inputNoData.empty() ? "" : ", input no-data")
            << (outputNoData.empty() ? "" : ", output no-data");
      }
    }
  }

  std::size_t Pixels() const { return input_.SampleCount() / input_.shape().channels; }
  bool Excluded(std::size_t i) const {
    if (!mask.empty() && mask[i] == 0) return true;
    if (inputNoData.empty()) return false;
    bool same = true;
    for (std::size_t c = 0; c < input_.shape().channels; ++c) {
      const T v = input_.Samples()[i * input_.shape().channels + c];
      const T noData = ReferenceListEntry<T>(inputNoData[c]);
      same = same && std::fabs(static_cast<double>(v) - static_cast<double>(noData)) < 2.2e-16;
    }
    return same;
  }

  std::vector<double> inputNoData;
  std::vector<double> outputNoData;
  std::vector<std::uint8_t> mask;

 private:
  T Special() {
    if constexpr (std::is_floating_point_v<T>) {
      constexpr T kInfinity = std::numeric_limits<T>::infinity();
      return random_.Pick<T>({std::numeric_limits<T>::quiet_NaN(), kInfinity, -kInfinity, T{0},
                              std::numeric_limits<T>::max(), T(7.5), T(-3.25), T(1e-20)});
    } else {
      return random_.Pick<T>({std::numeric_limits<T>::min(), std::numeric_limits<T>::max(), T{0},
                              static_cast<T>(255), static_cast<T>(-5)});
    }
  }

  void SetNoData(std::size_t i) {
    for (std::size_t c = 0; c < input_.shape().channels; ++c) {
      input_.Samples()[i * input_.shape().channels + c] = ReferenceListEntry<T>(inputNoData[c]);
    }
  }

  template <typename Mapped>
  void WritePixel(std::size_t i, const gobs::BlockFrame& origin, const Mapped& mapped,
                  TestBlock<T>& output) const {
    const std::size_t channels = input_.shape().channels;
    for (std::size_t c = 0; c < channels; ++c) {
      T& out = output.Samples()[i * channels + c];
      if (!Excluded(i)) {
        const auto x = static_cast<std::uint32_t>(origin.originX + i % input_.shape().width);
        const auto y = static_cast<std::uint32_t>(origin.originY + i / input_.shape().width);
        out = mapped(input_.Samples()[i * channels + c],
                     {c, static_cast<double>(x), static_cast<double>(y)});
      } else if (!outputNoData.empty()) {
        out = ReferenceListEntry<T>(outputNoData[c]);
      }
    }
  }

  RandomNumbers random_;
  TestBlock<T> input_;
};

/// Shapes around the ends of vectors and runs, of one to five channels and more, below and above
/// what is shared out; `check(shape, seed)`.
template <typename Check>
void ForEachBalanceShape(const Check& check) {
  std::uint64_t seed = 1;
  for (const std::uint32_t width : {1U, 2U, 3U, 31U, 63U, 64U, 65U, 131U}) {
    for (const std::uint32_t channels : {1U, 2U, 3U, 4U, 5U}) {
      check(Shape{.width = width, .height = 1 + width % 3, .channels = channels}, seed++);
    }
  }
  check(Shape{.width = 1100, .height = 5, .channels = 3}, seed++);
  check(Shape{.width = 1100, .height = 5, .channels = 1}, seed++);
  check(Shape{.width = 530, .height = 2, .channels = 40}, seed++);
}

}  // namespace zarn::testsupport
