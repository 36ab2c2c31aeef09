// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <stdexcept>
#include <vector>

#include "host/mosaic/griddodgingsurface.h"
#include "host/mosaic/surfacecache.h"
#include "processes/filters/factories/dodgingcbfactory.h"
#include "tests/support/balancescene.h"
#include "tests/support/sampletypes.h"

namespace zarn::processes::filters {
namespace {

using testsupport::BalanceScene;
using testsupport::ForEachBalanceShape;
using testsupport::Place;
using testsupport::Shape;

constexpr unsigned kChannels = 40;

/// A surface of the host's, known only through its samples; counts them.
class Tilt : public MOSDodgingSurface {
 public:
  explicit Tilt(float scale) : scale_(scale) {}

  static float At(double column, double row, unsigned channel, float scale) {
    return scale * (1.0F + static_cast<float>(column * 1e-4 + row * 2e-4) +
                    0.125F * static_cast<float>(channel));
  }

  std::size_t ByteSize() const override { return sizeof(*this); }
  unsigned Channels() const override { return kChannels; }
  void GetBilinearValue(unsigned column, unsigned row, float* values) const override {
    ++samples;
    if (samples > failAt) throw std::runtime_error("the surface cannot be read");
    for (unsigned c = 0; c < kChannels; ++c) values[c] = At(column, row, c, scale_);
  }

  mutable std::atomic<std::size_t> samples = 0;
  std::size_t failAt = ~std::size_t{0};

 private:
  float scale_;
};

/// Hands out one surface.
class Only : public MOSDodgingSurfaceFactoryRef {
 public:
  explicit Only(std::shared_ptr<MOSDodgingSurface> surface) : surface_(std::move(surface)) {}
  TCacheRef<MOSDodgingSurface> GetCacheRef() override {
    return TCacheRef<MOSDodgingSurface>(surface_);
  }

 private:
  std::shared_ptr<MOSDodgingSurface> surface_;
};

std::vector<MOSDodgingCoeffs> Coefficients() {
  std::vector<MOSDodgingCoeffs> coeffs;
  for (unsigned c = 0; c < kChannels; ++c) {
    const double s = c % 2 == 0 ? 1.0 : -0.5;
    coeffs.push_back({.d0 = 60 * s, .d1 = 4.5 * s, .d2 = 30, .d3 = 7 * s, .d4 = 0.9, .d5 = 1.25});
  }
  return coeffs;
}

template <typename T>
class Dodging : public ::testing::Test {};
TYPED_TEST_SUITE(Dodging, testsupport::HandledTypes, testsupport::TypeNames);

TYPED_TEST(Dodging, EqualsItsFormula) {
  const std::vector<MOSDodgingCoeffs> coeffs = Coefficients();
  const auto gain = std::make_shared<Tilt>(0.75F);
  const auto offset = std::make_shared<Tilt>(20.0F);
  Only gains(gain);
  Only offsets(offset);
  const gobs::BlockFrame origin{.originX = 0xFFFFFF00U, .originY = 77};
  for (const int type : {0, 1, 2, 9}) {
    for (const bool surfaces : {type != 2, true}) {
      const std::unique_ptr<IFilter> filter(
          DodgingCBFactory(coeffs, static_cast<MOSDodgingType>(type), surfaces ? &gains : nullptr,
                           surfaces ? &offsets : nullptr)
              .GetCPUFilter());
      ForEachBalanceShape([&](const Shape& shape, std::uint64_t seed) {
        BalanceScene<TypeParam> scene(seed, shape);
        gain->samples = offset->samples = 0;
        scene.ExpectBalanced(*filter, origin, [&](double v, const Place& place) {
          const MOSDodgingCoeffs& d = coeffs[place.channel];
          const auto channel = static_cast<unsigned>(place.channel);
          double g = 1.0;
          double o = 0.0;
          if (surfaces) {
            g = Tilt::At(place.column, place.row, channel, 0.75F);
            o = Tilt::At(place.column, place.row, channel, 20.0F);
          }
          const double a = v * d.d4 + d.d5;
          if (type == 2) return (a - d.d0) * (d.d3 / d.d2 + 1.0) * g + d.d0 + (d.d1 + o);
          const double r = (d.d0 + d.d1) / (d.d0 - o);
          if (type == 1 && r > 1.0) return (r * a + a + (d.d1 + o)) * 0.5;
          return a + (d.d1 + o);
        });
        std::size_t balanced = 0;
        for (std::size_t i = 0; i < scene.Pixels(); ++i) balanced += scene.Excluded(i) ? 0 : 1;
        // Two runs with two numbers of threads; only balanced pixels are sampled. In place, the
        // second pair sees the same pixels.
        EXPECT_EQ(gain->samples, surfaces ? 4 * balanced : 0);
        EXPECT_EQ(offset->samples, surfaces ? 4 * balanced : 0);
      });
    }
  }
}

TEST(DodgingSurfaces, ArePinnedForACallAndReleasedWhenTheHostThrows) {
  SurfaceCache cache(0);
  Tilt* loaded = nullptr;
  SurfaceCache::Source source(cache, [&] {
    auto surface = std::make_unique<Tilt>(1.0F);
    loaded = surface.get();
    surface->failAt = 100;
    return surface;
  });
  GridDodgingSurface grid({.channels = kChannels, .values = std::vector<float>(kChannels, 1.0F)});
  SurfaceCache::Source other(cache, [&] {
    DodgingGrid one{.channels = kChannels, .values = std::vector<float>(kChannels, 1.0F)};
    return std::make_unique<GridDodgingSurface>(one);
  });
  const std::vector<MOSDodgingCoeffs> coeffs = Coefficients();
  const std::unique_ptr<IFilter> filter(
      DodgingCBFactory(coeffs, MOSDodgingType::kScaled, &source, &other).GetCPUFilter());
  gobs::Raster block(gobs::RasterInfo(50, 50, 1, gobs::NativeDataTypeCode::kUInt8));
  gobs::Raster output(gobs::RasterInfo(50, 50, 1, gobs::NativeDataTypeCode::kUInt8));
  for (int call = 0; call < 2; ++call) {
    EXPECT_THROW(filter->Process(block, output, 0, 0, nullptr), std::runtime_error);
    // Without budget only the surface used last stays once nothing is pinned any more.
    EXPECT_LE(cache.BytesInUse(), grid.ByteSize());
  }
  loaded = nullptr;
  source.GetCacheRef();
  EXPECT_NE(loaded, nullptr) << "the pinned surface was not dropped after the call";
}

TEST(DodgingCBFactory, ReadsTheCallersCoefficientsWhenAFilterIsMade) {
  std::vector<MOSDodgingCoeffs> coeffs = {{.d1 = 10}};
  const DodgingCBFactory factory(coeffs, MOSDodgingType::kShift, nullptr, nullptr);
  coeffs[0].d1 = 20;
  const std::unique_ptr<IFilter> filter(DodgingCBFactory(factory).GetCPUFilter());
  coeffs[0].d1 = 30;
  gobs::Raster block(gobs::RasterInfo(1, 1, 1, gobs::NativeDataTypeCode::kUInt8));
  EXPECT_TRUE(filter->Process(block, block, 0, 0, nullptr).Ok());
  EXPECT_EQ(*static_cast<std::uint8_t*>(block.Data()), 20);
}

}  // namespace
}  // namespace zarn::processes::filters
