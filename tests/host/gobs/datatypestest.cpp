// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdint>
#include <vector>

#include "host/core/exception.h"
#include "host/gobs/datatypes.h"
#include "host/gobs/raster.h"

namespace zarn::gobs {
namespace {

struct Row {
  std::uint32_t code;
  DataType description;
  std::uint32_t bytesPerSample;
};

// The numbers that stored descriptions hold; those of codes 7 and 8 have their signed flags
// swapped.
const std::vector<Row> kTable = {
    {0, {8, 0, 0, 8, 0, 0}, 1},    {1, {8, 1, 0, 8, 0, 0}, 1},      {2, {16, 0, 0, 16, 0, 0}, 2},
    {3, {16, 1, 0, 16, 0, 0}, 2},  {4, {32, 0, 0, 32, 0, 0}, 4},    {5, {32, 1, 0, 32, 0, 0}, 4},
    {6, {32, 1, 1, 23, 8, 0}, 4},  {7, {64, 0, 0, 64, 0, 0}, 8},    {8, {64, 1, 0, 64, 0, 0}, 8},
    {9, {64, 1, 1, 52, 11, 0}, 8}, {11, {16, 1, 0, 16, 0, 1}, 4},   {12, {32, 1, 0, 32, 0, 1}, 8},
    {13, {32, 1, 1, 23, 8, 1}, 8}, {14, {64, 1, 1, 52, 11, 1}, 16},
};

TEST(NativeDataType, DescribesEveryCodeAndIsFoundAgain) {
  for (const Row& row : kTable) {
    SCOPED_TRACE(row.code);
    const auto code = static_cast<NativeDataTypeCode>(row.code);
    const NativeDataType type(code);
    EXPECT_EQ(type.Code(), code);
    EXPECT_EQ(type.Description(), row.description);
    EXPECT_EQ(type.Description().BytesPerSample(), row.bytesPerSample);
    EXPECT_EQ(CodeOf(row.description), code);
    EXPECT_EQ(GetDataTypeCode(RasterInfo(3, 2, 1, code)), code);
  }
}

TEST(NativeDataType, RefusesTheCodesWithoutAType) {
  for (const std::uint32_t code : {10U, 15U}) {
    SCOPED_TRACE(code);
    try {
      const NativeDataType type(static_cast<NativeDataTypeCode>(code));
      FAIL();
    } catch (const Exception& e) {
      EXPECT_EQ(e.Message(), "Unknown datatype in raster");
    }
    EXPECT_THROW(RasterInfo(1, 1, 1, static_cast<NativeDataTypeCode>(code)), Exception);
  }
}

TEST(NativeDataType, LeavesTheDescriptionZeroedAboveTheLastCode) {
  for (const std::uint32_t code : {16U, 17U, 4294967295U}) {
    const NativeDataType type(static_cast<NativeDataTypeCode>(code));
    EXPECT_EQ(static_cast<std::uint32_t>(type.Code()), code);
    EXPECT_EQ(type.Description(), DataType{});
  }
}

TEST(CodeOf, ComparesEveryField) {
  const DataType known{16, 1, 0, 16, 0, 0};
  std::vector<DataType> strangers(7, known);
  strangers[0].bits = 12;
  strangers[1].isSigned = 2;
  strangers[2].isFloat = 1;
  strangers[3].significandBits = 15;
  strangers[4].exponentBits = 1;
  strangers[5].isComplex = 2;
  strangers[6] = {};
  for (const DataType& stranger : strangers) {
    EXPECT_EQ(CodeOf(stranger), NativeDataTypeCode::kUnknown);
  }
  EXPECT_EQ(CodeOf({8, 0, 0, 8, 0, 1}), NativeDataTypeCode::kUnknown);
}

}  // namespace
}  // namespace zarn::gobs
