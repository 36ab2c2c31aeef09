// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <omp.h>

#include <cmath>
#include <limits>
#include <optional>
#include <vector>

#include "processes/filters/cutline/cutlineblending.h"
#include "tests/support/conversionreference.h"
#include "tests/support/cutlinescene.h"
#include "tests/support/testblock.h"

namespace zarn::processes::filters {
namespace {

using testsupport::PolygonKind;
using testsupport::RandomNumbers;
using testsupport::RandomPolygon;
using testsupport::Rings;
using testsupport::SameBlocks;
using testsupport::Shape;
using testsupport::TestBlock;

constexpr PolygonKind kKinds[] = {PolygonKind::kStar,     PolygonKind::kHole,
                                  PolygonKind::kScribble, PolygonKind::kAligned,
                                  PolygonKind::kTeeth,    PolygonKind::kFlat};

// The share of the source in each pixel: what becomes of 1 pasted onto 0.
TestBlock<double> Shares(CPUCutlineBlending& filter, const Shape& shape, std::uint32_t blockX,
                         std::uint32_t blockY) {
  TestBlock<double> source(shape);
  TestBlock<double> mosaic(shape);
  source.Fill(1.0);
  mosaic.Fill(0.0);
  gobs::Raster output = mosaic.Wrap();
  EXPECT_TRUE(filter.Process(source.Wrap(), output, blockX, blockY, nullptr).Ok());
  return mosaic;
}

double ShareFor(double weight) {
  if (weight >= 1) return 1;
  return weight <= -1 ? 0 : 0.5 * weight + 0.5;
}

TEST(CutlineWeights, EqualTheDefinitionBitForBitAndTheTextbook) {
  const Shape shape{.width = 110, .height = 100};
  std::uint64_t seed = 0;
  for (const PolygonKind kind : kKinds) {
    for (const unsigned blend : {0U, 1U, 10U, 50U}) {
      for (const int count : {3, 40, 300}) {
        for (const bool withTile : {false, true}) {
          ++seed;
          SCOPED_TRACE(testing::Message() << "kind " << int(kind) << " blend " << blend << " count "
                                          << count << " tile " << withTile);
          const std::uint32_t left = seed % 3 == 0 ? 0 : 1000;
          const double cx = left + 55.25;
          Rings cutline = RandomPolygon(kind, seed, cx, 46.75, 80, count);
          Rings tile = RandomPolygon(kKinds[seed % 5], ~seed, cx, 50, 85, 8);
          CPUCutlineBlending filter(cutline.Param(), blend);
          if (withTile) filter.SetTileShape(tile.Param());
          const TestBlock<double> shares = Shares(filter, shape, left, 0);
          int wrong = 0;
          for (std::ptrdiff_t y = 0; y < shape.height; ++y) {
            for (std::ptrdiff_t x = 0; x < shape.width; ++x) {
              const double px = static_cast<double>(x) + left + 0.5;
              const double py = static_cast<double>(y) + 0.5;
              const double share = shares.At(x, y);
              const double defined = filter.BlendWeight(px, py);
              if (share != ShareFor(defined) && ++wrong < 5) {
                ADD_FAILURE() << share << " at " << x << ", " << y << " for weight " << defined;
              }
              if (withTile || kind == PolygonKind::kAligned || kind == PolygonKind::kFlat) continue;
              const double distance = testsupport::SignedDistance(cutline, px, py);
              if (std::abs(distance) < 1e-6) continue;
              const double weight = blend == 0 ? std::copysign(2.0, distance) : distance / blend;
              if (std::abs(share - ShareFor(weight)) > 1e-9 && ++wrong < 5) {
                ADD_FAILURE() << share << " at " << x << ", " << y << ", distance " << distance;
              }
            }
          }
          ASSERT_EQ(wrong, 0);
        }
      }
    }
  }
}

TEST(CutlineWeights, FollowTheRulesOfThePointOnAnEdge) {
  // An aligned square whose sides run through pixel centres, and one of its sides missing.
  Rings closed;
  closed.AddRing({{2.5, 2.5}, {8.5, 2.5}, {8.5, 8.5}, {2.5, 8.5}, {2.5, 2.5}});
  CPUCutlineBlending filter(closed.Param(), 2);
  const TestBlock<double> shares = Shares(filter, {.width = 12, .height = 12}, 0, 0);
  EXPECT_EQ(shares.At(2, 5), 0.5);
  EXPECT_EQ(shares.At(8, 5), 0.5);
  EXPECT_EQ(shares.At(5, 2), 0.5);
  EXPECT_EQ(shares.At(3, 5), 0.75);
  EXPECT_EQ(shares.At(1, 5), 0.25);
  EXPECT_EQ(shares.At(4, 5), 1.0);
  EXPECT_EQ(shares.At(0, 5), 0.0);

  Rings open;
  open.AddRing({{2.5, 2.5}, {8.5, 2.5}, {8.5, 8.5}, {2.5, 8.5}});
  CPUCutlineBlending hard(open.Param(), 0);
  const TestBlock<double> half = Shares(hard, {.width = 12, .height = 12}, 0, 0);
  EXPECT_EQ(half.At(0, 5), 1.0);
  EXPECT_EQ(half.At(8, 5), 1.0);
  EXPECT_EQ(half.At(9, 5), 0.0);
}

TEST(CutlineWeights, OddPolygonsAdmitWhatTheyShould) {
  const Shape shape{.width = 70, .height = 30};
  const auto sum = [&](Rings& rings, unsigned blend, std::uint32_t x, std::uint32_t y) {
    CPUCutlineBlending filter(rings.Param(), blend);
    filter.SetOffset(x, y);
    const TestBlock<double> shares = Shares(filter, shape, 0, 0);
    double total = 0;
    for (std::size_t i = 0; i < shares.SampleCount(); ++i) total += shares.Samples()[i];
    return total;
  };
  for (const double bad : {std::nan(""), std::numeric_limits<double>::infinity()}) {
    Rings broken;
    broken.AddRing({{0, 0}, {60, 0}, {60, 20}, {bad, 20}, {0, 0}});
    EXPECT_EQ(sum(broken, 0, 0, 0), 0);
    EXPECT_EQ(sum(broken, 10, 0, 0), 0);
    CPUCutlineBlending filter({}, 0);
    filter.SetTileShape(broken.Param());
    EXPECT_EQ(Shares(filter, shape, 0, 0).At(5, 5), 0.0);
  }
  // Over a thousand million rows, and far beyond all rasters; two thirds across.
  Rings tall;
  tall.AddRing({{10, -1e18}, {50, -1e18}, {50, 4e9}, {10, 4e9}, {10, -1e18}});
  for (const std::uint32_t row : {0U, 2147483000U}) EXPECT_EQ(sum(tall, 0, 0, row), 40 * 30);
  EXPECT_NEAR(sum(tall, 0xFFFFFFFF, 0, 0), 0.5 * 70 * 30, 1e-4) << "all near the edge";
}

template <typename T>
class Blending : public ::testing::Test {};
TYPED_TEST_SUITE(Blending, testsupport::HandledTypes, testsupport::TypeNames);

struct Scene {
  Shape shape;
  unsigned blend = 10;
  bool tile = false;
  bool cutline = true;
  bool mask = false;
  bool sourceNoData = false;
  bool mosaicNoData = false;
  int mapChannel = 0;
};

// Process over the whole image, in tiles of the given size and with the given threads, beside the
// rules pixel by pixel.
template <typename T>
void ExpectBlended(const Scene& scene, std::uint64_t seed) {
  const Shape& shape = scene.shape;
  const std::size_t channels = shape.channels;
  const std::size_t pixels = std::size_t{shape.width} * shape.height;
  RandomNumbers random(seed);
  TestBlock<T> source(shape);
  TestBlock<T> mosaic(shape);
  const std::vector<double> sourceNoData(channels, 3.4);
  const std::vector<double> mosaicNoData(channels, 5);
  std::vector<std::uint8_t> mask(pixels, 1);
  for (std::size_t i = 0; i < pixels; ++i) {
    for (std::size_t c = 0; c < channels; ++c) {
      using Limits = std::numeric_limits<T>;
      source.Samples()[i * channels + c] =
          random.Percent(5) ? Limits::max() : static_cast<T>(random.Below(127));
      mosaic.Samples()[i * channels + c] =
          random.Percent(5) ? Limits::lowest() : static_cast<T>(random.Below(127));
      if (std::is_floating_point_v<T>) mosaic.Samples()[i * channels + c] += T(0.3);
    }
    if (random.Percent(15)) {
      std::fill_n(source.Samples() + i * channels, channels,
                  testsupport::ReferenceListEntry<T>(3.4));
    }
    if (random.Percent(30)) std::fill_n(mosaic.Samples() + i * channels, channels, T{5});
    if (random.Percent(15)) mask[i] = 0;
  }
  const double size = 0.8 * shape.width;
  Rings cutline = RandomPolygon(PolygonKind::kStar, seed, 4000 + shape.width / 2.0,
                                300 + shape.height / 2.0, size, 60);
  Rings tile = RandomPolygon(PolygonKind::kScribble, seed, 4000 + shape.width / 2.0,
                             300 + shape.height / 2.0, size, 9);
  CPUCutlineBlending filter(scene.cutline ? cutline.Param() : PolygonParam{}, scene.blend);
  if (scene.tile) filter.SetTileShape(tile.Param());
  filter.SetOffset(3000, 100);
  filter.SetNoDataValues(scene.sourceNoData ? &sourceNoData : nullptr,
                         scene.mosaicNoData ? &mosaicNoData : nullptr);

  TestBlock<std::int16_t> map({.width = shape.width, .height = shape.height, .channels = 3});
  map.Fill(-1);
  TestBlock<T> expected = mosaic;
  TestBlock<std::int16_t> expectedMap = map;
  for (std::size_t p = 0; p < pixels; ++p) {
    const T* const s = source.Samples() + p * channels;
    T* const t = expected.Samples() + p * channels;
    const auto all = [&](const T* pixel, double value) {
      return std::all_of(pixel, pixel + channels,
                         [&](T v) { return v == testsupport::ReferenceListEntry<T>(value); });
    };
    if (scene.mask && mask[p] == 0) continue;
    if (scene.sourceNoData && all(s, 3.4)) continue;
    const double w = filter.BlendWeight(static_cast<double>(p % shape.width) + 4000.5,
                                        static_cast<double>(p / shape.width) + 300.5);
    if (w <= -1) continue;
    const double a = 0.5 * w + 0.5;
    const bool whole = w >= 1 || (scene.mosaicNoData && all(t, 5));
    for (std::size_t c = 0; c < channels; ++c) {
      t[c] =
          whole
              ? s[c]
              : static_cast<T>(static_cast<double>(s[c]) * a + static_cast<double>(t[c]) * (1 - a));
    }
    if (scene.mapChannel > 0 && (whole || a >= 0.5)) {
      const auto channel = static_cast<std::size_t>(scene.mapChannel);
      expectedMap.Samples()[channel * p + channel - 1] = static_cast<std::int16_t>(70000 + 7);
    }
  }

  for (const int threads : {1, 3}) {
    omp_set_num_threads(threads);
    TestBlock<T> actual = mosaic;
    TestBlock<std::int16_t> actualMap = map;
    gobs::Raster output = actual.Wrap();
    gobs::Raster mapBlock = actualMap.Wrap();
    if (scene.mapChannel > 0) filter.SetSourceMap(&mapBlock, scene.mapChannel, 70000 + 7);
    const FilterResult result =
        filter.Process(source.Wrap(), output, 1000, 200, scene.mask ? mask.data() : nullptr);
    ASSERT_TRUE(result.Ok()) << result.message;
    EXPECT_TRUE(SameBlocks(actual, expected));
    EXPECT_TRUE(SameBlocks(actualMap, expectedMap));
  }
  omp_set_num_threads(2);
  filter.SetSourceMap(nullptr, 0, 0);
  // The same in tiles.
  if (scene.mask || scene.mapChannel > 0) return;
  for (const std::uint32_t side : {37U, 64U}) {
    TestBlock<T> actual = mosaic;
    for (std::uint32_t y = 0; y < shape.height; y += side) {
      for (std::uint32_t x = 0; x < shape.width; x += side) {
        const Shape part{.width = std::min(side, shape.width - x),
                         .height = std::min(side, shape.height - y),
                         .channels = shape.channels};
        TestBlock<T> from(part);
        TestBlock<T> to(part);
        const auto copyRows = [&](TestBlock<T>& image, TestBlock<T>& block, bool back) {
          for (std::uint32_t row = 0; row < part.height; ++row) {
            T* const a = image.Pixel(x, y + row);
            T* const b = block.Pixel(0, row);
            if (back) {
              std::copy_n(b, part.width * channels, a);
            } else {
              std::copy_n(a, part.width * channels, b);
            }
          }
        };
        copyRows(source, from, false);
        copyRows(actual, to, false);
        gobs::Raster output = to.Wrap();
        ASSERT_TRUE(filter.Process(from.Wrap(), output, 1000 + x, 200 + y, nullptr).Ok());
        copyRows(actual, to, true);
      }
    }
    EXPECT_TRUE(SameBlocks(actual, expected)) << "tiles of " << side;
  }
}

TYPED_TEST(Blending, FollowsTheRulesForAnyThreadsAndTiles) {
  std::uint64_t seed = 1;
  for (const std::uint32_t channels : {1U, 2U, 3U, 4U, 5U}) {
    for (const unsigned blend : {0U, 10U, 50U}) {
      for (const std::uint32_t width : {63U, 128U, 201U}) {
        Scene scene{
            .shape = {.width = width, .height = width > 200 ? 140U : 90U, .channels = channels},
            .blend = blend};
        scene.tile = seed % 3 == 0;
        scene.cutline = seed % 7 != 0;
        scene.mask = seed % 2 == 0;
        scene.sourceNoData = seed % 5 < 3;
        scene.mosaicNoData = seed % 4 < 2;
        scene.mapChannel = static_cast<int>(seed % 4);
        SCOPED_TRACE(testing::Message() << "seed " << seed);
        ExpectBlended<TypeParam>(scene, seed++);
      }
    }
  }
}

TEST(CutlineBlending, BlendsBothPartsOfComplexSamples) {
  // Complex of short; the no-data pixel is 7 + 0i.
  Rings square;
  square.AddRing({{2, 0}, {99, 0}, {99, 9}, {2, 9}, {2, 0}});
  CPUCutlineBlending filter(square.Param(), 2);
  const std::vector<double> noData = {7};
  filter.SetNoDataValues(&noData, nullptr);
  const gobs::RasterInfo info(4, 1, 1, gobs::NativeDataTypeCode::kComplexInt16);
  std::vector<std::int16_t> source = {100, -50, 100, -50, 7, 0, 7, 1};
  std::vector<std::int16_t> mosaic = {20, 30, 20, 30, 20, 30, 20, 30};
  gobs::Raster output(info, mosaic.data(), 16);
  ASSERT_TRUE(filter.Process({info, source.data(), 16}, output, 0, 4, nullptr).Ok());
  // Weights -0.75, -0.25, 0.25, 0.75.
  EXPECT_EQ(mosaic, (std::vector<std::int16_t>{30, 20, 50, 0, 20, 30, 8, 4}));
}

TEST(CutlineBlending, StopsAtNoDataWhereTheSourceIsWanted) {
  Rings square;
  square.AddRing({{4, 4}, {60, 4}, {60, 180}, {4, 180}, {4, 4}});
  const Shape shape{.width = 100, .height = 200};
  const std::vector<double> noData = {0};
  for (const unsigned blend : {0U, 4U}) {
    CPUCutlineBlending filter(square.Param(), blend);
    filter.SetNoDataValues(&noData, nullptr);
    filter.SetStopOnNodata(true);
    const auto run = [&](std::ptrdiff_t x, std::ptrdiff_t y, TestBlock<double>& mosaic) {
      TestBlock<double> source(shape);
      source.Fill(9);
      source.At(x, y) = 0;
      mosaic.Fill(2);
      gobs::Raster output = mosaic.Wrap();
      return filter.Process(source.Wrap(), output, 0, 0, nullptr).message;
    };
    TestBlock<double> mosaic(shape);
    for (const std::ptrdiff_t x : {2, 3, 60, 63, 64, 99}) EXPECT_EQ(run(x, 50, mosaic), "");
    EXPECT_EQ(mosaic.At(30, 50), 9);
    for (const std::ptrdiff_t x : {4, 6, 30, 59}) {
      omp_set_num_threads(1);
      EXPECT_EQ(run(x, 50, mosaic), "Cutline operation aborted.");
      EXPECT_EQ(mosaic.At(30, 49), 9) << "the row before";
      EXPECT_EQ(mosaic.At(30, 50), x > 30 ? 9 : 2) << "stops in its row";
      EXPECT_EQ(mosaic.At(30, 51), 2) << "the rows after";
      omp_set_num_threads(2);
      EXPECT_EQ(run(x, 50, mosaic), "Cutline operation aborted.");
    }
  }
}

TEST(CutlineBlending, RefusesBeforeItWrites) {
  using enum gobs::NativeDataTypeCode;
  constexpr const char* kUnknownText = "Unknown raster block data type for color balancing";
  constexpr const char* kMap = "Invalid source map size";
  struct Case {
    gobs::RasterInfo output;
    std::optional<gobs::RasterInfo> map;
    int mapChannel;
    const char* message;
  };
  const gobs::RasterInfo same(8, 4, 2, kUInt8);
  constexpr const char* kDiffer = "Raster dimensions don't match.";
  const Case cases[] = {
      {{7, 4, 2, kUInt8}, {}, 0, kDiffer},
      {{8, 5, 2, kUInt8}, {}, 0, kDiffer},
      {{8, 4, 1, kUInt8}, {}, 0, kDiffer},
      {{8, 4, 2, kInt8}, {}, 0, kDiffer},
      {{8, 4, 2, kUInt8, {.marginX = 1}}, {}, 0, kDiffer},
      {{8, 4, 2, kUInt8, {.originY = 1}}, {}, 0, kDiffer},
      {same, gobs::RasterInfo(7, 4, 2, kUInt8), 1, kMap},
      {same, gobs::RasterInfo(8, 3, 2, kUInt8), 1, kMap},
      {same, gobs::RasterInfo(8, 4, 2, kUInt8), 3, kMap},
      {same, gobs::RasterInfo(8, 4, 2, kInt64), 1, kUnknownText},
      {same, gobs::RasterInfo(8, 4, 2, kComplexFloat64), 1, kUnknownText},
      {same, gobs::RasterInfo(8, 4, 2, kComplexFloat32), 2, ""},
  };
  for (const Case& c : cases) {
    CPUCutlineBlending filter({}, 3);
    gobs::Raster input(same);
    std::fill_n(static_cast<std::uint8_t*>(input.Data()), same.DescribedSize(), 9);
    gobs::Raster output(c.output);
    std::optional<gobs::Raster> map;
    if (c.map) filter.SetSourceMap(&map.emplace(*c.map), c.mapChannel, 1);
    EXPECT_EQ(filter.Process(input, output, 0, 0, nullptr).message, c.message);
    EXPECT_EQ(static_cast<const std::uint8_t*>(output.Data())[0], *c.message == 0 ? 9 : 0);
  }
  for (const auto code : {kInt64, kUInt64, kComplexInt32, kComplexFloat64}) {
    CPUCutlineBlending filter({}, 3);
    gobs::Raster input(gobs::RasterInfo(2, 2, 1, code));
    gobs::Raster output(gobs::RasterInfo(2, 2, 1, code));
    EXPECT_EQ(filter.Process(input, output, 0, 0, nullptr).message, kUnknownText);
  }
  CPUCutlineBlending filter({}, 3);
  gobs::Raster input(same);
  gobs::Raster output(same);
  filter.SetSourceMap(&output, 1, 1);
  EXPECT_EQ(filter.Process(input, output, 0, 0, nullptr).message,
            "Input and output rasters overlap.");
  filter.SetSourceMap(nullptr, 0, 0);
  const std::vector<double> one = {1};
  filter.SetNoDataValues(&one, nullptr);
  EXPECT_EQ(filter.Process(input, output, 0, 0, nullptr).message,
            "Fewer no-data values than channels.");
}

}  // namespace
}  // namespace zarn::processes::filters
