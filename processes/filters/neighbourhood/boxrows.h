// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <type_traits>

namespace zarn::processes::filters {

/// Elements past the end of a padded row that a vector kernel may touch: four channels of the
/// widest vector of bytes.
inline constexpr std::size_t kRowPadding = std::size_t{4} * 64;

/// Up to here a window sum simply adds its terms; beyond, sums of several terms are shared.
inline constexpr std::size_t kDirectTaps = 9;

/// Levels of shared sums, four times as many terms in each as in the one below, for windows of
/// `taps` terms.
constexpr std::size_t SharedLevels(std::size_t taps) {
  std::size_t levels = 0;
  if (taps <= kDirectTaps) return levels;
  for (; taps >= 4; taps /= 4) ++levels;
  return levels;
}

/// Terms of a window sum at the most: three of each level for a 64-bit number of taps.
inline constexpr std::size_t kMaxTerms = std::size_t{3} * 32;

/// The binary digits that the samples of a row use: all are multiples of 2^low and smaller in
/// magnitude than 2^(high + 1). Sums of such numbers are exact in double, in whatever order they
/// are added, as long as high - low leaves room for the carries.
struct RowRange {
  int low = 4096;
  int high = -4096;
  bool finite = true;

  void Include(const RowRange& other) {
    low = std::min(low, other.low);
    high = std::max(high, other.high);
    finite = finite && other.finite;
  }

  void Include(double value) {
    const std::uint64_t magnitude = std::bit_cast<std::uint64_t>(value) & ~(std::uint64_t{1} << 63);
    if (magnitude == 0) return;
    const int exponent = static_cast<int>(magnitude >> 52);
    const std::uint64_t fraction = magnitude & ((std::uint64_t{1} << 52) - 1);
    const bool normal = exponent != 0;
    const std::uint64_t digits = fraction | (normal ? std::uint64_t{1} << 52 : 0);
    const int unit = (normal ? exponent : 1) - 1075;
    low = std::min(low, unit + std::countr_zero(digits));
    high = std::max(high, unit + 52);
    finite = finite && exponent != 0x7FF;
  }

  /// Whether no sum at all of such samples is sure to be exact.
  bool Hopeless() const { return !finite || high - low >= 53; }

  /// Whether adding and subtracting up to `terms` such samples never rounds.
  bool SumsAreExact(std::uint64_t terms) const {
    if (!finite) return false;
    const int top = high + 1 + static_cast<int>(std::bit_width(terms));
    return high < low || (top - low <= 53 && top < 1024);
  }

  /// The same for the squares of the samples; those too small for their digits do not count as
  /// finite.
  RowRange OfSquares() const {
    return {2 * low, 2 * high + 1, finite && (high < low || 2 * low >= -1074)};
  }

  static RowRange OfIntegers(int bits) { return {0, bits - 1, true}; }

  /// From the bit patterns of the least magnitude above zero (0 when there is none) and the
  /// greatest one of a row of floats.
  static RowRange OfFloatMagnitudes(std::uint32_t least, std::uint32_t most) {
    const int lowExponent = std::max(static_cast<int>(least >> 23), 1);
    const int highExponent = std::max(static_cast<int>(most >> 23), 1);
    if (most == 0) return {};
    return {lowExponent - 150, highExponent - 127, highExponent != 0xFF};
  }
};

/// What counts the pixels of a window beside sums of type `Acc`.
template <typename Acc>
using CountFor = std::conditional_t<
    std::is_same_v<Acc, std::uint16_t>, std::uint8_t,
    std::conditional_t<std::is_same_v<Acc, std::int32_t>, std::uint16_t, std::uint32_t>>;

/// One input row of a window: the input itself where that is possible, else a padded copy.
template <typename T>
struct WindowRow {
  const T* samples;           ///< excluded pixels hold `kNeutralSample`
  const std::uint8_t* flags;  ///< per pixel: 1 when excluded
  T* ownSamples;              ///< where a copy goes
  std::uint8_t* ownFlags;
  RowRange range;  ///< of the samples
  bool dirty;      ///< whether any pixel is excluded
};

/// Samples of up to 16 bits are summed as unsigned ones, with their top bit toggled where they are
/// signed: a constant shift of all samples shifts their mean by as much, and an even one keeps the
/// ties.
template <typename T>
inline constexpr bool kSumsShifted = std::is_integral_v<T>&& std::is_signed_v<T> && sizeof(T) <= 2;

/// The sample that adds nothing to a sum.
template <typename T>
inline constexpr T kNeutralSample = kSumsShifted<T> ? std::numeric_limits<T>::min() : T{0};

}  // namespace zarn::processes::filters
