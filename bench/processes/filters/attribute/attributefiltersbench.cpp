// SPDX-License-Identifier: Apache-2.0
#include <omp.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <functional>
#include <memory>
#include <random>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "bench/support/comparison.h"
#include "processes/filters/attribute/iattributefilter.h"
#include "processes/filters/factories/attrfilterfactory.h"
#include "processes/filters/framework/sampletypes.h"
#include "tests/support/attributereference.h"

// The attribute filters beside the same as straightforward loops, on segments of tens to thousands
// of pixels.

namespace zarn::bench {
namespace {

using gobs::NativeDataTypeCode;
using gobs::Raster;
using gobs::RasterInfo;
using processes::filters::FILTERALGO;
using testsupport::AttributeParameters;

// Rows of the block that the straightforward loop is timed on: the whole block would take minutes.
constexpr std::uint32_t kPeerRows = 64;

struct Case {
  FILTERALGO algo;
  NativeDataTypeCode samples;
  NativeDataTypeCode labels;
  std::uint32_t channels;
  std::uint32_t side;
  int size;
  int scale;
};

const char* NameOf(NativeDataTypeCode code) {
  constexpr const char* kNames[] = {"u8", "i8", "u16", "i16", "u32", "i32", "f32", "", "", "f64"};
  return kNames[static_cast<std::size_t>(code)];
}
const char* NameOf(FILTERALGO algo) {
  constexpr const char* kNames[] = {"mean", "median", "trimmed"};
  return kNames[static_cast<std::size_t>(algo)];
}

template <typename Use>
void WithType(NativeDataTypeCode code, const Use& use) {
  const bool handled = processes::filters::VisitSampleType(code, "", [&](auto type) {
                         use(type);
                         return processes::filters::FilterResult::Success();
                       }).Ok();
  if (!handled) std::abort();
}

// Segments around random seeds, of sizes from tens to thousands of pixels: each seed grows by its
// own weight, so that borders are crooked.
std::vector<std::uint8_t> MakeSegments(std::uint32_t width, std::uint32_t height) {
  constexpr std::uint32_t kCell = 20;
  struct Seed {
    double x;
    double y;
    double weight;
    std::uint8_t label;
  };
  std::mt19937 random(11);
  const auto fraction = [&] { return static_cast<double>(random() % 65536) / 65536.0; };
  const std::uint32_t columns = width / kCell + 1;
  const std::uint32_t rows = height / kCell + 1;
  std::vector<Seed> seeds;
  for (std::uint32_t r = 0; r < rows; ++r) {
    for (std::uint32_t c = 0; c < columns; ++c) {
      seeds.push_back({(c + fraction()) * kCell, (r + fraction()) * kCell,
                       0.2 + fraction() * fraction() * 4,
                       static_cast<std::uint8_t>(1 + random() % 40)});
    }
  }
  std::vector<std::uint8_t> labels(std::size_t{width} * height);
  for (std::uint32_t y = 0; y < height; ++y) {
    for (std::uint32_t x = 0; x < width; ++x) {
      double nearest = 1e300;
      for (std::uint32_t r = std::max(y / kCell, 2U) - 2; r <= std::min(y / kCell + 2, rows - 1);
           ++r) {
        for (std::uint32_t c = std::max(x / kCell, 2U) - 2;
             c <= std::min(x / kCell + 2, columns - 1); ++c) {
          const Seed& seed = seeds[std::size_t{r} * columns + c];
          const double dx = x - seed.x;
          const double dy = y - seed.y;
          const double distance = (dx * dx + dy * dy) / seed.weight;
          if (distance >= nearest) continue;
          nearest = distance;
          labels[std::size_t{y} * width + x] = seed.label;
        }
      }
    }
  }
  return labels;
}

// A window of one map, which takes seconds to draw.
std::vector<std::uint8_t> Segments(std::uint32_t width, std::uint32_t height) {
  constexpr std::uint32_t kSide = 4160;
  static const std::vector<std::uint8_t> map = MakeSegments(kSide, kSide);
  if (width > kSide || height > kSide) std::abort();
  std::vector<std::uint8_t> labels;
  for (std::uint32_t y = 0; y < height; ++y) {
    const auto row = map.begin() + static_cast<std::ptrdiff_t>(y) * kSide;
    labels.insert(labels.end(), row, row + width);
  }
  return labels;
}

struct Fixture {
  Raster in;
  Raster attr;
  Raster out;
  std::unique_ptr<processes::filters::IAttributeFilter> filter;
  std::function<void()> peer;
};

std::unique_ptr<Fixture> MakeFixture(const Case& c) {
  const auto half = static_cast<std::uint32_t>(c.size / 2);
  const auto scale = static_cast<std::uint32_t>(c.scale);
  const std::uint32_t labelMargin = (half + scale - 1) / scale;
  const std::uint32_t labelSide = (c.side + scale - 1) / scale;
  auto f = std::make_unique<Fixture>(Fixture{
      Raster(RasterInfo(c.side, c.side, c.channels, c.samples, {.marginX = half, .marginY = half})),
      Raster(RasterInfo(labelSide, labelSide, 1, c.labels,
                        {.marginX = labelMargin, .marginY = labelMargin})),
      Raster(RasterInfo(c.side, c.side, c.channels, c.samples)),
      nullptr,
      {}});
  const std::vector<std::uint8_t> segments = Segments(f->attr.FullWidth(), f->attr.FullHeight());
  WithType(c.labels, [&]<typename A>(std::type_identity<A>) {
    std::transform(segments.begin(), segments.end(), static_cast<A*>(f->attr.Data()),
                   [](std::uint8_t label) { return static_cast<A>(label); });
  });
  // Textures of their own on each segment, so that values cluster as in an image.
  std::mt19937 random(5);
  WithType(c.samples, [&]<typename T>(std::type_identity<T>) {
    auto* const samples = static_cast<T*>(f->in.Data());
    const std::size_t count = std::size_t{f->in.FullWidth()} * f->in.FullHeight() * c.channels;
    for (std::size_t i = 0; i < count; ++i) {
      const std::uint8_t label = segments[i / c.channels * segments.size() / (count / c.channels)];
      samples[i] = static_cast<T>(20 + label * 2 + static_cast<int>(random() % 25));
    }
  });
  f->filter.reset(
      processes::filters::AttrFilterFactory(c.size, processes::filters::KernelShape::kSquare)
          .GetFilter(c.algo));
  f->filter->useAttributes = true;
  f->filter->attrNoDataValue = 255;
  AttributeParameters parameters;
  parameters.algo = c.algo;
  parameters.size = c.size;
  parameters.attrNoDataValue = 255;
  parameters.scale = c.scale;
  Fixture* const raw = f.get();
  WithType(c.samples, [&]<typename T>(std::type_identity<T>) {
    if constexpr (std::is_unsigned_v<T> || std::is_floating_point_v<T>) {
      WithType(c.labels, [&]<typename A>(std::type_identity<A>) {
        if constexpr (std::is_same_v<A, std::uint8_t> || std::is_same_v<A, std::int32_t> ||
                      std::is_same_v<A, float>) {
          raw->peer = [raw, parameters, side = c.side] {
            const RasterInfo rows(side, kPeerRows, raw->out.Channels(), raw->out.Type());
            Raster out(rows, raw->out.Data(), rows.DescribedSize());
            testsupport::ReferenceAttributeFilter<T, A>(parameters, raw->in, raw->attr, out,
                                                        nullptr, nullptr);
          };
        }
      });
    }
  });
  if (!f->peer) std::abort();
  return f;
}

void Register(const Case& c) {
  // Built on first use, so that selecting a few cases does not allocate all of them.
  const auto fixture = [c, cached = std::make_shared<std::unique_ptr<Fixture>>()]() -> Fixture& {
    if (!*cached) *cached = MakeFixture(c);
    return **cached;
  };
  const std::string name = std::string("attribute ") + NameOf(c.algo) + " " + NameOf(c.samples) +
                           "x" + std::to_string(c.channels) + " labels " + NameOf(c.labels) +
                           (c.scale > 1 ? "/" + std::to_string(c.scale) : "") + " " +
                           std::to_string(c.side) + " size " + std::to_string(c.size);
  const std::size_t sampleBytes = gobs::NativeDataType(c.samples).Description().BytesPerSample();
  const std::size_t bytes = std::size_t{c.side} * c.side * c.channels * sampleBytes;
  Compare({name, "plain loops", bytes,
           [fixture, c] {
             Fixture& f = fixture();
             omp_set_num_threads(1);
             if (!f.filter->ProcessWithAttributes(f.in, f.attr, f.out, c.scale, nullptr, nullptr)
                      .Ok()) {
               std::abort();
             }
           },
           [fixture] { fixture().peer(); }, static_cast<double>(c.side) / kPeerRows});
}

const bool kRegistered = [] {
  using enum NativeDataTypeCode;
  using enum FILTERALGO;
  for (const std::uint32_t channels : {1U, 3U}) {
    for (const int size : {3, 5, 9}) {
      for (const FILTERALGO algo : {kAverage, kMedian, kTrimmedMean}) {
        Register({algo, kUInt8, kUInt8, channels, 4096, size, 1});
      }
    }
  }
  for (const FILTERALGO algo : {kAverage, kMedian, kTrimmedMean}) {
    Register({algo, kUInt8, kUInt8, 1, 4096, 5, 4});
    Register({algo, kUInt8, kUInt8, 1, 4096, 15, 1});
    for (const auto& [samples, labels] : {std::pair{kUInt16, kUInt8},
                                          {kUInt16, kInt32},
                                          {kUInt8, kInt32},
                                          {kUInt32, kInt32},
                                          {kFloat32, kUInt8},
                                          {kFloat32, kFloat32},
                                          {kFloat64, kInt32}}) {
      Register({algo, samples, labels, 1, 2048, 5, 1});
    }
  }
  return true;
}();

}  // namespace
}  // namespace zarn::bench
