// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "host/nspio/debugger.h"
#include "processes/filters/factories/averagefilterfactory.h"
#include "processes/filters/factories/medianfilterfactory.h"
#include "processes/filters/factories/noisefilterfactory.h"
#include "processes/filters/factories/removeblobfactory.h"
#include "tests/support/testblock.h"

namespace zarn::processes::filters {
namespace {

using Filter = std::unique_ptr<IFilter>;
using nspio::Debugger;
using testsupport::TestBlock;

// What becomes of the middle one of the pixels 4, 8, 30: tells kernel sizes and backgrounds apart.
std::string Fingerprint(IFilter& filter) {
  TestBlock<std::uint8_t> input({.width = 1, .height = 1, .marginX = 1, .marginY = 1});
  TestBlock<std::uint8_t> output({.width = 1, .height = 1});
  input.Fill(8);
  input.At(-1, 0) = 4;
  input.At(1, 0) = 30;
  gobs::Raster target = output.Wrap();
  const FilterResult result = filter.Process(input.Wrap(), target, 0, 0, nullptr);
  return result.Ok() ? std::to_string(output.At(0, 0)) : result.message;
}
std::string Fingerprint(const IFilterFactory& factory) {
  return Fingerprint(*Filter(factory.GetCPUFilter()));
}

TEST(AverageFilterFactory, CopiesBothParameters) {
  const AverageFilterFactory pixelAlone(1, 0);
  const AverageFilterFactory nothingLeftOut(3, 0);
  const AverageFilterFactory thirtyLeftOut(3, 30);
  const AverageFilterFactory marginsMissing(5);
  EXPECT_EQ(Fingerprint(pixelAlone), "8");
  EXPECT_EQ(Fingerprint(nothingLeftOut), "10");
  EXPECT_EQ(Fingerprint(thirtyLeftOut), "8");
  EXPECT_EQ(Fingerprint(marginsMissing), "Raster Margins are too small.");

  AverageFilterFactory copy(thirtyLeftOut);
  EXPECT_EQ(Fingerprint(copy), "8");
  copy = nothingLeftOut;
  EXPECT_EQ(Fingerprint(copy), "10");
  copy = marginsMissing;
  EXPECT_EQ(Fingerprint(copy), "Raster Margins are too small.");
}

// The results tell the kernel size and the background value apart, and the families.
template <class Factory>
void ExpectFingerprints(const std::string& pixelAlone, const std::string& zero,
                        const std::string& thirty, const std::string& aloneWithThirty) {
  const Factory small(1, 0);
  const Factory withZero(3, 0);
  const Factory withThirty(3, 30);
  EXPECT_EQ(Fingerprint(small), pixelAlone);
  EXPECT_EQ(Fingerprint(withZero), zero);
  EXPECT_EQ(Fingerprint(withThirty), thirty);
  EXPECT_EQ(Fingerprint(Factory(1, 30)), aloneWithThirty);
  Factory copy(withThirty);
  EXPECT_EQ(Fingerprint(copy), thirty);
  copy = withZero;
  EXPECT_EQ(Fingerprint(copy), zero);
  copy = small;
  EXPECT_EQ(Fingerprint(copy), pixelAlone);
  EXPECT_EQ(Fingerprint(Factory(5, 0)), "Raster Margins are too small.");
}

TEST(WindowFilterFactories, HandTheirParametersOn) {
  ExpectFingerprints<AverageFilterFactory>("8", "10", "8", "8");
  ExpectFingerprints<MedianFilterFactory>("8", "8", "8", "8");
  ExpectFingerprints<NoiseFilterFactory>("0", "8", "8", "30");
  ExpectFingerprints<RemoveBlobFactory>("8", "0", "30", "8");
}

TEST(AverageFilterFactory, FiltersAreIndependentAndOutliveIt) {
  auto factory = std::make_unique<AverageFilterFactory>(3, 0.0);
  const Filter first(factory->GetCPUFilter());
  const Filter second(factory->GetCPUFilter());
  factory.reset();
  EXPECT_NE(first, second);
  const std::vector<double> noData = {30};
  first->SetNoDataValues(&noData, nullptr);
  EXPECT_EQ(Fingerprint(*first), "8");
  EXPECT_EQ(Fingerprint(*second), "10");
}

class CUDAFallbackTest : public ::testing::Test {
 protected:
  void SetUp() override {
    Debugger::SetSink([this](const std::string& message, int level, const std::string& module,
                             const std::string& file, int line) {
      messages.push_back(message + "|" + std::to_string(level) + "|" + module + "|" + file + "|" +
                         std::to_string(line));
    });
  }
  void TearDown() override {
    Debugger::SetSink({});
    Debugger::moDebugLevel = 0;
  }
  std::vector<std::string> messages;
};

TEST_F(CUDAFallbackTest, SaysSoAtEveryLevelButZero) {
  const std::string expected =
      "CUDA not supported, using CPU Filter instead.|1|zarn_filters|"
      "processes/filters/factories/ifilterfactory|38";
  EXPECT_EQ(Fingerprint(*Filter(AverageFilterFactory(3, 0).GetCUDAFilter())), "10");
  EXPECT_TRUE(messages.empty());
  for (const int level : {1, 5}) {
    messages.clear();
    Debugger::moDebugLevel = level;
    EXPECT_EQ(Fingerprint(*Filter(AverageFilterFactory(3, 0).GetCUDAFilter())), "10");
    EXPECT_EQ(messages, std::vector<std::string>{expected});
  }
}

}  // namespace
}  // namespace zarn::processes::filters
