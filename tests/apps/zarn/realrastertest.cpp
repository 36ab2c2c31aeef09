// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <string>

#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"

namespace zarn::testsupport {
namespace {

class RealRaster : public testing::TestWithParam<const char*> {
 protected:
  void SetUp() override {
    file_ = std::string(ZARN_REAL_DATA) + "/" + GetParam();
    if (!std::filesystem::exists(file_)) GTEST_SKIP() << file_ << " is not here";
  }

  TemporaryFolder folder_;
  std::string file_;
};

TEST_P(RealRaster, EqualsThePlainMeanAndKeepsItsNoData) {
  const Outcome outcome = RunProgram({"average", "--size", "5", file_, folder_ / "out.tif"});
  ASSERT_EQ(outcome.status, 0) << outcome.err;
  ASSERT_EQ(outcome.err, "");
  const Image input = Read(file_);
  const OpenDataset declared = OpenImage(file_);
  const double noData = declared->GetRasterBand(1)->GetNoDataValue();
  const auto isValid = [&](int x, int y) {
    return !input.AllBands(x, y, noData) && !std::isnan(input.At(x, y, 0));
  };
  EXPECT_EQ(Difference(ReferenceMean(input, 5, isValid, noData), Read(folder_ / "out.tif")), "");
}

INSTANTIATE_TEST_SUITE_P(Files, RealRaster,
                         testing::Values("landsat7_bahamas_collar_rgb8.tif",
                                         "nz_north_elev_f32_nan.tif", "landsat8_zion_b2345_u16.tif",
                                         "landsat7_b1_f64_nan.tif"),
                         [](const auto& test) {
                           std::string name = test.param;
                           return name.substr(0, name.find('.'));
                         });

}  // namespace
}  // namespace zarn::testsupport
