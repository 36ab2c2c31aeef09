// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <numeric>
#include <string>
#include <vector>

#include "host/core/exception.h"
#include "tests/support/windowfiltering.h"

namespace zarn::processes::filters {
namespace {

using gobs::NativeDataTypeCode;
using gobs::Raster;
using gobs::RasterInfo;
using testsupport::WindowParameters;

struct Family {
  const char* name;
  testsupport::FilterPtr (*make)(const WindowParameters& parameters);
  const char* unknownType;
  const char* largeKernel;  ///< what a size of 8 is refused with, or null
  bool needsLimits;
  bool tallerInput;
};

const Family kFamilies[] = {
    {"average", testsupport::TestedAverage::Make,
     "Unknown raster block data type for average filter.", nullptr, true, true},
    {"median", testsupport::TestedMedian::Make, "Unknown raster block data type for median filter.",
     "Only filters of 7x7 or smaller are supported.", false, true},
    {"noise", testsupport::TestedNoise::Make, "Unknown raster block data type for noise filter.",
     nullptr, true, false},
    {"blobs", testsupport::TestedBlobs::Make, "Unknown raster block data type.", nullptr, true,
     false},
};

class WindowFilterFailure : public ::testing::TestWithParam<Family> {};
INSTANTIATE_TEST_SUITE_P(Families, WindowFilterFailure, ::testing::ValuesIn(kFamilies),
                         [](const auto& family) { return std::string(family.param.name); });

const char* const kSizes = "Input and output rasters must be the same size (excluding margins).";
const char* const kMargins = "Raster Margins are too small.";
const char* const kTypes =
    "Input and output rasters must have the same data type and number of channels.";
const char* const kLists = "Fewer no-data values than channels.";
const char* const kInconsistent = "Raster block has no data or an inconsistent size.";
const char* const kOverlapping = "Input and output rasters overlap.";

struct Failure {
  const char* what;
  const char* message;
  // Each of these describes a sound call unless a case says otherwise.
  std::uint32_t inputCode = 2;
  std::uint32_t outputCode = 2;
  std::uint32_t inputWidth = 8;
  std::uint32_t inputHeight = 6;
  std::uint32_t outputChannels = 2;
  std::uint32_t marginX = 1;
  std::uint32_t marginY = 1;
  int kernelSize = 3;
  std::size_t noDataValues = 2;
  std::size_t inputMissingBytes = 0;
  std::size_t outputMissingBytes = 0;
  bool inputNull = false;
  bool outputNull = false;
  std::size_t outputOffset = 4096;
};

constexpr std::size_t kMemory = 8192;

FilterResult FilterWith(const Family& family, const Failure& f, std::vector<std::uint8_t>& memory) {
  const RasterInfo inputInfo(f.inputWidth, f.inputHeight, 2,
                             static_cast<NativeDataTypeCode>(f.inputCode),
                             {.marginX = f.marginX, .marginY = f.marginY});
  const RasterInfo outputInfo(8, 6, f.outputChannels,
                              static_cast<NativeDataTypeCode>(f.outputCode));
  const Raster input(inputInfo, f.inputNull ? nullptr : memory.data(),
                     inputInfo.DescribedSize() - f.inputMissingBytes);
  Raster output(outputInfo, f.outputNull ? nullptr : memory.data() + f.outputOffset,
                outputInfo.DescribedSize() - f.outputMissingBytes);
  const std::vector<double> noData(f.noDataValues, 3);
  const testsupport::FilterPtr filter = family.make({.kernelSize = f.kernelSize});
  filter->SetNoDataValues(&noData, &noData);
  return filter->Process(input, output, 0, 0, nullptr);
}

TEST_P(WindowFilterFailure, ReportsTheFirstFaultAndTouchesNothing) {
  const char* const kUnknownType = GetParam().unknownType;
  std::vector<Failure> failures = {
      {.what = "signed 64 bits", .message = kUnknownType, .inputCode = 7, .outputCode = 7},
      {.what = "unsigned 64 bits", .message = kUnknownType, .inputCode = 8, .outputCode = 8},
      {.what = "complex short", .message = kUnknownType, .inputCode = 11, .outputCode = 11},
      {.what = "complex double", .message = kUnknownType, .inputCode = 14, .outputCode = 14},
      {.what = "type before size",
       .message = kUnknownType,
       .inputCode = 7,
       .inputWidth = 9,
       .marginX = 0},
      {.what = "narrower input", .message = kSizes, .inputWidth = 7},
      {.what = "wider input", .message = kSizes, .inputWidth = 9},
      {.what = "lower input", .message = kSizes, .inputHeight = 5},
      {.what = "size before margins", .message = kSizes, .inputWidth = 9, .kernelSize = 5},
      {.what = "margins in x", .message = kMargins, .marginX = 0},
      {.what = "margins in y", .message = kMargins, .marginY = 0},
      {.what = "even kernel", .message = kMargins, .kernelSize = 4},
      {.what = "negative kernel", .message = kMargins, .kernelSize = -2},
      {.what = "smallest kernel",
       .message = kMargins,
       .kernelSize = std::numeric_limits<int>::min()},
      {.what = "largest kernel",
       .message = kMargins,
       .kernelSize = std::numeric_limits<int>::max()},
      {.what = "margins before types", .message = kMargins, .outputCode = 3, .kernelSize = 5},
      {.what = "signedness", .message = kTypes, .outputCode = 3},
      {.what = "sample size", .message = kTypes, .outputCode = 0},
      {.what = "channels", .message = kTypes, .outputChannels = 3},
      {.what = "types before lists", .message = kTypes, .outputCode = 6, .noDataValues = 1},
      {.what = "short lists", .message = kLists, .noDataValues = 1},
      {.what = "lists before data", .message = kLists, .noDataValues = 1, .inputNull = true},
      {.what = "no input", .message = kInconsistent, .inputNull = true},
      {.what = "no output", .message = kInconsistent, .outputNull = true},
      {.what = "short input", .message = kInconsistent, .inputMissingBytes = 1},
      {.what = "short output", .message = kInconsistent, .outputMissingBytes = 1},
      {.what = "data before overlap",
       .message = kInconsistent,
       .inputMissingBytes = 1,
       .outputOffset = 0},
      {.what = "in place", .message = kOverlapping, .outputOffset = 0},
      {.what = "last sample", .message = kOverlapping, .outputOffset = 10 * 8 * 2 * 2 - 2},
  };
  if (!GetParam().tallerInput) {
    failures.push_back({.what = "taller input", .message = kSizes, .inputHeight = 7});
  }
  if (GetParam().largeKernel != nullptr) {
    failures.push_back({.what = "large kernel",
                        .message = GetParam().largeKernel,
                        .outputCode = 3,
                        .marginX = 4,
                        .marginY = 4,
                        .kernelSize = 8});
    failures.push_back({.what = "margins before a large kernel",
                        .message = kMargins,
                        .marginX = 4,
                        .marginY = 3,
                        .kernelSize = 8});
  }
  std::vector<std::uint8_t> memory(kMemory);
  std::iota(memory.begin(), memory.end(), std::uint8_t{1});
  const std::vector<std::uint8_t> before = memory;
  for (const Failure& failure : failures) {
    SCOPED_TRACE(failure.what);
    const FilterResult result = FilterWith(GetParam(), failure, memory);
    EXPECT_EQ(result.code, 0);
    EXPECT_EQ(result.message, failure.message);
    EXPECT_EQ(memory, before);
  }
}

TEST_P(WindowFilterFailure, AcceptsTheCallsBesideTheFailures) {
  const Failure kSound[] = {
      {.what = "as it is", .message = ""},
      {.what = "taller input", .message = "", .inputHeight = GetParam().tallerInput ? 7U : 6U},
      {.what = "size 7", .message = "", .marginX = 3, .marginY = 3, .kernelSize = 7},
      {.what = "longer lists", .message = "", .noDataValues = 3},
      {.what = "no lists", .message = "", .noDataValues = 0},
      {.what = "side by side", .message = "", .outputOffset = 10 * 8 * 2 * 2},
  };
  for (const Failure& sound : kSound) {
    SCOPED_TRACE(sound.what);
    std::vector<std::uint8_t> memory(kMemory, 7);
    const FilterResult result = FilterWith(GetParam(), sound, memory);
    EXPECT_EQ(result.code, 1);
    EXPECT_EQ(result.message, "");
  }
}

TEST_P(WindowFilterFailure, BlocksWithoutATypeEndInTheExceptionOfTheLimitsOrAreUnknown) {
  // No code has these descriptions; the sizes differ, too, but the limits come first.
  for (const gobs::DataType type : {gobs::DataType{}, gobs::DataType{12, 0, 0, 12, 0, 0}}) {
    const Raster input(RasterInfo(4, 4, 1, type));
    Raster output(RasterInfo(5, 5, 1, NativeDataTypeCode::kUInt8));
    try {
      const FilterResult result = GetParam().make({})->Process(input, output, 0, 0, nullptr);
      EXPECT_FALSE(GetParam().needsLimits) << "nothing thrown";
      EXPECT_EQ(result.message, GetParam().unknownType);
    } catch (const ParameterException& e) {
      EXPECT_TRUE(GetParam().needsLimits);
      EXPECT_EQ(e.Message(), "Cannot evaluate MinValue() for the provided datatype");
      EXPECT_EQ(e.ParameterName(), "eDataType");
    }
  }
}

}  // namespace
}  // namespace zarn::processes::filters
