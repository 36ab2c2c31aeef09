// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <vector>

#include "processes/filters/factories/averagefilterfactory.h"
#include "tests/support/averagereference.h"
#include "tests/support/averagescene.h"
#include "tests/support/testblock.h"

namespace zarn::testsupport {

/// A filter with the given parameters, through the public factory.
inline std::unique_ptr<processes::filters::IFilter> MakeAverageFilter(
    const AverageParameters& parameters) {
  using processes::filters::AverageFilterFactory;
  const AverageFilterFactory factory =
      parameters.background ? AverageFilterFactory(parameters.kernelSize, *parameters.background)
                            : AverageFilterFactory(parameters.kernelSize);
  std::unique_ptr<processes::filters::IFilter> filter(factory.GetCPUFilter());
  filter->SetNoDataValues(&parameters.inputNoData, &parameters.outputNoData);
  return filter;
}

/// Runs the library's filter; `mask` may be empty.
template <typename T>
processes::filters::FilterResult FilterAverage(const AverageParameters& parameters,
                                               const TestBlock<T>& input,
                                               const std::vector<std::uint8_t>& mask,
                                               TestBlock<T>& output) {
  gobs::Raster target = output.Wrap();
  return MakeAverageFilter(parameters)
      ->Process(input.Wrap(), target, 0, 0, mask.empty() ? nullptr : mask.data());
}

/// Whether the library and the reference make the same of a block; `output` is what the output
/// holds before.
template <typename T>
::testing::AssertionResult AgreesWithReference(const AverageParameters& parameters,
                                               const TestBlock<T>& input,
                                               const std::vector<std::uint8_t>& mask,
                                               const TestBlock<T>& output) {
  TestBlock<T> actual = output;
  TestBlock<T> expected = output;
  const processes::filters::FilterResult result = FilterAverage(parameters, input, mask, actual);
  if (!result.Ok()) return ::testing::AssertionFailure() << result.message;
  ReferenceAverage(parameters, input, mask, expected);
  return SameBlocks(actual, expected);
}

/// The same for a scene drawn from `seed`.
template <typename T>
::testing::AssertionResult AgreesOnScene(std::uint64_t seed) {
  const AverageScene<T> scene(seed);
  ::testing::AssertionResult result =
      AgreesWithReference(scene.parameters, scene.input, scene.mask, scene.MakeOutput());
  return result ? result : result << ": " << scene.Describe();
}

}  // namespace zarn::testsupport
