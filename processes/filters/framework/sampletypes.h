// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <type_traits>
#include <utility>

#include "host/gobs/datatypes.h"
#include "processes/filters/framework/filterresult.h"

namespace zarn::processes::filters {

/// Calls `visit(std::type_identity<T>{})` with the sample type of `code` and returns its result.
/// The eight handled types are the integers up to 32 bits, float and double; any other code returns
/// a failure with `unknownType` as its message.
template <typename Visitor>
FilterResult VisitSampleType(gobs::NativeDataTypeCode code, const char* unknownType,
                             Visitor&& visit) {
  using enum gobs::NativeDataTypeCode;
  switch (code) {
    case kUInt8:
      return std::forward<Visitor>(visit)(std::type_identity<std::uint8_t>{});
    case kInt8:
      return std::forward<Visitor>(visit)(std::type_identity<std::int8_t>{});
    case kUInt16:
      return std::forward<Visitor>(visit)(std::type_identity<std::uint16_t>{});
    case kInt16:
      return std::forward<Visitor>(visit)(std::type_identity<std::int16_t>{});
    case kUInt32:
      return std::forward<Visitor>(visit)(std::type_identity<std::uint32_t>{});
    case kInt32:
      return std::forward<Visitor>(visit)(std::type_identity<std::int32_t>{});
    case kFloat32:
      return std::forward<Visitor>(visit)(std::type_identity<float>{});
    case kFloat64:
      return std::forward<Visitor>(visit)(std::type_identity<double>{});
    default:
      return FilterResult::Failure(unknownType);
  }
}

}  // namespace zarn::processes::filters
