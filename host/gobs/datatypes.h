// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "host/hostexport.h"

namespace zarn::gobs {

/// Native sample types. The numbers are part of the host's interface.
enum class NativeDataTypeCode : std::uint32_t {
  kUInt8 = 0,
  kInt8 = 1,
  kUInt16 = 2,
  kInt16 = 3,
  kUInt32 = 4,
  kInt32 = 5,
  kFloat32 = 6,
  kInt64 = 7,
  kUInt64 = 8,
  kFloat64 = 9,
  kNone = 10,
  kComplexInt16 = 11,
  kComplexInt32 = 12,
  kComplexFloat32 = 13,
  kComplexFloat64 = 14,
  kUnknown = 15,
};

/// Description of one sample type; a plain value, compared field by field.
struct DataType {
  std::uint32_t bits = 0;  ///< storage bits of one sample component
  std::uint8_t isSigned = 0;
  std::uint8_t isFloat = 0;
  std::uint32_t significandBits = 0;  ///< equal to `bits` for integers
  std::uint32_t exponentBits = 0;     ///< 0 for integers
  std::uint8_t isComplex = 0;         ///< 1: a sample has two components

  bool operator==(const DataType&) const = default;

  /// Bytes of one sample, both components of a complex one included.
  constexpr std::uint32_t BytesPerSample() const {
    return (bits + 7) / 8 * (isComplex != 0 ? 2U : 1U);
  }
};

/// A description together with its code.
///
/// The signed flags of the two 64-bit integer types are swapped (0 for the signed type, 1 for the
/// unsigned one): stored descriptions rely on it, so every comparison of descriptions must keep it.
class ZARN_HOST_EXPORT NativeDataType {
 public:
  /// Throws `Exception` "Unknown datatype in raster" for codes 10 and 15. A code above 15 leaves
  /// the description zeroed.
  explicit NativeDataType(NativeDataTypeCode code);
  NativeDataType(const NativeDataType&) = default;
  NativeDataType& operator=(const NativeDataType&) = default;
  virtual ~NativeDataType();

  NativeDataTypeCode Code() const { return code_; }
  const DataType& Description() const { return description_; }

 private:
  DataType description_;
  NativeDataTypeCode code_;
};

/// The code whose description equals `type`, or `kUnknown` when there is none.
ZARN_HOST_EXPORT NativeDataTypeCode CodeOf(const DataType& type);

}  // namespace zarn::gobs
