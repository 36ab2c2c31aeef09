// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>

namespace zarn::processes::filters {

/// The widest vector.
inline constexpr std::size_t kVectorBytes = 64;

/// Elements past the end of a padded row that a vector kernel may touch: four channels of the
/// widest vector of bytes.
inline constexpr std::size_t kRowPadding = 4 * kVectorBytes;

/// Up to here a window sum simply adds its terms; beyond, doubling takes fewer additions.
inline constexpr std::size_t kDirectTaps = 9;

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

/// A padded copy of one input row.
template <typename Stored>
struct WindowRow {
  Stored* samples;      ///< excluded pixels are zero
  std::uint8_t* flags;  ///< per pixel: 1 when excluded
  RowRange range;       ///< of the samples
  bool dirty;           ///< whether any pixel is excluded
};

}  // namespace zarn::processes::filters
