// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <vector>

#include "processes/filters/factories/gainoffsetcbfactory.h"
#include "processes/filters/factories/hotspotnormfactory.h"
#include "processes/filters/factories/lutcbfactory.h"
#include "processes/filters/factories/minmaxlutcbfactory.h"
#include "processes/filters/factories/neighborhoodcbfactory.h"
#include "tests/support/balancescene.h"
#include "tests/support/sampletypes.h"

// Every filter that looks at one pixel at a time against a plain evaluation of its formula.

namespace zarn::processes::filters {
namespace {

using testsupport::BalanceScene;
using testsupport::ForEachBalanceShape;
using testsupport::Place;
using testsupport::Shape;

constexpr std::size_t kChannels = 40;
// Positions that pass 2^32 inside the larger blocks.
constexpr gobs::BlockFrame kFarOrigin{.originX = 0xFFFFFF00U, .originY = 0xFFFFFFFEU};
constexpr gobs::BlockFrame kOrigin{.originX = 517, .originY = 1000};

template <typename T>
class Balancers : public ::testing::Test {};
TYPED_TEST_SUITE(Balancers, testsupport::HandledTypes, testsupport::TypeNames);

TYPED_TEST(Balancers, GainOffset) {
  std::vector<double> gains;
  std::vector<double> offsets;
  for (std::size_t c = 0; c < kChannels; ++c) {
    gains.push_back(c % 3 == 2 ? -0.5 : 0.5 + 0.37 * static_cast<double>(c));
    offsets.push_back(c % 2 == 0 ? 0.5 : -20.25);
  }
  const std::unique_ptr<IFilter> filter(GainOffsetCBFactory(gains, offsets).GetCPUFilter());
  ForEachBalanceShape([&](const Shape& shape, std::uint64_t seed) {
    BalanceScene<TypeParam>(seed, shape)
        .ExpectBalanced(*filter, {}, [&](double v, const Place& place) {
          return v * gains[place.channel] + offsets[place.channel];
        });
  });
}

struct Tables {
  Tables() : bytes(kChannels, std::vector<unsigned char>(256)) {
    testsupport::RandomNumbers random(5);
    for (auto& table : bytes) {
      for (unsigned char& entry : table) entry = static_cast<unsigned char>(random.Below(256));
      pointers.push_back(table.data());
    }
  }
  std::vector<std::vector<unsigned char>> bytes;
  std::vector<unsigned char*> pointers;
};

TYPED_TEST(Balancers, LUT) {
  using T = TypeParam;
  Tables tables;
  const std::unique_ptr<IFilter> filter(LUTCBFactory(tables.pointers).GetCPUFilter());
  const auto expected = [&](T v, const Place& place) {
    const auto value = static_cast<double>(v);
    // NaN is in none of the ranges.
    const std::size_t index = value >= 255 ? 255 : value >= 1 ? static_cast<std::size_t>(value) : 0;
    return static_cast<T>(tables.bytes[place.channel][index]);
  };
  ForEachBalanceShape([&](const Shape& shape, std::uint64_t seed) {
    BalanceScene<T>(seed, shape).ExpectMapped(*filter, {}, expected);
  });
}

TYPED_TEST(Balancers, MinMaxLUT) {
  using T = TypeParam;
  Tables tables;
  std::vector<double> mins;
  std::vector<double> maxs;
  for (std::size_t c = 0; c < kChannels; ++c) {
    // Ordinary ranges, one without extent, one upside down, and fractions.
    mins.push_back(std::vector<double>{0, 20, 50, 90, 10.75}[c % 5]);
    maxs.push_back(std::vector<double>{127, 100, 50, 30, 99.5}[c % 5]);
  }
  const std::unique_ptr<IFilter> filter(
      MinMaxLUTCBFactory(tables.pointers, mins, maxs).GetCPUFilter());
  ForEachBalanceShape([&](const Shape& shape, std::uint64_t seed) {
    BalanceScene<T> scene(seed, shape);
    scene.ExpectMapped(*filter, {}, [&](T v, const Place& place) {
      const std::size_t c = place.channel;
      const T low = testsupport::ReferenceBackground<T>(mins[c]);
      const T high = testsupport::ReferenceBackground<T>(maxs[c]);
      if (v > high) return high;
      if (v < low) return low;
      std::optional<double> noData;
      if (!scene.outputNoData.empty()) noData = scene.outputNoData[c];
      const double scale = 255.0 / (maxs[c] - mins[c]);
      double result = static_cast<double>(low);
      if (std::isnan(static_cast<double>(v))) {
        result = std::numeric_limits<double>::quiet_NaN();
      } else if (std::isfinite(scale)) {
        const double x = static_cast<double>(v - low) * scale;
        result += tables.bytes[c][static_cast<std::size_t>(std::fmin(x, 255.0))] / scale;
      }
      return testsupport::ReferenceResult<T>(result, static_cast<double>(low),
                                             static_cast<double>(high), noData);
    });
  });
}

TYPED_TEST(Balancers, Polynomial) {
  for (const std::size_t n : {1U, 2U, 4U, 5U, 7U}) {
    std::vector<std::vector<double>> rows;
    std::vector<double> biases;
    for (std::size_t c = 0; c < kChannels; ++c) {
      const double s = c % 2 == 0 ? 1.0 : -0.75;
      rows.push_back({3.5 * s, 0.9, 1e-3, -2e-4 * s, 1e-7, -3e-7, 2e-7 * s});
      rows.back().resize(n);
      biases.push_back(2.0 * s);
    }
    const std::unique_ptr<IFilter> filter(NeighborhoodCBFactory(rows, biases).GetCPUFilter());
    ForEachBalanceShape([&](const Shape& shape, std::uint64_t seed) {
      const gobs::BlockFrame origin = seed % 4 == 0 ? kFarOrigin : kOrigin;
      BalanceScene<TypeParam>(seed, shape)
          .ExpectBalanced(*filter, origin, [&](double sample, const Place& place) {
            const std::vector<double>& a = rows[place.channel];
            const double x = place.column;
            const double y = place.row;
            const double v = sample + biases[place.channel];
            if (n == 2) return a[0] + a[1] * v;
            if (n == 4) return a[0] + (a[1] + a[2] * y + a[3] * x) * v;
            if (n == 7) {
              const double alongY = (a[4] * y + a[2] + a[6] * x) * y;
              const double alongX = (a[5] * x + a[3]) * x;
              return a[0] + (alongY + alongX + a[1]) * v;
            }
            return v;
          });
    });
  }
}

TYPED_TEST(Balancers, HotSpot) {
  std::vector<std::vector<double>> rows;
  for (std::size_t c = 0; c < kChannels; ++c) {
    const double s = c % 2 == 0 ? 1.0 : -0.5;
    rows.push_back({10 * s, -3, 7 * s, 4, -9 * s, 5.25});
  }
  const std::unique_ptr<IFilter> filter(HotSpotNormFactory(rows, 1999, 733).GetCPUFilter());
  ForEachBalanceShape([&](const Shape& shape, std::uint64_t seed) {
    const gobs::BlockFrame origin = seed % 4 == 0 ? kFarOrigin : kOrigin;
    BalanceScene<TypeParam>(seed, shape)
        .ExpectBalanced(*filter, origin, [&](double v, const Place& place) {
          const std::vector<double>& p = rows[place.channel];
          const double x = place.column / 1999.0;
          const double y = place.row / 733.0;
          const double quadratic = (y * p[1] + p[3] + x * p[0]) * x;
          return v - (quadratic + y * p[2] * y + y * p[4] + p[5]);
        });
  });
}

}  // namespace
}  // namespace zarn::processes::filters
