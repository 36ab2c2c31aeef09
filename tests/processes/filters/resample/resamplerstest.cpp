// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "host/core/exception.h"
#include "host/utils/affinepostfm.h"
#include "processes/filters/factories/bilinearrsfactory.h"
#include "processes/filters/factories/cubicrsfactory.h"
#include "processes/filters/factories/directcopyrsfactory.h"
#include "processes/filters/factories/nearestrsfactory.h"
#include "processes/filters/resample/iresample.h"
#include "tests/support/testblock.h"

namespace zarn::processes::filters {
namespace {

using testsupport::SameBlocks;
using testsupport::TestBlock;
using Filter = std::unique_ptr<IFilter>;
using gobs::NativeDataTypeCode;

/// Half a pixel to the right; tells whether it still lives, and fails if asked to.
class HalfPixel : public utils::AffinePosTfm {
 public:
  explicit HalfPixel(bool* alive, bool fails = false)
      : AffinePosTfm({0.5, 1, 0, 0, 0, 1}), alive_(alive), fails_(fails) {
    *alive_ = true;
  }
  ~HalfPixel() override { *alive_ = false; }
  void Transform(int column, int row, int count, double* x, double* y) override {
    if (fails_) throw Exception("no positions today");
    AffinePosTfm::Transform(column, row, count, x, y);
  }

