// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <sys/mman.h>

#include <array>
#include <cstring>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "host/core/exception.h"
#include "processes/filters/colorbalance/icolorbalance.h"
#include "processes/filters/factories/adaptivenormfactory.h"
#include "processes/filters/factories/dodgingcbfactory.h"
#include "processes/filters/factories/gainoffsetcbfactory.h"
#include "processes/filters/factories/hotspotnormfactory.h"
#include "processes/filters/factories/lutcbfactory.h"
#include "processes/filters/factories/minmaxlutcbfactory.h"
#include "processes/filters/factories/neighborhoodcbfactory.h"
#include "processes/filters/factories/ordernormfactory.h"
#include "processes/filters/normalization/inormalization.h"

// What all balancers and normalisation filters refuse, and what their factories promise.

namespace zarn::processes::filters {
namespace {

using gobs::NativeDataTypeCode;
using List = std::vector<double>;

const List kOne = {1, 1, 1};
std::array<unsigned char, 256> g_table{};
const std::vector<unsigned char*> kTables = {g_table.data(), g_table.data(), g_table.data()};
const std::vector<MOSDodgingCoeffs> kCoeffs(3);

struct Family {
  std::string name;
  std::function<IFilter*()> make;       // for three channels
  std::function<IFilter*()> makeShort;  // for two
  int kind;
  bool allTypes;  // through the dispatcher, which throws
};

std::vector<Family> Families() {
  static const List two = {1, 1};
  static const std::vector<unsigned char*> twoTables(kTables.begin(), kTables.begin() + 2);
  static const std::vector<MOSDodgingCoeffs> twoCoeffs(2);
  const List six(6);
  return {
      {"gain/offset", [] { return GainOffsetCBFactory(kOne, kOne).GetCPUFilter(); },
       [] { return GainOffsetCBFactory(kOne, two).GetCPUFilter(); }, 2, false},
      {"LUT", [] { return LUTCBFactory(kTables).GetCPUFilter(); },
       [] { return LUTCBFactory(twoTables).GetCPUFilter(); }, 0, false},
      {"min/max LUT", [] { return MinMaxLUTCBFactory(kTables, kOne, kOne).GetCPUFilter(); },
       [] { return MinMaxLUTCBFactory(kTables, kOne, two).GetCPUFilter(); }, 1, false},
      {"polynomial",
       [] {
         return NeighborhoodCBFactory({kOne, kOne, kOne}, kOne).GetCPUFilter();
       },
       [] {
         return NeighborhoodCBFactory({kOne, kOne}, two).GetCPUFilter();
       },
       3, true},
      {"dodging", [] { return DodgingCBFactory(kCoeffs, {}, nullptr, nullptr).GetCPUFilter(); },
       [] { return DodgingCBFactory(twoCoeffs, {}, nullptr, nullptr).GetCPUFilter(); }, 4, true},
      {"hot spot",
       [=] {
         return HotSpotNormFactory({six, six, six}, 9, 9).GetCPUFilter();
       },
       [=] {
         return HotSpotNormFactory({six, six, two}, 9, 9).GetCPUFilter();
       },
       0, false},
  };
}

gobs::Raster Block(std::uint32_t width, std::uint32_t height, std::uint32_t channels,
                   NativeDataTypeCode code = NativeDataTypeCode::kUInt8) {
  return gobs::Raster(gobs::RasterInfo(width, height, channels, code));
}

void ExpectRefusal(IFilter& filter, const gobs::Raster& input, gobs::Raster& output,
                   const std::string& message) {
  std::memset(output.Data(), 77, output.DataSize());
  const FilterResult result = filter.Process(input, output, 0, 0, nullptr);
  EXPECT_EQ(result.code, 0);
  EXPECT_EQ(result.message, message);
  const auto* const bytes = static_cast<const unsigned char*>(output.Data());
  EXPECT_TRUE(
      std::all_of(bytes, bytes + output.DataSize(), [](unsigned char b) { return b == 77; }));
}

TEST(ColorBalance, RefusesWhatItCannotDoAndLeavesTheOutput) {
  const std::string sizes = "Input and output rasters must be the same size (excluding margins).";
  const std::string types =
      "Input and output rasters must have the same data type and number of channels.";
  const std::string parameters = "Fewer parameters than channels.";
  for (const Family& family : Families()) {
    SCOPED_TRACE(family.name);
    const std::unique_ptr<IFilter> filter(family.make());
    const gobs::Raster input = Block(8, 6, 3);
    for (auto [width, height] : {std::pair(8U, 5U), {8U, 7U}, {7U, 6U}}) {
      gobs::Raster output = Block(width, height, 3);
      ExpectRefusal(*filter, input, output, sizes);
    }
    gobs::Raster fewer = Block(8, 6, 2);
    ExpectRefusal(*filter, input, fewer, types);
    gobs::Raster other = Block(8, 6, 3, NativeDataTypeCode::kInt8);
    ExpectRefusal(*filter, input, other, types);
    gobs::Raster output = Block(8, 6, 3);
    ExpectRefusal(*std::unique_ptr<IFilter>(family.makeShort()), input, output, parameters);
    const List two = {1, 2};
    const List three = {1, 2, 3};
    filter->SetNoDataValues(&two, &three);
    ExpectRefusal(*filter, input, output, "Fewer no-data values than channels.");
    filter->SetNoDataValues(&three, &two);
    ExpectRefusal(*filter, input, output, "Fewer no-data values than channels.");
    filter->SetNoDataValues(nullptr, nullptr);
    // The same block may be both; blocks that share all but a row, or only a byte, may not.
    std::vector<unsigned char> memory(2 * 144);
    const gobs::RasterInfo info(8, 6, 3, NativeDataTypeCode::kUInt8);
    const gobs::Raster first(info, memory.data(), 144);
    for (const std::size_t shift : {24U, 143U}) {
      gobs::Raster second(info, memory.data() + shift, 144);
      ExpectRefusal(*filter, first, second, "Input and output rasters overlap.");
    }
    for (const std::size_t shift : {0U, 144U}) {
      gobs::Raster second(info, memory.data() + shift, 144);
      EXPECT_TRUE(filter->Process(first, second, 0, 0, nullptr).Ok()) << shift;
    }
    gobs::Raster empty = Block(0, 0, 3);
    EXPECT_TRUE(filter->Process(empty, empty, 0, 0, nullptr).Ok());
  }
}

TEST(ColorBalance, NeverTouchesExcludedPixelsWithoutAnOutputValue) {
  // Others may be writing there: reading and writing back the same would undo it.
  const std::size_t bytes = 3 * 4096;
  void* const memory = mmap(nullptr, bytes, PROT_READ, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  ASSERT_NE(memory, MAP_FAILED);
  const std::vector<std::uint8_t> mask(4096, 0);
  for (const Family& family : Families()) {
    SCOPED_TRACE(family.name);
    const std::unique_ptr<IFilter> filter(family.make());
    for (const auto code : {NativeDataTypeCode::kUInt8, NativeDataTypeCode::kUInt16}) {
      const std::uint32_t height = code == NativeDataTypeCode::kUInt8 ? 64 : 32;
      gobs::Raster output(gobs::RasterInfo(64, height, 3, code), memory, bytes);
      EXPECT_TRUE(filter->Process(Block(64, height, 3, code), output, 0, 0, mask.data()).Ok());
    }
  }
  munmap(memory, bytes);
}

TEST(ColorBalance, KnowsItsSampleTypes) {
  for (const Family& family : Families()) {
    SCOPED_TRACE(family.name);
    const std::unique_ptr<IFilter> filter(family.make());
    for (const auto code : {NativeDataTypeCode::kInt64, NativeDataTypeCode::kUInt64}) {
      gobs::Raster output = Block(8, 6, 3, code);
      if (family.allTypes) {
        EXPECT_TRUE(filter->Process(Block(8, 6, 3, code), output, 0, 0, nullptr).Ok());
      } else {
        ExpectRefusal(*filter, Block(8, 6, 3, code), output,
                      "Unknown raster block data type for color balancing");
      }
    }
    const auto complexCode = static_cast<NativeDataTypeCode>(13);
    gobs::Raster output = Block(8, 6, 3, complexCode);
    if (family.allTypes) {
      EXPECT_THROW(filter->Process(Block(8, 6, 3, complexCode), output, 0, 0, nullptr), Exception);
    } else {
      ExpectRefusal(*filter, Block(8, 6, 3, complexCode), output,
                    "Unknown raster block data type for color balancing");
    }
  }
}

TEST(ColorBalance, FiltersTellTheirKind) {
  for (const Family& family : Families()) {
    const std::unique_ptr<IFilter> filter(family.make());
    if (family.name == "hot spot") {
      EXPECT_EQ(static_cast<int>(dynamic_cast<INormalization&>(*filter).Kind()), family.kind);
    } else {
      EXPECT_EQ(static_cast<int>(dynamic_cast<IColorBalance&>(*filter).Kind()), family.kind);
    }
  }
  const std::unique_ptr<IFilter> adaptive(AdaptiveNormFactory(0.5).GetCPUFilter());
  const std::unique_ptr<IFilter> order(OrderNormFactory(3).GetCPUFilter());
  EXPECT_EQ(static_cast<int>(dynamic_cast<INormalization&>(*adaptive).Kind()), 1);
  EXPECT_EQ(static_cast<int>(dynamic_cast<INormalization&>(*order).Kind()), 2);
  for (IFilter* const filter : {adaptive.get(), order.get()}) {
    gobs::Raster output = Block(2, 2, 1, NativeDataTypeCode::kInt64);
    std::memset(output.Data(), 5, output.DataSize());
    const FilterResult result = filter->Process(Block(9, 9, 3), output, 0, 0, nullptr);
    EXPECT_EQ(result.code, 1);
    EXPECT_EQ(result.message, "");
    EXPECT_EQ(*static_cast<std::int64_t*>(output.Data()), 0x0505050505050505);
  }
}

TEST(ColorBalance, FactoriesCopyTheirTables) {
  std::array<unsigned char, 256> table{};
  table.fill(9);
  LUTCBFactory factory({table.data()});
  const MinMaxLUTCBFactory ranges({table.data()}, {0}, {255});
  LUTCBFactory copy(factory);
  const LUTCBFactory& itself = copy;
  copy = itself;
  const std::unique_ptr<IFilter> filter(copy.GetCPUFilter());
  const std::unique_ptr<IFilter> ranged(ranges.GetCPUFilter());
  table.fill(1);
  factory = LUTCBFactory({table.data()});
  for (IFilter* const one : {filter.get(), ranged.get()}) {
    gobs::Raster block = Block(1, 1, 1);
    ASSERT_TRUE(one->Process(block, block, 0, 0, nullptr).Ok());
    EXPECT_EQ(*static_cast<unsigned char*>(block.Data()), 9);
  }
  EXPECT_THROW(LUTCBFactory({table.data(), nullptr}), ParameterException);
}

TEST(ColorBalance, PolynomialFactoryValidates) {
  struct Wrong {
    std::vector<List> coefficients;
    List biases;
    std::string parameter;
    int type;
    std::string message;
  };
  for (const Wrong& wrong : std::vector<Wrong>{
           {{}, {}, "oBias", 8, ""},
           {{{1, 2}}, {}, "oBias", 8, ""},
           {{{1, 2}, {1, 2}}, {0, 0, 0}, "oCoeff", 1, "oCoeff and oBias must have same length."},
           {{{1, 2, 3, 4}, {1, 2, 3, 4, 5, 6, 7}},
            {0, 0},
            "oCoeff",
            1,
            "There must be same number of coefficients for all channels in Neighborhood color "
            "balancing."}}) {
    try {
      const NeighborhoodCBFactory factory(wrong.coefficients, wrong.biases);
      ADD_FAILURE() << "accepted: " << wrong.message;
    } catch (const ParameterException& error) {
      EXPECT_EQ(error.ParameterName(), wrong.parameter);
      EXPECT_EQ(error.Type(), wrong.type);
      EXPECT_EQ(error.Message(), wrong.message);
    }
  }
}

TEST(ColorBalance, PolynomialFollowsTypeChannelsAndNoDataFromBlockToBlock) {
  const std::unique_ptr<IFilter> filter(
      NeighborhoodCBFactory({{0, 1}, {0, 1}}, {5, 6}).GetCPUFilter());
  const auto balanced = [&](NativeDataTypeCode code, std::uint32_t channels) {
    gobs::Raster block = Block(1, 1, channels, code);
    EXPECT_TRUE(filter->Process(block, block, 0, 0, nullptr).Ok());
    return code == NativeDataTypeCode::kUInt8 ? *static_cast<unsigned char*>(block.Data())
                                              : *static_cast<float*>(block.Data());
  };
  EXPECT_EQ(balanced(NativeDataTypeCode::kUInt8, 1), 5);
  EXPECT_EQ(balanced(NativeDataTypeCode::kFloat32, 1), 5);
  EXPECT_EQ(balanced(NativeDataTypeCode::kUInt8, 2), 5);
  const List zero = {0, 0};
  const List nine = {9, 9};
  filter->SetNoDataValues(&zero, &nine);
  EXPECT_EQ(balanced(NativeDataTypeCode::kUInt8, 2), 9);
  filter->SetNoDataValues(nullptr, nullptr);
  EXPECT_EQ(balanced(NativeDataTypeCode::kUInt8, 2), 5);
}

TEST(ColorBalance, WideIntegersGoThroughDoubles) {
  const std::unique_ptr<IFilter> filter(NeighborhoodCBFactory({{0, 2}}, {1}).GetCPUFilter());
  gobs::Raster block = Block(3, 1, 1, NativeDataTypeCode::kInt64);
  auto* const samples = static_cast<std::int64_t*>(block.Data());
  samples[0] = -(std::int64_t{1} << 62) - (std::int64_t{1} << 61);
  samples[1] = std::int64_t{1} << 52;
  samples[2] = std::int64_t{1} << 62;
  ASSERT_TRUE(filter->Process(block, block, 0, 0, nullptr).Ok());
  EXPECT_EQ(samples[0], std::numeric_limits<std::int64_t>::min());
  EXPECT_EQ(samples[1], (std::int64_t{1} << 53) + 2);
  EXPECT_EQ(samples[2], std::numeric_limits<std::int64_t>::max());
}

}  // namespace
}  // namespace zarn::processes::filters
