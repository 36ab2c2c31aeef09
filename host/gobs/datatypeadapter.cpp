// SPDX-License-Identifier: Apache-2.0
#include "host/gobs/datatypeadapter.h"

#include <cstdint>
#include <limits>
#include <string>

#include "host/core/exception.h"

namespace zarn::gobs {
namespace {

struct Limits {
  double min;
  double max;
};

template <typename T>
constexpr Limits LimitsOf() {
  return {static_cast<double>(std::numeric_limits<T>::lowest()),
          static_cast<double>(std::numeric_limits<T>::max())};
}

Limits LimitsOfCode(NativeDataTypeCode code, const char* operation, const char* signature,
                    std::uint32_t line) {
  switch (code) {
    case NativeDataTypeCode::kUInt8:
      return LimitsOf<std::uint8_t>();
    case NativeDataTypeCode::kInt8:
      return LimitsOf<std::int8_t>();
    case NativeDataTypeCode::kUInt16:
      return LimitsOf<std::uint16_t>();
    case NativeDataTypeCode::kInt16:
    case NativeDataTypeCode::kComplexInt16:
      return LimitsOf<std::int16_t>();
    case NativeDataTypeCode::kUInt32:
      return LimitsOf<std::uint32_t>();
    case NativeDataTypeCode::kInt32:
    case NativeDataTypeCode::kComplexInt32:
      return LimitsOf<std::int32_t>();
    case NativeDataTypeCode::kInt64:
      return LimitsOf<std::int64_t>();
    case NativeDataTypeCode::kUInt64:
      return LimitsOf<std::uint64_t>();
    case NativeDataTypeCode::kFloat32:
    case NativeDataTypeCode::kComplexFloat32:
      return LimitsOf<float>();
    case NativeDataTypeCode::kFloat64:
    case NativeDataTypeCode::kComplexFloat64:
      return LimitsOf<double>();
    case NativeDataTypeCode::kNone:
    case NativeDataTypeCode::kUnknown:
      break;
  }
  throw ParameterException(
      "Cannot evaluate " + std::string(operation) + " for the provided datatype", "eDataType", 1,
      "gobs/raster/datatypeadapter", signature, line);
}

}  // namespace

double DataTypeAdapter::MinValue(NativeDataTypeCode eDataType) {
  return LimitsOfCode(eDataType, "MinValue()", __PRETTY_FUNCTION__, __LINE__).min;
}

double DataTypeAdapter::MaxValue(NativeDataTypeCode eDataType) {
  return LimitsOfCode(eDataType, "MaxValue()", __PRETTY_FUNCTION__, __LINE__).max;
}

}  // namespace zarn::gobs
