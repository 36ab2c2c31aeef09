// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <type_traits>
#include <vector>

#include "host/core/exception.h"
#include "host/gobs/datatypes.h"

namespace zarn::typedispatch {

/// End of a type list.
struct NullDataType {};

template <typename HeadType, typename TailList>
struct TypeList {
  using Head = HeadType;
  using Tail = TailList;
};

namespace details {

template <typename... Types>
struct MakeTypeList {
  using Type = NullDataType;
};
template <typename First, typename... Rest>
struct MakeTypeList<First, Rest...> {
  using Type = TypeList<First, typename MakeTypeList<Rest...>::Type>;
};

// The description under which blocks of component type T come.
template <typename T>
inline constexpr gobs::NativeDataTypeCode kCodeOf = gobs::NativeDataTypeCode::kUnknown;
template <>
inline constexpr auto kCodeOf<std::int8_t> = gobs::NativeDataTypeCode::kInt8;
template <>
inline constexpr auto kCodeOf<std::uint8_t> = gobs::NativeDataTypeCode::kUInt8;
template <>
inline constexpr auto kCodeOf<std::int16_t> = gobs::NativeDataTypeCode::kInt16;
template <>
inline constexpr auto kCodeOf<std::uint16_t> = gobs::NativeDataTypeCode::kUInt16;
template <>
inline constexpr auto kCodeOf<std::int32_t> = gobs::NativeDataTypeCode::kInt32;
template <>
inline constexpr auto kCodeOf<std::uint32_t> = gobs::NativeDataTypeCode::kUInt32;
template <>
inline constexpr auto kCodeOf<float> = gobs::NativeDataTypeCode::kFloat32;
template <>
inline constexpr auto kCodeOf<double> = gobs::NativeDataTypeCode::kFloat64;
template <>
inline constexpr auto kCodeOf<std::int64_t> = gobs::NativeDataTypeCode::kInt64;
template <>
inline constexpr auto kCodeOf<std::uint64_t> = gobs::NativeDataTypeCode::kUInt64;

}  // namespace details

/// The ten component types, in the order in which they are tried.
using AllSampleTypes =
    details::MakeTypeList<std::int8_t, std::uint8_t, std::int16_t, std::uint16_t, std::int32_t,
                          std::uint32_t, float, double, std::int64_t, std::uint64_t>::Type;

/// Makes processors `Proc<T>` behind their interface `IProc`.
template <template <typename> class Proc, typename IProc>
struct Factory1Template {
  using Interface = IProc;
  template <typename T>
  static IProc* Create() {
    return new Proc<T>();
  }
};

/// Finds the sample type of a block's description and makes the processor for it.
///
/// Usage: `ExtendDispatchTypes<Factory1Template<Proc, IProc>, 1, AllSampleTypes, AllSampleTypes,
/// NullDataType>::Dispatch(types, allowComplex)`.
template <typename Factory, unsigned kConsumed, typename FullList, typename RemainingList,
          typename End>
class ExtendDispatchTypes {
 public:
  static_assert(kConsumed == 1, "processors have one sample type");
  using Interface = typename Factory::Interface;

  /// A new processor for the type that `types[0]` describes; the caller deletes it through the
  /// interface. With `allowComplex` a complex block gets the processor of its component type.
  /// Throws `Exception` when `types` is empty or no type of the list matches.
  static Interface* Dispatch(const std::vector<gobs::DataType>& types, bool allowComplex) {
    constexpr const char* kSource = "core/typedispatch/extendtypedispatch";
    if (types.empty()) {
      throw Exception("Not enough type in the vector for the dispatcher you are using.", kSource,
                      __PRETTY_FUNCTION__, __LINE__);
    }
    using Head = typename RemainingList::Head;
    using Tail = typename RemainingList::Tail;
    gobs::DataType head = gobs::NativeDataType(details::kCodeOf<Head>).Description();
    if (types.front() == head) return Factory::template Create<Head>();
    head.isComplex = 1;
    if (allowComplex && types.front() == head) return Factory::template Create<Head>();
    if constexpr (std::is_same_v<Tail, End>) {
      throw Exception("Invalid type requested.", kSource, __PRETTY_FUNCTION__, __LINE__);
    } else {
      return ExtendDispatchTypes<Factory, kConsumed, FullList, Tail, End>::Dispatch(types,
                                                                                    allowComplex);
    }
  }
};

}  // namespace zarn::typedispatch
