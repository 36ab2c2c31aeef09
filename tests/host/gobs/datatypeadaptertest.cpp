// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdint>
#include <string>

#include "host/core/exception.h"
#include "host/gobs/datatypeadapter.h"

namespace zarn::gobs {
namespace {

TEST(DataTypeAdapter, KnowsTheLimitsOfEveryType) {
  const struct {
    std::uint32_t code;
    double min;
    double max;
  } kTable[] = {
      {0, 0, 255},
      {1, -128, 127},
      {2, 0, 65535},
      {3, -32768, 32767},
      {4, 0, 4294967295.0},
      {5, -2147483648.0, 2147483647.0},
      {6, -3.4028234663852886e38, 3.4028234663852886e38},
      {7, -0x1p63, 0x1p63},
      {8, 0, 0x1p64},
      {9, -1.7976931348623157e308, 1.7976931348623157e308},
      {11, -32768, 32767},
      {12, -2147483648.0, 2147483647.0},
      {13, -3.4028234663852886e38, 3.4028234663852886e38},
      {14, -1.7976931348623157e308, 1.7976931348623157e308},
  };
  for (const auto& row : kTable) {
    SCOPED_TRACE(row.code);
    const auto code = static_cast<NativeDataTypeCode>(row.code);
    EXPECT_EQ(DataTypeAdapter::MinValue(code), row.min);
    EXPECT_EQ(DataTypeAdapter::MaxValue(code), row.max);
  }
}

void ExpectRefusal(double (*limit)(NativeDataTypeCode), const std::string& name) {
  for (const std::uint32_t code : {10U, 15U, 16U, 4294967295U}) {
    SCOPED_TRACE(name + " " + std::to_string(code));
    try {
      limit(static_cast<NativeDataTypeCode>(code));
      ADD_FAILURE() << "nothing thrown";
    } catch (const ParameterException& e) {
      EXPECT_EQ(e.Message(), "Cannot evaluate " + name + "() for the provided datatype");
      EXPECT_EQ(e.ParameterName(), "eDataType");
      EXPECT_EQ(e.Type(), 1);
      EXPECT_EQ(e.SourceFile(), "gobs/raster/datatypeadapter");
      EXPECT_NE(e.Function().find("DataTypeAdapter::" + name + "("), std::string::npos)
          << e.Function();
      EXPECT_GT(e.Line(), 0U);
    }
  }
}

TEST(DataTypeAdapter, RefusesCodesWithoutAType) {
  ExpectRefusal(DataTypeAdapter::MinValue, "MinValue");
  ExpectRefusal(DataTypeAdapter::MaxValue, "MaxValue");
}

}  // namespace
}  // namespace zarn::gobs
