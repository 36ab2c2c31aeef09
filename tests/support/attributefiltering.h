// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <limits>
#include <memory>
#include <sstream>
#include <string>
#include <type_traits>
#include <vector>

#include "processes/filters/attribute/iattributefilter.h"
#include "processes/filters/factories/attrfilterfactory.h"
#include "tests/support/attributereference.h"
#include "tests/support/randomnumbers.h"
#include "tests/support/testblock.h"

namespace zarn::testsupport {

/// A filter with the given parameters, through the public factory.
inline std::unique_ptr<processes::filters::IAttributeFilter> MakeAttributeFilter(
    const AttributeParameters& parameters) {
  using namespace processes::filters;  // NOLINT(google-build-using-namespace)
  const AttrFilterFactory factory(parameters.size,
                                  parameters.disc ? KernelShape::kDisc : KernelShape::kSquare);
  std::unique_ptr<IAttributeFilter> filter(factory.GetFilter(parameters.algo));
  filter->useNoData = parameters.useNoData;
  filter->noDataValue = parameters.noDataValue;
  filter->useAttributes = parameters.useAttributes;
  filter->attrNoDataValue = parameters.attrNoDataValue;
  filter->attrTolerance = parameters.attrTolerance;
  return filter;
}

/// A block of samples `T` with labels and parameters that suit it, drawn from one seed. Labels come
/// in every type.
template <typename T>
class AttributeScene {
 public:
  AttributeParameters parameters;

  explicit AttributeScene(std::uint64_t seed) : random_(seed * 1000003 + sizeof(T)), seed_(seed) {
    ChooseParameters();
    ChooseShapes();
    input_ = TestBlock<T>(inputShape_, random_.Below(4));
    for (std::size_t i = 0; i < input_.SampleCount(); ++i) input_.Samples()[i] = DrawSample();
    const auto holes = random_.Pick<std::uint32_t>({0, 0, 3, 50, 97, 100});
    for (std::ptrdiff_t i = 0; i < inputShape_.FullWidth() * inputShape_.FullHeight(); ++i) {
      if (!parameters.useNoData || !random_.Percent(holes)) continue;
      for (std::uint32_t c = 0; c < inputShape_.channels; ++c) {
        input_.Samples()[i * static_cast<std::ptrdiff_t>(inputShape_.channels) + c] =
            ReferenceTruncation<T>(parameters.noDataValue);
        if (random_.Percent(3)) break;  // some only in part
      }
    }
    inputMask_ = DrawMask(inputShape_);
    outputMask_ = DrawMask(outputShape_);
  }

  /// Whether the library and the reference make the same of the scene.
  ::testing::AssertionResult Agrees() {
    switch (random_.Below(8)) {
      case 0:
        return AgreesWithLabels<std::int8_t>();
      case 1:
        return AgreesWithLabels<std::uint16_t>();
      case 2:
        return AgreesWithLabels<std::int16_t>();
      case 3:
        return AgreesWithLabels<std::uint32_t>();
      case 4:
        return AgreesWithLabels<std::int32_t>();
      case 5:
        return AgreesWithLabels<float>();
      case 6:
        return AgreesWithLabels<double>();
      default:
        return AgreesWithLabels<std::uint8_t>();
    }
  }

 private:
  void ChooseParameters() {
    parameters.algo = static_cast<processes::filters::FILTERALGO>(random_.Below(3));
    parameters.size = random_.Pick<int>({1, 2, 3, 3, 3, 3, 4, 5, 5, 5, 5, 7, 7, 9});
    // More cells than a byte counts.
    if (random_.Percent(3)) parameters.size = random_.Percent(30) ? 35 : 17;
    parameters.disc = random_.Percent(40);
    parameters.useNoData = random_.Percent(50);
    parameters.noDataValue = random_.Pick<double>(
        {0, 3, 2.5, -1, -9999, 1e300, 1, std::numeric_limits<double>::quiet_NaN()});
    parameters.useAttributes = random_.Percent(85);
    parameters.attrNoDataValue = random_.Pick<double>({0, 0, 2, 255, -3, 99, 1e300});
    parameters.attrTolerance =
        random_.Pick<double>({1e-6, 1e-6, 1e-6, 0.5, 1, 2, 2.9, 100, 200, -1, -2, 1e300});
    parameters.scale = random_.Pick<int>({1, 1, 1, 1, 2, 3, 4, 100});
  }