 private:
  bool* alive_;
  bool fails_;
};

std::string Process(IFilter& filter, const gobs::Raster& input, gobs::Raster output,
                    const std::uint8_t* mask = nullptr) {
  return filter.Process(input, output, 0, 0, mask).message;
}

template <typename Factory>
class Resamplers : public ::testing::Test {};
using Factories = ::testing::Types<NearestRSFactory, BilinearRSFactory, CubicRSFactory>;
TYPED_TEST_SUITE(Resamplers, Factories);

TYPED_TEST(Resamplers, OwnTheTransformOfTheirFactory) {
  bool alive = false;
  bool otherAlive = false;
  auto* const unused = new HalfPixel(&otherAlive);
  {
    const TypeParam original(new HalfPixel(&alive));
    TypeParam copy(unused);
    copy = TypeParam(original);
    Filter filter(copy.GetCPUFilter());
    EXPECT_TRUE(alive);
    filter.reset();
    EXPECT_FALSE(alive);
  }
  EXPECT_TRUE(otherAlive);
  delete unused;
}

TYPED_TEST(Resamplers, SampleTheInputAndFillWithTheFirstNoDataValue) {
  bool alive = false;
  const Filter filter(TypeParam(new HalfPixel(&alive)).GetCPUFilter());
  TestBlock<std::uint16_t> input({.width = 4, .height = 1, .channels = 2});
  const std::vector<int> samples{10, 1000, 20, 1100, 40, 1300, 70, 1600};
  std::copy(samples.begin(), samples.end(), input.Samples());
  TestBlock<std::uint16_t> output({.width = 4, .height = 1, .channels = 2});
  const std::vector<std::uint8_t> mask{1, 1, 1, 0};
  output.Fill(5);

  // Positions 1, 2, 3, 4; nearest takes the pixel to the right of the border.
  ASSERT_EQ(Process(*filter, input.Wrap(), output.Wrap(), mask.data()), "");
  const auto* const resampler = dynamic_cast<const IResample*>(filter.get());
  using Row = std::vector<std::uint16_t>;
  const auto method = static_cast<int>(resampler->GetResampleMethod());
  // Cubic: (9 * 10 + 9 * 20 - 40) / 17 and (9 * 20 + 9 * 40 - 10) / 17; then less than half is
  // left.
  const Row expected = method == 3   ? Row{20, 1100, 40, 1300, 5, 5, 5, 5}
                       : method == 0 ? Row{15, 1050, 30, 1200, 40, 1300, 5, 5}
                                     : Row{14, 1035, 31, 1212, 5, 5, 5, 5};
  EXPECT_EQ(Row(output.Samples(), output.Samples() + 8), expected) << "method " << method;

  const std::vector<double> noData{7, 8};
  filter->SetNoDataValues(nullptr, &noData);
  ASSERT_EQ(Process(*filter, input.Wrap(), output.Wrap(), mask.data()), "");
  EXPECT_EQ(output.At(3, 0, 0), 7);
  EXPECT_EQ(output.At(3, 0, 1), 7);
}

TYPED_TEST(Resamplers, RefuseBlocksAndLeaveTheOutputUntouched) {
  bool alive = false;
  const Filter filter(TypeParam(new HalfPixel(&alive)).GetCPUFilter());
  const TestBlock<float> input({.width = 5, .height = 4, .channels = 2});
  TestBlock<float> output({.width = 6, .height = 3, .channels = 2});
  TestBlock<float> margins({.width = 6, .height = 3, .channels = 2, .marginX = 0, .marginY = 1});
  TestBlock<std::int32_t> otherType({.width = 6, .height = 3, .channels = 2});
  const TestBlock<float> untouched = output;
  EXPECT_EQ(Process(*Filter(TypeParam(nullptr).GetCPUFilter()), margins.Wrap(), output.Wrap()),
            "No source position transform in resampling");
  EXPECT_EQ(Process(*filter, margins.Wrap(), output.Wrap()),
            "Raster margins are not supported in resampling.");
  EXPECT_EQ(Process(*filter, input.Wrap(), margins.Wrap()),
            "Raster margins are not supported in resampling.");
  EXPECT_EQ(Process(*filter, otherType.Wrap(), output.Wrap()),
            "Input and output rasters must have the same data type and number of channels.");
  EXPECT_EQ(Process(*filter, output.Wrap(), output.Wrap()), "Input and output rasters overlap.");
  EXPECT_EQ(Process(*filter, gobs::Raster(input.Info(), nullptr, 0), output.Wrap()),
            "Raster block has no data or an inconsistent size.");
  const std::vector<double> one{1};
  filter->SetNoDataValues(nullptr, &one);
  EXPECT_EQ(Process(*filter, input.Wrap(), output.Wrap()), "Fewer no-data values than channels.");
  const Filter failing(TypeParam(new HalfPixel(&alive, true)).GetCPUFilter());
  EXPECT_EQ(Process(*failing, input.Wrap(), output.Wrap()), "no positions today");
  EXPECT_TRUE(SameBlocks(output, untouched));
}

// The wording of the definition, pixel by pixel, for blocks without output margins.
template <typename T>
void CopyPixels(const TestBlock<T>& input, TestBlock<T>& output, std::int64_t dx, std::int64_t dy,
                const std::vector<T>& fill) {
  for (std::int64_t y = 0; y < output.shape().height; ++y) {
    for (std::int64_t x = 0; x < output.shape().width; ++x) {
      const bool covered = x + dx >= 0 && x + dx < input.shape().width && y + dy >= 0 &&
                           y + dy < input.shape().height;
      if (!covered && fill.empty()) continue;
      for (std::size_t c = 0; c < input.shape().channels; ++c) {
        output.Pixel(x, y)[c] = covered ? input.Pixel(x + dx, y + dy)[c] : fill[c];
      }
    }
  }
}

template <typename T>
class DirectCopy : public ::testing::Test {};
TYPED_TEST_SUITE(DirectCopy, testsupport::HandledTypes, testsupport::TypeNames);

TYPED_TEST(DirectCopy, TakesEveryPixelFromItsShiftedPlace) {
  using T = TypeParam;
  constexpr int kFar = 2147483647;
  const std::vector<double> zero{0, 0, 0};
  const std::vector<double> same{9, 9, 9};
  const std::vector<double> values{12.5, -3.5, 300};
  constexpr auto kLast =
      static_cast<T>(std::min(300.0, static_cast<double>(std::numeric_limits<T>::max())));
  const T first = std::is_floating_point_v<T> ? static_cast<T>(12.5) : T{13};
  const T second = std::is_unsigned_v<T>         ? T{0}
                   : std::is_floating_point_v<T> ? static_cast<T>(-3.5)
                                                 : static_cast<T>(-4);
  const struct {
    const std::vector<double>* list;
    std::vector<T> pixel;
  } kFills[] = {
      {nullptr, {}}, {&zero, {0, 0, 0}}, {&same, {9, 9, 9}}, {&values, {first, second, kLast}}};
  for (const int dx : {0, 1, -1, 6, -6, 7, -12, 30, kFar, -kFar - 1}) {
    for (const int dy : {0, 2, -2, 4, -4, 5, -9, 30, kFar, -kFar - 1}) {
      for (const auto& fill : kFills) {
        SCOPED_TRACE(testing::Message() << dx << ", " << dy << (fill.list ? " filled" : ""));
        const TestBlock<T> input(
            {.width = 7, .height = 5, .channels = 3, .marginX = 2, .marginY = 1});
        TestBlock<T> output({.width = 11, .height = 8, .channels = 3});
        output.Fill(77);
        TestBlock<T> expected = output;
        CopyPixels(input, expected, dx, dy, fill.pixel);
        const Filter filter(DirectCopyRSFactory(dx, dy).GetCPUFilter());
        filter->SetNoDataValues(nullptr, fill.list);
        ASSERT_EQ(Process(*filter, input.Wrap(), output.Wrap()), "");
        ASSERT_TRUE(SameBlocks(output, expected));
      }
    }
  }
}

TEST(DirectCopyRS, CorrectsTheShiftByTheOriginsIn64Bits) {
  TestBlock<std::uint8_t> input({.width = 6, .height = 4});
  const auto at = [](std::uint32_t x, std::uint32_t y) {
    return gobs::BlockFrame{.marginX = 0, .marginY = 0, .originX = x, .originY = y};
  };
  const struct {
    gobs::BlockFrame input;
    gobs::BlockFrame output;
    int columnShift, rowShift;
    int dx, dy;
  } kCases[] = {
      {at(10, 20), at(12, 19), 0, 0, 2, -1},
      {at(4294967295U, 0), at(0, 4294967295U), 2147483647, -2147483647 - 1, 99, 99},
      {at(4294967295U, 4294967290U), at(2147483649U, 2147483648U), 2147483647, 2147483644, 1, 2},
  };
  for (const auto& c : kCases) {
    const gobs::Raster from(gobs::RasterInfo(6, 4, 1, NativeDataTypeCode::kUInt8, c.input),
                            input.Samples(), 24);
    TestBlock<std::uint8_t> output({.width = 6, .height = 4});
    output.Fill(77);
    TestBlock<std::uint8_t> expected = output;
    CopyPixels(input, expected, c.dx, c.dy, {9});
    const Filter filter(DirectCopyRSFactory(c.columnShift, c.rowShift).GetCPUFilter());
    const std::vector<double> noData{9};
    filter->SetNoDataValues(nullptr, &noData);
    EXPECT_EQ(Process(*filter, from,
                      gobs::Raster(gobs::RasterInfo(6, 4, 1, NativeDataTypeCode::kUInt8, c.output),
                                   output.Samples(), 24)),
              "");
    EXPECT_TRUE(SameBlocks(output, expected));
  }
}

TEST(DirectCopyRS, SharesLargeBlocksOut) {
  const TestBlock<double> input({.width = 700, .height = 500, .channels = 1});
  TestBlock<double> output({.width = 690, .height = 510, .channels = 1});
  TestBlock<double> expected = output;
  CopyPixels(input, expected, 15, -3, {-1});
  const Filter filter(DirectCopyRSFactory(15, -3).GetCPUFilter());
  const std::vector<double> noData{-1};
  filter->SetNoDataValues(nullptr, &noData);
  EXPECT_EQ(Process(*filter, input.Wrap(), output.Wrap()), "");
  EXPECT_TRUE(SameBlocks(output, expected));
}

TEST(DirectCopyRS, FillsWholeRowsAsIfThereWereNoMargins) {
  const TestBlock<std::uint8_t> input({.width = 2, .height = 2});
  TestBlock<std::uint8_t> output({.width = 2, .height = 3, .marginX = 1});
  output.Fill(77);
  TestBlock<std::uint8_t> expected = output;
  // Four pixels from (0, 0) on: the first row, its right margin and the left one of the second row.
  for (std::ptrdiff_t i = 0; i < 4; ++i) expected.Pixel(0, 0)[i] = 9;
  expected.At(0, 2) = input.At(0, 0);
  expected.At(1, 2) = input.At(1, 0);
  const Filter filter(DirectCopyRSFactory(0, -2).GetCPUFilter());
  const std::vector<double> noData{9};
  filter->SetNoDataValues(nullptr, &noData);
  EXPECT_EQ(Process(*filter, input.Wrap(), output.Wrap()), "");
  EXPECT_TRUE(SameBlocks(output, expected));
}

TEST(DirectCopyRS, ServesComplexBlocksByTheirComponents) {
  const gobs::RasterInfo shape(2, 1, 2, NativeDataTypeCode::kComplexInt16);
  std::array<std::int16_t, 8> samples{1, 2, 3, 4, 5, 6, 7, 8};
  const Filter filter(DirectCopyRSFactory(1, 0).GetCPUFilter());
  const auto copied = [&](const std::vector<double>& noData) {
    std::array<std::int16_t, 8> result{};
    filter->SetNoDataValues(nullptr, &noData);
    EXPECT_EQ(Process(*filter, gobs::Raster(shape, samples.data(), 16),
                      gobs::Raster(shape, result.data(), 16)),
              "");
    return result;
  };
  using Result = std::array<std::int16_t, 8>;
  EXPECT_EQ(copied({-1, -2}), (Result{5, 6, 7, 8, -1, 0, -2, 0}));
  EXPECT_EQ(copied({-1, -2, -3, -4}), (Result{5, 6, 7, 8, -1, -2, -3, -4}));
  EXPECT_EQ(copied({0, 0}), (Result{5, 6, 7, 8, 0, 0, 0, 0}));
}

TEST(DirectCopyRS, RefusesWhatItCannotCopy) {
  const Filter filter(DirectCopyRSFactory(1, 0).GetCPUFilter());
  EXPECT_EQ(static_cast<int>(dynamic_cast<const IResample&>(*filter).GetResampleMethod()), 25);
  TestBlock<float> block({.width = 3, .height = 2, .channels = 2});
  TestBlock<float> output({.width = 3, .height = 2, .channels = 2});
  const std::vector<double> one{1};
  filter->SetNoDataValues(&one, nullptr);
  EXPECT_EQ(Process(*filter, block.Wrap(), output.Wrap()), "");
  filter->SetNoDataValues(nullptr, &one);
  EXPECT_EQ(Process(*filter, block.Wrap(), output.Wrap()), "Fewer no-data values than channels.");
  gobs::DataType unknown;
  unknown.bits = 24;
  const gobs::Raster odd(gobs::RasterInfo(1, 1, 1, unknown));
  EXPECT_THROW(Process(*filter, odd, output.Wrap()), Exception);
}

}  // namespace
}  // namespace zarn::processes::filters
