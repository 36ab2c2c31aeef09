// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "processes/filters/framework/sampletypes.h"

namespace zarn::app {

/// Calls `visit(std::type_identity<T>{}, parts)` with the sample type of `code`: 64-bit integers
/// beside the types of `VisitSampleType`, and complex samples as two parts of their component type;
/// all others have one part. For what has no type of its own nothing is called.
template <typename Visitor>
void VisitAnySampleType(gobs::NativeDataTypeCode code, const Visitor& visit) {
  using enum gobs::NativeDataTypeCode;
  constexpr std::size_t kReal = 1;
  constexpr std::size_t kComplex = 2;
  switch (code) {
    case kInt64:
      return visit(std::type_identity<std::int64_t>{}, kReal);
    case kUInt64:
      return visit(std::type_identity<std::uint64_t>{}, kReal);
    case kComplexInt16:
      return visit(std::type_identity<std::int16_t>{}, kComplex);
    case kComplexInt32:
      return visit(std::type_identity<std::int32_t>{}, kComplex);
    case kComplexFloat32:
      return visit(std::type_identity<float>{}, kComplex);
    case kComplexFloat64:
      return visit(std::type_identity<double>{}, kComplex);
    default:
      processes::filters::VisitSampleType(code, "", [&](auto type) {
        visit(type, kReal);
        return processes::filters::FilterResult::Success();
      });
  }
}

}  // namespace zarn::app
