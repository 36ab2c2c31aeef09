// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "host/core/exception.h"
#include "host/nspio/debugger.h"
#include "processes/filters/attribute/iattributefilter.h"
#include "processes/filters/factories/attrfilterfactory.h"
#include "tests/support/testblock.h"

namespace zarn::processes::filters {
namespace {

using Filter = std::unique_ptr<IAttributeFilter>;
using nspio::Debugger;

// What becomes of the middle of a block of 3x3: tells algorithms, sizes and shapes apart.
int Fingerprint(IAttributeFilter* made) {
  const Filter filter(made);
  testsupport::TestBlock<std::uint8_t> input({.width = 1, .height = 1, .marginX = 1, .marginY = 1});
  testsupport::TestBlock<std::uint8_t> output({.width = 1, .height = 1});
  for (std::size_t i = 0; i < 9; ++i) input.Samples()[i] = static_cast<std::uint8_t>(i * i);
  gobs::Raster out = output.Wrap();
  EXPECT_TRUE(filter->Process(input.Wrap(), out, nullptr, nullptr).Ok());
  return output.At(0, 0);
}

TEST(AttrFilterFactory, MakesTheThreeFilters) {
  const AttrFilterFactory factory(3, KernelShape::kSquare);
  for (const auto get : {&AttrFilterFactory::GetFilter, &AttrFilterFactory::GetCPUFilter,
                         &AttrFilterFactory::GetCUDAFilter}) {
    EXPECT_EQ(Fingerprint((factory.*get)(FILTERALGO::kAverage)), 204 / 9);
    EXPECT_EQ(Fingerprint((factory.*get)(FILTERALGO::kMedian)), 16);
    EXPECT_EQ(Fingerprint((factory.*get)(FILTERALGO::kTrimmedMean)), (4 + 9 + 16 + 25 + 36) / 5);
  }
  const Filter filter(factory.GetFilter(FILTERALGO::kAverage));
  EXPECT_FALSE(filter->useNoData || filter->useAttributes);
  EXPECT_EQ(filter->noDataValue, 0.0);
  EXPECT_EQ(filter->attrNoDataValue, 0.0);
  EXPECT_EQ(filter->attrTolerance, 1e-6);
}

TEST(AttrFilterFactory, CopiesBothParameters) {
  AttrFilterFactory copy(1, KernelShape::kSquare);
  EXPECT_EQ(Fingerprint(copy.GetCPUFilter(FILTERALGO::kAverage)), 16);
  // The disc of size 2 has no corners.
  copy = AttrFilterFactory(2, KernelShape::kDisc);
  EXPECT_EQ(Fingerprint(copy.GetCPUFilter(FILTERALGO::kAverage)), (1 + 9 + 16 + 25 + 49) / 5);
  EXPECT_EQ(Fingerprint(AttrFilterFactory(copy).GetCPUFilter(FILTERALGO::kAverage)), 20);
}

TEST(AttrFilterFactory, RefusesOtherAlgorithmsAndSizes) {
  const AttrFilterFactory factory(3, KernelShape::kSquare);
  for (const int algo : {-1, 3}) {
    try {
      const Filter filter(factory.GetFilter(static_cast<FILTERALGO>(algo)));
      FAIL();
    } catch (const ParameterException& e) {
      EXPECT_EQ(e.Message(), "GetCPUFilter(): The provided filter algorithm was not recognized");
      EXPECT_EQ(e.ParameterName(), "eType");
      EXPECT_NE(e.Function().find("AttrFilterFactory::GetCPUFilter"), std::string::npos);
      EXPECT_EQ(e.SourceFile(), "processes/filters/factories/attrfilterfactory");
      EXPECT_EQ(e.Line(), 91U);
    }
  }
  EXPECT_THROW(Filter(AttrFilterFactory(16385, KernelShape::kDisc).GetFilter(FILTERALGO::kMedian)),
               std::length_error);
}

TEST(AttrFilterFactory, SaysThatThereIsNoCUDA) {
  std::vector<std::string> messages;
  Debugger::SetSink([&](const std::string& message, int level, const std::string& module,
                        const std::string& file, int line) {
    messages.push_back(message + "|" + std::to_string(level) + "|" + module + "|" + file + "|" +
                       std::to_string(line));
  });
  const AttrFilterFactory factory(3, KernelShape::kSquare);
  const Filter silent(factory.GetFilter(FILTERALGO::kMedian));
  Debugger::moDebugLevel = 1;
  const Filter told(factory.GetFilter(FILTERALGO::kMedian));
  const Filter untold(factory.GetCPUFilter(FILTERALGO::kMedian));
  Debugger::moDebugLevel = 0;
  Debugger::SetSink({});
  EXPECT_EQ(messages,
            std::vector<std::string>{"CUDA not supported, using CPU Filter instead.|1|zarn_filters|"
                                     "processes/filters/factories/attrfilterfactory|146"});
}

TEST(AttrFilterFactory, FallsBackThroughTheVirtualSlots) {
  struct WithoutCUDA : AttrFilterFactory {
    using AttrFilterFactory::AttrFilterFactory;
    IAttributeFilter* GetCUDAFilter(FILTERALGO /*eType*/) const override { return nullptr; }
    IAttributeFilter* GetCPUFilter(FILTERALGO /*eType*/) const override {
      return AttrFilterFactory::GetCPUFilter(FILTERALGO::kMedian);
    }
  };
  EXPECT_EQ(Fingerprint(WithoutCUDA(3, KernelShape::kSquare).GetFilter(FILTERALGO::kAverage)), 16);
}

}  // namespace
}  // namespace zarn::processes::filters
