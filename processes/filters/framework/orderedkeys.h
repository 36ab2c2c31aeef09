// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <bit>
#include <cstdint>
#include <limits>
#include <type_traits>

namespace zarn::processes::filters {

/// The unsigned integer as wide as a sample.
template <typename T>
using OrderedKey = std::conditional_t<
    sizeof(T) == 1, std::uint8_t,
    std::conditional_t<sizeof(T) == 2, std::uint16_t,
                       std::conditional_t<sizeof(T) == 4, std::uint32_t, std::uint64_t>>>;

/// Maps a key to another one so that negative samples come first: integers toggle the top bit;
/// floating ones toggle all others as well where they are negative. There the NaN with a sign would
/// come before all numbers, and shifting the keys down by their number sends these to the end.
template <typename T>
inline constexpr OrderedKey<T> kTopBit = static_cast<OrderedKey<T>>(OrderedKey<T>{1}
                                                                    << (8 * sizeof(T) - 1));
template <typename T>
inline constexpr OrderedKey<T> kSignedNaNs =
    static_cast<OrderedKey<T>>((OrderedKey<T>{1} << (std::numeric_limits<T>::digits - 1)) - 1);

/// A number that sorts as the sample does, every sample one of its own: NaN of either sign last, -0
/// before +0. So what an order statistic picks does not depend on the way to find it.
template <typename T>
constexpr OrderedKey<T> ToOrderedKey(T sample) {
  using Key = OrderedKey<T>;
  const Key bits = std::bit_cast<Key>(sample);
  if constexpr (std::is_floating_point_v<T>) {
    const Key key = (bits & kTopBit<T>) != 0 ? ~bits : bits | kTopBit<T>;
    return key - kSignedNaNs<T>;
  } else {
    return static_cast<Key>(std::is_signed_v<T> ? bits ^ kTopBit<T> : bits);
  }
}

/// The greatest bits of a sample that is neither negative nor NaN: up to there samples sort as
/// their bits do.
template <typename T>
inline constexpr OrderedKey<T> kMostSortedBits =
    std::bit_cast<OrderedKey<T>>(std::is_floating_point_v<T> ? std::numeric_limits<T>::infinity()
                                                             : std::numeric_limits<T>::max());

/// The order of keys, for the algorithms of the standard library.
struct SortsBefore {
  template <typename T>
  constexpr bool operator()(T a, T b) const {
    return ToOrderedKey(a) < ToOrderedKey(b);
  }
};

/// The inverse of `ToOrderedKey`.
template <typename T>
constexpr T FromOrderedKey(OrderedKey<T> key) {
  using Key = OrderedKey<T>;
  if constexpr (std::is_floating_point_v<T>) {
    const Key bits = key + kSignedNaNs<T>;
    return std::bit_cast<T>((bits & kTopBit<T>) != 0 ? bits ^ kTopBit<T> : ~bits);
  } else {
    return std::bit_cast<T>(static_cast<Key>(std::is_signed_v<T> ? key ^ kTopBit<T> : key));
  }
}

}  // namespace zarn::processes::filters