  void ChooseShapes() {
    const bool large = parameters.size > 9;
    outputShape_.width = random_.Between(1, large ? 40 : 70);
    if (random_.Percent(40) && !large) {
      outputShape_.width =
          random_.Pick<std::uint32_t>({64, 128, 192, 512, 576}) + random_.Below(7) - 3;
    }
    outputShape_.height = random_.Between(1, large ? 2 : 7);
    outputShape_.channels = random_.Pick<std::uint32_t>({1, 1, 1, 2, 3, 3, 4, 5});
    inputShape_ = outputShape_;
    outputShape_.marginX = random_.Percent(50) ? 0 : random_.Below(4);
    outputShape_.marginY = random_.Percent(50) ? 0 : random_.Below(3);
    inputShape_.height += random_.Percent(30) ? random_.Below(4) : 0;
    const auto half = static_cast<std::uint32_t>(parameters.size / 2);
    const auto margin = [&] { return random_.Percent(50) ? half : random_.Below(half + 3); };
    inputShape_.marginX = margin();
    inputShape_.marginY = margin();
    labelShape_ = {.width = Coarse(outputShape_.width + parameters.scale - 1),
                   .height = Coarse(outputShape_.height + parameters.scale - 1),
                   .marginX = LabelMargin(outputShape_.width, inputShape_.marginX),
                   .marginY = LabelMargin(outputShape_.height, inputShape_.marginY)};
  }
  std::uint32_t Coarse(std::uint32_t pixels) const {
    return pixels / static_cast<std::uint32_t>(parameters.scale);
  }
  // The least that is accepted, or more.
  std::uint32_t LabelMargin(std::uint32_t pixels, std::uint32_t inputMargin) {
    const std::uint32_t reach =
        std::min(inputMargin, static_cast<std::uint32_t>(parameters.size / 2));
    const std::uint32_t size = Coarse(pixels + static_cast<std::uint32_t>(parameters.scale) - 1);
    const std::uint32_t past = Coarse(pixels - 1 + reach);
    return std::max(Coarse(reach), past < size ? 0 : past + 1 - size) +
           (random_.Percent(50) ? random_.Below(3) : 0);
  }

  T DrawSample() {
    using Limits = std::numeric_limits<T>;
    if (seed_ % 3 == 0) return static_cast<T>(random_.Below(5));
    if (seed_ % 7 == 1) return random_.Percent(50) ? Limits::lowest() : Limits::max();
    if constexpr (std::is_floating_point_v<T>) {
      if (seed_ % 7 == 2 && random_.Percent(30)) {
        return random_.Pick<T>({Limits::quiet_NaN(), -Limits::quiet_NaN(), Limits::infinity(),
                                -Limits::infinity(), T(-0.0), T(0), Limits::denorm_min()});
      }
      // What a sum keeps of small numbers beside large ones depends on its order.
      const double scale = seed_ % 7 == 3 && random_.Percent(50) ? 0x1p60 : 300;
      return static_cast<T>(random_.Fraction() * scale);
    } else {
      return static_cast<T>(random_.Next());
    }
  }

