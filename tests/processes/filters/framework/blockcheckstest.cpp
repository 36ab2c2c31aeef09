// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "processes/filters/framework/blockchecks.h"

namespace zarn::processes::filters::blockchecks {
namespace {

using gobs::BlockFrame;
using gobs::Raster;
using gobs::RasterInfo;
using enum gobs::NativeDataTypeCode;

const char* const kSizes = "Input and output rasters must be the same size (excluding margins).";
const char* const kMargins = "Raster Margins are too small.";
const char* const kTypes =
    "Input and output rasters must have the same data type and number of channels.";
const char* const kLists = "Fewer no-data values than channels.";
const char* const kInconsistent = "Raster block has no data or an inconsistent size.";
const char* const kOverlapping = "Input and output rasters overlap.";

// The message of a refusal, empty when the blocks pass.
std::string Text(const Refusal& refusal) {
  if (!refusal) return {};
  EXPECT_EQ(refusal->code, 0);
  return refusal->message;
}

TEST(BlockChecks, InputMustCoverTheOutput) {
  const struct {
    std::uint32_t inputWidth, inputHeight, outputWidth, outputHeight;
    bool passes;
  } kCases[] = {{100, 60, 100, 60, true},  {100, 60, 100, 50, true}, {100, 50, 100, 60, false},
                {101, 60, 100, 60, false}, {99, 60, 100, 60, false}, {0, 0, 0, 0, true},
                {100, 60, 100, 0, true},   {60, 100, 100, 60, false}};
  for (const auto& c : kCases) {
    // Margins do not count towards the sizes.
    const RasterInfo input(c.inputWidth, c.inputHeight, 1, kUInt8, {.marginX = 5, .marginY = 5});
    const RasterInfo output(c.outputWidth, c.outputHeight, 1, kUInt8);
    EXPECT_EQ(Text(CheckCoversOutput(input, output)), c.passes ? "" : kSizes)
        << c.inputWidth << "x" << c.inputHeight << " for " << c.outputWidth << "x"
        << c.outputHeight;
  }
}

TEST(BlockChecks, MarginsMustReachTheWindow) {
  const struct {
    std::uint32_t marginX, marginY;
    std::int64_t half;
    bool passes;
  } kCases[] = {{0, 0, 0, true},           {2, 2, 2, true},
                {1, 2, 2, false},          {2, 1, 2, false},
                {9, 9, 2, true},           {0, 0, -1, false},
                {9, 9, -1, false},         {9, 9, -1073741824, false},
                {9, 9, 1073741823, false}, {9, 9, std::int64_t{1} << 32, false}};
  for (const auto& c : kCases) {
    const RasterInfo input(10, 10, 1, kUInt8, {.marginX = c.marginX, .marginY = c.marginY});
    EXPECT_EQ(Text(CheckMargins(input, c.half)), c.passes ? "" : kMargins)
        << c.marginX << ", " << c.marginY << " for " << c.half;
  }
}

class CheckBlocksTest : public ::testing::Test {
 protected:
  std::string Check(const Raster& input, const Raster& output,
                    Aliasing aliasing = Aliasing::kForbidden) const {
    return Text(CheckBlocks(input, output, inputNoData, outputNoData, aliasing));
  }
  Raster Wrap(const RasterInfo& info, std::size_t offset, std::size_t size) {
    return {info, memory.data() + offset, size};
  }

  const RasterInfo info{5, 4, 3, kUInt8, BlockFrame{.marginX = 1, .marginY = 1}};  // 126 bytes
  alignas(8) std::array<std::uint8_t, 512> memory{};
  std::vector<double> inputNoData;
  std::vector<double> outputNoData;
};

TEST_F(CheckBlocksTest, PassesSoundBlocks) {
  EXPECT_EQ(Check(Wrap(info, 0, 126), Wrap(info, 126, 126)), "");
  EXPECT_EQ(Check(Wrap(info, 0, 300), Wrap(info, 300, 200)), "");
  const RasterInfo plain(5, 4, 3, kUInt8);
  EXPECT_EQ(Check(Wrap(info, 100, 126), Wrap(plain, 40, 60)), "");
  inputNoData = {1, 2, 3};
  outputNoData = {1, 2, 3, 4};
  EXPECT_EQ(Check(Wrap(info, 0, 126), Wrap(info, 126, 126)), "");
  const RasterInfo empty(0, 4, 3, kUInt8);
  EXPECT_EQ(Check(Raster(empty), Raster(empty)), "");
}

TEST_F(CheckBlocksTest, NamesTheFirstFaultInItsOrder) {
  // Each case has the faults of the cases below it, too, as far as they go together.
  const RasterInfo otherType(5, 4, 3, kInt8, info.Frame());
  const RasterInfo otherChannels(5, 4, 2, kUInt8, info.Frame());
  outputNoData = {1, 2};
  for (const RasterInfo& other : {otherType, otherChannels}) {
    EXPECT_EQ(Check(Wrap(info, 0, 126), Raster(other, nullptr, 0)), kTypes);
  }
  EXPECT_EQ(Check(Wrap(info, 0, 125), Wrap(info, 10, 126)), kLists);
  inputNoData = {1, 2};
  outputNoData = {};
  EXPECT_EQ(Check(Wrap(info, 0, 125), Wrap(info, 10, 126)), kLists);
  inputNoData = {};
  EXPECT_EQ(Check(Wrap(info, 0, 125), Wrap(info, 10, 126)), kInconsistent);
  EXPECT_EQ(Check(Wrap(info, 0, 126), Wrap(info, 10, 125)), kInconsistent);
  EXPECT_EQ(Check(Raster(info, nullptr, 126), Wrap(info, 10, 126)), kInconsistent);
  EXPECT_EQ(Check(Wrap(info, 10, 126), Raster(info, nullptr, 126)), kInconsistent);
  EXPECT_EQ(Check(Wrap(info, 0, 126), Wrap(info, 10, 126)), kOverlapping);
}

TEST_F(CheckBlocksTest, SeesAnySharedByte) {
  const RasterInfo small(2, 2, 3, kUInt8);  // 12 bytes
  const struct {
    std::size_t output;
    bool overlaps;
  } kCases[] = {{88, false}, {89, true}, {100, true}, {150, true}, {225, true}, {226, false}};
  for (const auto& c : kCases) {
    const std::string expected = c.overlaps ? kOverlapping : "";
    EXPECT_EQ(Check(Wrap(info, 100, 126), Wrap(small, c.output, 12)), expected) << c.output;
    EXPECT_EQ(Check(Wrap(small, c.output, 12), Wrap(info, 100, 126)), expected) << c.output;
  }
}

TEST_F(CheckBlocksTest, AllowsFilteringInPlaceOnlyWhereTheFilterSaysSo) {
  EXPECT_EQ(Check(Wrap(info, 8, 126), Wrap(info, 8, 126)), kOverlapping);
  EXPECT_EQ(Check(Wrap(info, 8, 126), Wrap(info, 8, 126), Aliasing::kSameBlockAllowed), "");
  EXPECT_EQ(Check(Wrap(info, 8, 126), Wrap(info, 9, 126), Aliasing::kSameBlockAllowed),
            kOverlapping);
}

}  // namespace
}  // namespace zarn::processes::filters::blockchecks
