// SPDX-License-Identifier: Apache-2.0
#include <omp.h>

#include <cstdint>
#include <cstdlib>
#include <functional>
#include <memory>
#include <opencv2/core.hpp>
#include <random>
#include <string>
#include <vector>

#include "bench/support/comparison.h"
#include "host/gobs/raster.h"
#include "host/mosaic/griddodgingsurface.h"
#include "processes/filters/factories/dodgingcbfactory.h"
#include "processes/filters/factories/gainoffsetcbfactory.h"
#include "processes/filters/factories/hotspotnormfactory.h"
#include "processes/filters/factories/lutcbfactory.h"
#include "processes/filters/factories/minmaxlutcbfactory.h"
#include "processes/filters/factories/neighborhoodcbfactory.h"
#include "processes/filters/framework/nodata.h"
#include "processes/filters/framework/outputconverter.h"

namespace zarn::bench {
namespace {

using gobs::NativeDataTypeCode;
using processes::filters::IFilter;
using processes::filters::OutputConverter;

constexpr std::uint32_t kSide = 4096;
constexpr std::uint32_t kChannels = 3;
constexpr double kNoData = 255;

/// A block of 4096 x 4096 pixels of three channels, and what the filter and its peer work on.
template <typename T>
struct Blocks {
  explicit Blocks(NativeDataTypeCode code)
      : input(gobs::RasterInfo(kSide, kSide, kChannels, code)),
        output(gobs::RasterInfo(kSide, kSide, kChannels, code)) {
    std::mt19937 random(7);
    auto* const samples = static_cast<T*>(input.Data());
    for (std::size_t i = 0; i < Samples(); ++i) samples[i] = static_cast<T>(random() % 255);
    // About 14 % of the pixels in runs, and single ones.
    for (std::size_t i = 0; i < Pixels();) {
      i += random() % 1200;
      const std::size_t end = std::min<std::size_t>(i + random() % 200, Pixels());
      for (; i < end; ++i) holes.push_back(i);
      if (i + 50 < Pixels()) holes.push_back(i + 50);
    }
    mask.assign(Pixels(), 1);
  }
  static std::size_t Samples() { return std::size_t{kSide} * kSide * kChannels; }
  static std::size_t Pixels() { return std::size_t{kSide} * kSide; }
  const T* In() const { return static_cast<const T*>(input.Data()); }
  T* Out() { return static_cast<T*>(output.Data()); }