  template <typename A>
  TestBlock<A> DrawLabels() {
    TestBlock<A> labels(labelShape_, random_.Below(4));
    const bool any = random_.Percent(10);
    const std::uint32_t change = random_.Pick<std::uint32_t>({5, 30, 100});
    A label{};
    for (std::size_t i = 0; i < labels.SampleCount(); ++i) {
      if (random_.Percent(change)) {
        if (any && !std::is_floating_point_v<A>) {
          label = static_cast<A>(random_.Next());
        } else {
          label = static_cast<A>(static_cast<double>(random_.Below(5)));
          if (random_.Percent(10)) label = ReferenceTruncation<A>(parameters.attrNoDataValue);
          if (random_.Percent(5)) label = std::numeric_limits<A>::lowest();
          if (random_.Percent(5)) label = std::numeric_limits<A>::max();
          if constexpr (std::is_floating_point_v<A>) {
            if (random_.Percent(5)) label = std::numeric_limits<A>::quiet_NaN();
            if (random_.Percent(5)) label = std::numeric_limits<A>::infinity();
            if (random_.Percent(20)) label += static_cast<A>(random_.Below(3)) * A(0.9e-6);
          }
        }
      }
      labels.Samples()[i] = label;
    }
    return labels;
  }

  std::vector<std::uint8_t> DrawMask(const Shape& shape) {
    if (random_.Percent(60)) return {};
    const auto holes = random_.Pick<std::uint32_t>({1, 30, 95});
    std::vector<std::uint8_t> mask(
        static_cast<std::size_t>(shape.FullWidth() * shape.FullHeight()));
    for (std::uint8_t& byte : mask) {
      byte = random_.Percent(holes) ? 0 : static_cast<std::uint8_t>(random_.Between(1, 255));
    }
    return mask;
  }

  template <typename A>
  ::testing::AssertionResult AgreesWithLabels() {
    const TestBlock<A> labels = DrawLabels<A>();
    TestBlock<T> actual(outputShape_, seed_ % 4);
    TestBlock<T> expected = actual;
    const gobs::Raster in = input_.Wrap();
    const gobs::Raster attr = labels.Wrap();
    gobs::Raster out = actual.Wrap();
    gobs::Raster reference = expected.Wrap();
    const std::uint8_t* const inputMask = inputMask_.empty() ? nullptr : inputMask_.data();
    const std::uint8_t* const outputMask = outputMask_.empty() ? nullptr : outputMask_.data();
    const processes::filters::FilterResult result =
        MakeAttributeFilter(parameters)
            ->ProcessWithAttributes(in, attr, out, parameters.scale, inputMask, outputMask);
    if (!result.Ok()) return ::testing::AssertionFailure() << result.message << Describe<A>();
    ReferenceAttributeFilter<T, A>(parameters, in, attr, reference, inputMask, outputMask);
    ::testing::AssertionResult same = SameBlocks(actual, expected);
    return same ? same : same << Describe<A>();
  }

  template <typename A>
  std::string Describe() const {
    std::ostringstream text;
    text << ": seed " << seed_ << ", algorithm " << static_cast<int>(parameters.algo) << ", size "
         << parameters.size << (parameters.disc ? " disc" : "") << ", output " << outputShape_.width
         << "x" << outputShape_.height << "x" << outputShape_.channels << ", margins "
         << inputShape_.marginX << "+" << inputShape_.marginY
         << (inputMask_.empty() ? "" : ", masked")
         << (outputMask_.empty() ? "" : ", output masked");
    if (parameters.useNoData) text << ", no-data " << parameters.noDataValue;
    if (parameters.useAttributes) {
      text << ", labels of " << TypeNames::GetName<A>(0) << " no-data "
           << parameters.attrNoDataValue << " tolerance " << parameters.attrTolerance << " scale "
           << parameters.scale;
    }
    return text.str();
  }

  RandomNumbers random_;
  std::uint64_t seed_;
  Shape outputShape_;
  Shape inputShape_;
  Shape labelShape_;
  TestBlock<T> input_{Shape{}};
  std::vector<std::uint8_t> inputMask_;
  std::vector<std::uint8_t> outputMask_;
};

/// Whether library and reference agree on the scene of `seed`.
template <typename T>
::testing::AssertionResult AgreesOnAttributeScene(std::uint64_t seed) {
  return AttributeScene<T>(seed).Agrees();
}

}  // namespace zarn::testsupport
