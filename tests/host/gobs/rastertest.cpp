// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <utility>
#include <vector>

#include "host/core/exception.h"
#include "host/gobs/raster.h"

namespace zarn::gobs {
namespace {

using enum NativeDataTypeCode;

constexpr std::uint32_t kMax = 4294967295U;

struct SizeCase {
  const char* what;
  std::uint32_t width, height, channels;
  NativeDataTypeCode code;
  BlockFrame frame;
  std::uint32_t size;
};

TEST(RasterInfo, AcceptsUpToThirtyTwoBitsOfBytes) {
  // 2^32 - 1 = 3 * 5 * 17 * 257 * 65537
  const SizeCase kCases[] = {
      {"one row", kMax, 1, 1, kUInt8, {}, kMax},
      {"two factors", 65535, 65537, 1, kInt8, {}, kMax},
      {"channels", 65537, 13107, 5, kUInt8, {}, kMax},
      {"margins", 1, 65535, 1, kUInt8, {.marginX = 32768, .marginY = 0}, kMax},
      {"last whole double", 536870911, 1, 1, kFloat64, {}, kMax - 7},
      {"nothing in a wide block", kMax, 0, kMax, kFloat64, {}, 0},
      {"margins around nothing", 0, 0, 1, kUInt8, {.marginX = 2, .marginY = 3}, 24},
      {"no channels", kMax, kMax, 0, kFloat64, {}, 0},
  };
  for (const SizeCase& c : kCases) {
    SCOPED_TRACE(c.what);
    EXPECT_EQ(RasterInfo(c.width, c.height, c.channels, c.code, c.frame).DescribedSize(), c.size);
  }
}

TEST(RasterInfo, RefusesMoreBytesColumnsOrRows) {
  const SizeCase kCases[] = {
      {"one byte more", 65536, 65536, 1, kUInt8, {}, 0},
      {"one sample more", 536870912, 1, 1, kFloat64, {}, 0},
      {"components and margins", 536870910, 1, 1, kComplexFloat32, {.marginX = 1, .marginY = 0}, 0},
      {"columns pass 32 bits", kMax, 1, 1, kUInt8, {.marginX = 1, .marginY = 0}, 0},
      {"columns wrap to a few", 10, 1, 1, kUInt8, {.marginX = 2147483648U, .marginY = 0}, 0},
      {"rows wrap to a few", 1, 10, 1, kUInt8, {.marginX = 0, .marginY = 2147483648U}, 0},
      {"columns of an empty block", 10, 0, 1, kUInt8, {.marginX = 2147483648U, .marginY = 0}, 0},
      {"64 bits wrap to nothing", 1U << 31, 1U << 31, 4, kUInt8, {}, 0},
      {"all factors huge",
       kMax,
       kMax,
       kMax,
       kComplexFloat64,
       {.marginX = kMax, .marginY = kMax},
       0},
  };
  for (const SizeCase& c : kCases) {
    SCOPED_TRACE(c.what);
    EXPECT_THROW(RasterInfo(c.width, c.height, c.channels, c.code, c.frame), DataException);
  }
}

TEST(Raster, OwnsZeroedMemory) {
  const RasterInfo info(31, 17, 3, kFloat32, {.marginX = 2, .marginY = 1});
  Raster raster(info);
  EXPECT_TRUE(raster.OwnsData());
  ASSERT_EQ(raster.DataSize(), 35U * 19 * 3 * 4);
  ASSERT_NE(raster.Data(), nullptr);
  auto* bytes = static_cast<std::uint8_t*>(raster.Data());
  for (std::uint32_t i = 0; i < raster.DataSize(); ++i) ASSERT_EQ(bytes[i], 0);
  bytes[raster.DataSize() - 1] = 1;
}

TEST(Raster, WrapsWithoutACopy) {
  std::vector<std::int16_t> samples(12, 7);
  const RasterInfo info(4, 3, 1, kInt16);
  {
    Raster raster(info, samples.data(), samples.size() * sizeof(samples[0]));
    EXPECT_FALSE(raster.OwnsData());
    EXPECT_EQ(raster.Data(), samples.data());
    EXPECT_EQ(raster.DataSize(), 24U);
    static_cast<std::int16_t*>(raster.Data())[5] = -3;
  }
  EXPECT_EQ(samples[5], -3);
}

TEST(Raster, CapsTheSizeOfWrappedMemoryInsteadOfWrappingIt) {
  std::array<std::uint8_t, 1> one{};
  const RasterInfo info(kMax, 1, 1, kUInt8);
  EXPECT_EQ(Raster(info, one.data(), std::size_t{1} << 32).DataSize(), kMax);
  EXPECT_EQ(Raster(info, one.data(), (std::size_t{1} << 32) + 5).DataSize(), kMax);
}

TEST(Raster, RefusesMisalignedMemory) {
  alignas(16) std::array<std::byte, 64> memory{};
  const struct {
    NativeDataTypeCode code;
    std::size_t alignment;
  } kCases[] = {{kInt8, 1},    {kUInt16, 2}, {kComplexInt16, 2},
                {kFloat32, 4}, {kInt64, 8},  {kComplexFloat64, 8}};
  for (const auto& c : kCases) {
    const RasterInfo info(1, 1, 1, c.code);
    for (std::size_t offset = 0; offset < 16; ++offset) {
      SCOPED_TRACE(::testing::Message() << static_cast<int>(c.code) << " at " << offset);
      if (offset % c.alignment == 0) {
        EXPECT_NO_THROW(Raster(info, memory.data() + offset, 32));
      } else {
        EXPECT_THROW(Raster(info, memory.data() + offset, 32), DataException);
      }
    }
  }
}

TEST(Raster, MovesItsMemoryAndLeavesNothingBehind) {
  Raster source(RasterInfo(8, 4, 1, kUInt8));
  void* const data = source.Data();
  Raster moved(std::move(source));
  EXPECT_EQ(moved.Data(), data);
  EXPECT_EQ(moved.DataSize(), 32U);
  EXPECT_TRUE(moved.OwnsData());
  EXPECT_EQ(source.Data(), nullptr);
  EXPECT_EQ(source.DataSize(), 0U);
  EXPECT_FALSE(source.OwnsData());

  Raster target(RasterInfo(100, 100, 3, kFloat64));
  target = std::move(moved);
  EXPECT_EQ(target.Data(), data);
  EXPECT_EQ(target.Width(), 8U);
  EXPECT_EQ(target.DescribedSize(), 32U);
  EXPECT_EQ(moved.Data(), nullptr);

  std::uint8_t wrapped = 0;
  target = Raster(RasterInfo(1, 1, 1, kUInt8), &wrapped, 1);
  EXPECT_EQ(target.Data(), &wrapped);
  EXPECT_FALSE(target.OwnsData());
}

}  // namespace
}  // namespace zarn::gobs