  gobs::Raster input;
  gobs::Raster output;
  std::vector<std::size_t> holes;
  std::vector<std::uint8_t> mask;
};

struct Tables {
  Tables() : bytes(256) {
    for (std::size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<unsigned char>(255 - i);
  }
  std::vector<unsigned char*> ForChannels() { return {kChannels, bytes.data()}; }
  std::vector<unsigned char> bytes;
};

enum class Exclusions { kNone, kTested, kHoles };

/// What a case of one sample type consists of; made when it first runs.
template <typename T>
struct Case {
  Blocks<T> blocks;
  std::unique_ptr<IFilter> filter;
  std::function<void()> peer;
};

template <typename T>
void Register(const std::string& name, const char* peer, NativeDataTypeCode code,
              Exclusions exclusions, const std::function<IFilter*()>& makeFilter,
              const std::function<void(Blocks<T>&)>& runPeer) {
  static const int all = omp_get_max_threads();
  const auto cached = std::make_shared<std::unique_ptr<Case<T>>>();
  const auto fixture = [=]() -> Case<T>& {
    if (!*cached) {
      *cached = std::make_unique<Case<T>>(
          Case<T>{Blocks<T>(code), std::unique_ptr<IFilter>(makeFilter()), {}});
      Case<T>& made = **cached;
      const std::vector<double> noData(kChannels, kNoData);
      if (exclusions != Exclusions::kNone) made.filter->SetNoDataValues(&noData, &noData);
      if (exclusions == Exclusions::kHoles) {
        for (const std::size_t i : made.blocks.holes) made.blocks.mask[i] = 0;
      }
    }
    return **cached;
  };
  const auto run = [=](int threads) {
    Case<T>& c = fixture();
    cv::setNumThreads(1);
    omp_set_num_threads(threads);
    const std::uint8_t* const mask =
        exclusions == Exclusions::kNone ? nullptr : c.blocks.mask.data();
    if (!c.filter->Process(c.blocks.input, c.blocks.output, 0, 0, mask).Ok()) std::abort();
  };
  const std::size_t bytes = Blocks<T>::Samples() * sizeof(T);
  Compare({name + " threads 1", peer, bytes, [=] { run(1); }, [=] { runPeer(fixture().blocks); }});
  if (all > 1) {
    Compare({name + " threads " + std::to_string(all), "one thread", bytes, [=] { run(all); },
             [=] { run(1); }});
  }
}

/// The straightforward loop: one call for every sample, converted one by one.
template <typename T, typename Formula>
void PixelByPixel(Blocks<T>& blocks, const Formula& formula) {
  using Limits = std::numeric_limits<T>;
  const OutputConverter<T> convert(static_cast<double>(Limits::lowest()),
                                   static_cast<double>(Limits::max()));
  const std::function<double(double, std::size_t, double, double)> call = formula;
  for (std::uint32_t y = 0; y < kSide; ++y) {
    for (std::uint32_t x = 0; x < kSide; ++x) {
      const std::size_t i = (std::size_t{y} * kSide + x) * kChannels;
      for (std::size_t c = 0; c < kChannels; ++c) {
        blocks.Out()[i + c] = convert(call(static_cast<double>(blocks.In()[i + c]), c, x, y));
      }
    }
  }
}

template <typename T>
cv::Mat Whole(T* data, int depth) {
  return cv::Mat(kSide, kSide, CV_MAKETYPE(depth, kChannels),
                 const_cast<std::remove_const_t<T>*>(data));
}

template <typename T>
void RegisterType(const std::string& type, NativeDataTypeCode code, int depth) {
  using namespace processes::filters;
  const std::vector<double> gains(kChannels, 1.07);
  const std::vector<double> offsets(kChannels, -3.5);
  for (const auto& [label, exclusions] :
       {std::pair(" plain", Exclusions::kNone), std::pair(" tested", Exclusions::kTested),
        std::pair(" holes", Exclusions::kHoles)}) {
    Register<T>(
        "gain-offset " + type + label, "convertTo", code, exclusions,
        [=] { return GainOffsetCBFactory(gains, offsets).GetCPUFilter(); },
        [=](Blocks<T>& b) {
          cv::Mat out = Whole(b.Out(), depth);
          Whole(b.In(), depth).convertTo(out, depth, 1.07, -3.5);
        });
    if (depth != CV_8U) continue;
    const auto tables = std::make_shared<Tables>();
    const auto lut = [=](Blocks<T>& b) {
      cv::Mat out = Whole(b.Out(), depth);
      cv::LUT(Whole(b.In(), depth), cv::Mat(1, 256, CV_8U, tables->bytes.data()), out);
    };
    Register<T>(
        "lut " + type + label, "LUT", code, exclusions,
        [=] { return LUTCBFactory(tables->ForChannels()).GetCPUFilter(); }, lut);
    Register<T>(
        "minmax-lut " + type + label, "LUT", code, exclusions,
        [=] {
          return MinMaxLUTCBFactory(tables->ForChannels(), {10, 10, 10}, {240, 240, 240})
              .GetCPUFilter();
        },
        lut);
  }
  const std::vector<std::vector<double>> polynomials(kChannels,
                                                     {1.0, 0.9, 1e-5, 2e-5, 1e-9, -2e-9, 1e-9});
  Register<T>(
      "polynomial " + type, "pixel loop", code, Exclusions::kNone,
      [=] {
        return NeighborhoodCBFactory(polynomials, std::vector<double>(kChannels, 1.0))
            .GetCPUFilter();
      },
      [=](Blocks<T>& b) {
        PixelByPixel(b, [=](double v, std::size_t c, double x, double y) {
          const std::vector<double>& a = polynomials[c];
          return a[0] +
                 ((a[4] * y + a[2] + a[6] * x) * y + (a[5] * x + a[3]) * x + a[1]) * (v + 1.0);
        });
      });
  const std::vector<std::vector<double>> spots(kChannels, {30, 5, 20, -30, -20, 8});
  Register<T>(
      "hotspot " + type, "pixel loop", code, Exclusions::kNone,
      [=] { return HotSpotNormFactory(spots, kSide, kSide).GetCPUFilter(); },
      [=](Blocks<T>& b) {
        PixelByPixel(b, [=](double v, std::size_t c, double column, double row) {
          const std::vector<double>& p = spots[c];
          const double x = column / kSide;
          const double y = row / kSide;
          return v - ((y * p[1] + p[3] + x * p[0]) * x + y * p[2] * y + y * p[4] + p[5]);
        });
      });
  struct Surface : MOSDodgingSurfaceFactoryRef {
    TCacheRef<MOSDodgingSurface> GetCacheRef() override {
      return TCacheRef<MOSDodgingSurface>(surface);
    }
    std::shared_ptr<MOSDodgingSurface> surface;
  };
  const auto surface = std::make_shared<Surface>();
  DodgingGrid grid{
      .columns = 33, .rows = 33, .channels = kChannels, .stepX = 128, .stepY = 128, .values = {}};
  for (std::size_t i = 0; i < std::size_t{33} * 33 * kChannels; ++i) {
    grid.values.push_back(0.8F + 0.001F * static_cast<float>(i % 400));
  }
  surface->surface = std::make_shared<GridDodgingSurface>(grid);
  const auto coeffs = std::make_shared<std::vector<MOSDodgingCoeffs>>(
      kChannels, MOSDodgingCoeffs{.d0 = 120, .d1 = 3, .d2 = 40, .d3 = 4, .d4 = 1, .d5 = 0});
  Register<T>(
      "dodge " + type, "pixel loop", code, Exclusions::kNone,
      [=] {
        return DodgingCBFactory(*coeffs, MOSDodgingType::kScaled, surface.get(), surface.get())
            .GetCPUFilter();
      },
      [=](Blocks<T>& b) {
        float g[kChannels];
        float o[kChannels];
        PixelByPixel(b, [&](double v, std::size_t c, double x, double y) {
          if (c == 0) {
            surface->surface->GetBilinearValue(static_cast<unsigned>(x), static_cast<unsigned>(y),
                                               g);
            surface->surface->GetBilinearValue(static_cast<unsigned>(x), static_cast<unsigned>(y),
                                               o);
          }
          const MOSDodgingCoeffs& d = (*coeffs)[c];
          const double a = v * d.d4 + d.d5;
          return (a - d.d0) * (d.d3 / d.d2 + 1.0) * static_cast<double>(g[c]) + d.d0 +
                 (d.d1 + static_cast<double>(o[c]));
        });
      });
}

const bool kRegistered = [] {
  RegisterType<std::uint8_t>("u8x3", NativeDataTypeCode::kUInt8, CV_8U);
  RegisterType<std::uint16_t>("u16x3", NativeDataTypeCode::kUInt16, CV_16U);
  RegisterType<float>("f32x3", NativeDataTypeCode::kFloat32, CV_32F);
  return true;
}();

}  // namespace
}  // namespace zarn::bench
