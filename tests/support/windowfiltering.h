// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <vector>

#include "processes/filters/factories/averagefilterfactory.h"
#include "processes/filters/factories/medianfilterfactory.h"
#include "processes/filters/factories/noisefilterfactory.h"
#include "processes/filters/factories/removeblobfactory.h"
#include "tests/support/testblock.h"
#include "tests/support/windowreference.h"
#include "tests/support/windowscene.h"

namespace zarn::testsupport {

using FilterPtr = std::unique_ptr<processes::filters::IFilter>;

// The square-window filters, through their public factories, each with its reference and the scenes
// that it can be tried on.

template <class Factory>
FilterPtr MakeWithBackground(const WindowParameters& parameters) {
  return FilterPtr(
      Factory(parameters.kernelSize, parameters.background.value_or(0)).GetCPUFilter());
}
template <class Factory>
FilterPtr MakeWithOrWithoutBackground(const WindowParameters& parameters) {
  if (parameters.background) return MakeWithBackground<Factory>(parameters);
  return FilterPtr(Factory(parameters.kernelSize).GetCPUFilter());
}

struct TestedAverage {
  static constexpr auto Make =
      MakeWithOrWithoutBackground<processes::filters::AverageFilterFactory>;
  template <typename T>
  static constexpr auto Reference = ReferenceAverage<T>;
  static SceneLimits Limits() { return {}; }
};

struct TestedMedian {
  static constexpr auto Make = MakeWithOrWithoutBackground<processes::filters::MedianFilterFactory>;
  template <typename T>
  static constexpr auto Reference = ReferenceMedian<T>;
  static SceneLimits Limits() { return {.kernelSizes = {-1, 0, 1, 2, 3, 3, 3, 4, 5, 5, 6, 7, 7}}; }
};

struct TestedNoise {
  static constexpr auto Make = MakeWithBackground<processes::filters::NoiseFilterFactory>;
  template <typename T>
  static constexpr auto Reference = ReferenceNoise<T>;
  static SceneLimits Limits() { return {.tallerInput = false, .needsBackground = true}; }
};

struct TestedBlobs {
  static constexpr auto Make = MakeWithBackground<processes::filters::RemoveBlobFactory>;
  template <typename T>
  static constexpr auto Reference = ReferenceBlobs<T>;
  static SceneLimits Limits() { return {.tallerInput = false, .needsBackground = true}; }
};

/// Runs the library's filter; `mask` may be empty.
template <class Tested, typename T>
processes::filters::FilterResult FilterWindows(const WindowParameters& parameters,
                                               const TestBlock<T>& input,
                                               const std::vector<std::uint8_t>& mask,
                                               TestBlock<T>& output) {
  const FilterPtr filter = Tested::Make(parameters);
  filter->SetNoDataValues(&parameters.inputNoData, &parameters.outputNoData);
  gobs::Raster target = output.Wrap();
  return filter->Process(input.Wrap(), target, 0, 0, mask.empty() ? nullptr : mask.data());
}

/// Whether the library and the reference make the same of a block; `output` is what the output
/// holds before.
template <class Tested, typename T>
::testing::AssertionResult AgreesWithReference(const WindowParameters& parameters,
                                               const TestBlock<T>& input,
                                               const std::vector<std::uint8_t>& mask,
                                               const TestBlock<T>& output) {
  TestBlock<T> actual = output;
  TestBlock<T> expected = output;
  const processes::filters::FilterResult result =
      FilterWindows<Tested>(parameters, input, mask, actual);
  if (!result.Ok()) return ::testing::AssertionFailure() << result.message;
  Tested::template Reference<T>(parameters, input, mask, expected);
  return SameBlocks(actual, expected);
}

/// The same for a scene drawn from `seed`.
template <class Tested, typename T>
::testing::AssertionResult AgreesOnScene(std::uint64_t seed) {
  const WindowScene<T> scene(seed, Tested::Limits());
  ::testing::AssertionResult result =
      AgreesWithReference<Tested>(scene.parameters, scene.input, scene.mask, scene.MakeOutput());
  return result ? result : result << ": " << scene.Describe();
}

}  // namespace zarn::testsupport
