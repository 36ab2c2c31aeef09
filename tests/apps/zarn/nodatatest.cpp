// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/nodata.h"

namespace zarn::app {
namespace {

using enum gobs::NativeDataTypeCode;
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInfinity = std::numeric_limits<double>::infinity();

TEST(NoData, KnowsWhatASampleCanHold) {
  struct Case {
    gobs::NativeDataTypeCode code;
    double value;
    bool holds;
  };
  const std::vector<Case> cases{
      {kUInt8, 0, true},
      {kUInt8, 255, true},
      {kUInt8, 256, false},
      {kUInt8, -9999, false},
      {kUInt8, 0.5, false},
      {kUInt8, kNaN, false},
      {kInt8, -128, true},
      {kInt8, 128, false},
      {kInt16, kInfinity, false},
      {kUInt32, 4294967295.0, true},
      {kUInt32, 4294967296.0, false},
      {kInt32, -2147483648.0, true},
      {kFloat32, kNaN, true},
      {kFloat32, -kInfinity, true},
      {kFloat32, 1e300, false},
      {kFloat32, -3.4028234663852886e38, true},
      {kFloat32, -3.40282347e38, true},  // as it is often written
      {kFloat32, 3.4028237e38, false},
      {kFloat64, 1e300, true},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(CanHold(c.code, c.value), c.holds)
        << c.value << " in code " << static_cast<unsigned>(c.code);
  }
}

TEST(NoData, ParsesLists) {
  EXPECT_FALSE(ParseNoData("--o", ""));
  EXPECT_EQ(ParseNoData("--o", "none"), std::vector<double>());
  EXPECT_EQ(ParseNoData("--o", "-1.5e3"), std::vector<double>({-1500}));
  EXPECT_EQ(ParseNoData("--o", "0,255,7"), std::vector<double>({0, 255, 7}));
  EXPECT_TRUE(std::isnan(ParseNoData("--o", "nan")->front()));
  for (const char* const wrong : {"x", "1,", ",1", "1,,2", "1 2", "1;2", "none,1"}) {
    EXPECT_THROW(ParseNoData("--o", wrong), UsageError) << wrong;
  }
}

}  // namespace
}  // namespace zarn::app
