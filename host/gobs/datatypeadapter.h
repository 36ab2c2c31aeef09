// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/gobs/datatypes.h"
#include "host/hostexport.h"

namespace zarn::gobs {

/// Limits of the native sample types as doubles. The largest 64-bit integers are not representable
/// and come out as 2^63 and 2^64. Both throw `ParameterException` (parameter "eDataType", type 1)
/// for codes 10, 15 and above.
class ZARN_HOST_EXPORT DataTypeAdapter {
 public:
  static double MinValue(NativeDataTypeCode eDataType);
  static double MaxValue(NativeDataTypeCode eDataType);
};

}  // namespace zarn::gobs
