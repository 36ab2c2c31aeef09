// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "apps/zarn/dataset.h"

namespace zarn::app {

/// The smallest sample type of a source map whose numbers go up to `largest`.
inline SampleType SourceMapType(std::int64_t largest) {
  using enum gobs::NativeDataTypeCode;
  if (largest <= 255) return {kUInt8, GDT_Byte};
  if (largest <= 65535) return {kUInt16, GDT_UInt16};
  return {kUInt32, GDT_UInt32};
}

}  // namespace zarn::app
