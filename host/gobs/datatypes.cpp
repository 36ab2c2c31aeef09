// SPDX-License-Identifier: Apache-2.0
#include "host/gobs/datatypes.h"

#include <array>
#include <cstddef>

#include "host/core/exception.h"

namespace zarn::gobs {
namespace {

// Indexed by code; the empty entries are the codes without a sample type.
constexpr std::array<DataType, 16> kDescriptions = {{
    {8, 0, 0, 8, 0, 0},
    {8, 1, 0, 8, 0, 0},
    {16, 0, 0, 16, 0, 0},
    {16, 1, 0, 16, 0, 0},
    {32, 0, 0, 32, 0, 0},
    {32, 1, 0, 32, 0, 0},
    {32, 1, 1, 23, 8, 0},
    {64, 0, 0, 64, 0, 0},
    {64, 1, 0, 64, 0, 0},
    {64, 1, 1, 52, 11, 0},
    {},
    {16, 1, 0, 16, 0, 1},
    {32, 1, 0, 32, 0, 1},
    {32, 1, 1, 23, 8, 1},
    {64, 1, 1, 52, 11, 1},
    {},
}};

constexpr bool HasNoType(std::size_t code) { return kDescriptions[code].bits == 0; }

}  // namespace

NativeDataType::NativeDataType(NativeDataTypeCode code) : code_(code) {
  const auto index = static_cast<std::size_t>(code);
  if (index >= kDescriptions.size()) return;
  if (HasNoType(index)) throw Exception("Unknown datatype in raster");
  description_ = kDescriptions[index];
}

NativeDataType::~NativeDataType() = default;

NativeDataTypeCode CodeOf(const DataType& type) {
  for (std::size_t code = 0; code < kDescriptions.size(); ++code) {
    if (!HasNoType(code) && kDescriptions[code] == type) {
      return static_cast<NativeDataTypeCode>(code);
    }
  }
  return NativeDataTypeCode::kUnknown;
}

}  // namespace zarn::gobs
