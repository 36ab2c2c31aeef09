// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <type_traits>

#include "processes/filters/neighbourhood/averagerows.h"
#include "processes/filters/neighbourhood/boxrows.h"

namespace zarn::processes::filters {

/// What the vector kernels add up in: the narrowest type that holds every sum of a window exactly.
enum class SumType { kUInt16, kInt32, kDouble };

/// The type that the rows of the ring hold: 8- and 16-bit samples as unsigned ones.
template <typename T>
struct StoredSample {
  using Type = T;
};
template <>
struct StoredSample<std::int8_t> {
  using Type = std::uint8_t;
};
template <>
struct StoredSample<std::int16_t> {
  using Type = std::uint16_t;
};

/// Rounded division of 16-bit sums by a constant, as a multiplication:
/// (sum + bias) * multiplier >> (16 + shift). An odd divisor leaves no ties.
struct Reciprocal16 {
  std::uint16_t multiplier = 0;
  std::uint16_t bias = 0;
  int shift = 0;
  bool exact = false;

  /// For an odd divisor and sums of at most 255 * divisor. With m = ceil(2^p / d) and
  /// e = m * d - 2^p, floor(n * m / 2^p) = floor(n / d) as long as n * e < 2^p.
  static constexpr Reciprocal16 Of(std::uint64_t divisor) {
    const std::uint64_t most = 255 * divisor + divisor / 2;
    if (most > 0xFFFF) return {};
    Reciprocal16 best;
    for (int shift = 0; shift < 16; ++shift) {
      const std::uint64_t power = std::uint64_t{1} << (16 + shift);
      const std::uint64_t multiplier = (power + divisor - 1) / divisor;
      if (multiplier > 0xFFFF) break;
      if (most * (multiplier * divisor - power) >= power) continue;
      best = {static_cast<std::uint16_t>(multiplier), static_cast<std::uint16_t>(divisor / 2),
              shift, true};
    }
    return best;
  }
};

/// The sizes of one call, in elements.
struct AverageShape {
  std::size_t taps;      ///< side of the window
  std::size_t channels;  ///< samples per pixel
  std::size_t pixels;    ///< pixels of an input row within reach of the output
  std::size_t samples;   ///< their samples
  std::size_t outputs;   ///< samples of an output row
  std::size_t slots;     ///< rows in the ring: the window's and the one that has just left it
  SumType sum;
  bool floatDivides;  ///< single precision rounds every mean as double does
  Reciprocal16 reciprocal;

  template <typename T>
  static AverageShape Of(const AverageJob<T>& job) {
    AverageShape shape{};
    shape.taps = 2 * static_cast<std::size_t>(job.half) + 1;
    shape.channels = static_cast<std::size_t>(job.input.Channels());
    const auto width = static_cast<std::size_t>(job.output.Width());
    shape.pixels = width + shape.taps - 1;
    shape.samples = shape.pixels * shape.channels;
    shape.outputs = width * shape.channels;
    shape.slots = shape.taps + 1;
    const std::uint64_t window = std::uint64_t{shape.taps} * shape.taps;
    shape.sum = SumTypeFor(std::is_integral_v<T> ? sizeof(T) : 8, window);
    // Quotients stay below 2^bits, so a float rounds them by less than 2^(bits - 24), which must
    // not reach the distance 1 / (2 * window) between a quotient and a tie.
    constexpr int kBits = 8 * static_cast<int>(sizeof(T));
    if constexpr (kBits <= 16) {
      shape.floatDivides = (window << kBits) < (std::uint64_t{1} << 23);
    }
    shape.reciprocal = Reciprocal16::Of(window);
    return shape;
  }

 private:
  static SumType SumTypeFor(std::size_t bytes, std::uint64_t window) {
    if (bytes == 1 && window * 0xFF <= 0xFFFF) return SumType::kUInt16;
    if (bytes == 1 && window * 0xFF <= 0x7FFFFFFF) return SumType::kInt32;
    if (bytes == 2 && window * 0xFFFF <= 0x7FFFFFFF) return SumType::kInt32;
    return SumType::kDouble;
  }
};

/// Scratch of one band, cut from a single allocation. Every row is padded, and long enough for the
/// widest accumulator.
template <typename Stored>
struct AverageScratch {
  AverageShape shape;
  WindowRow<Stored>* window;  ///< `slots` rows, the newest last
  std::byte* columns;
  std::byte* excludedColumns;
  std::byte* powers;
  std::byte* sums;
  std::byte* counts;
  Stored* means;
  Stored* centre;
  Stored* old;
  Stored* pattern;
  std::uint8_t* bytes;

  static std::size_t Bytes(const AverageShape& shape) {
    std::size_t size = 0;
    Layout(shape, nullptr, size);
    return size;
  }
  static AverageScratch Take(const AverageShape& shape, std::byte* memory) {
    std::size_t size = 0;
    return Layout(shape, memory, size);
  }

  template <typename Acc>
  Acc* Row(std::byte* row) const {
    return reinterpret_cast<Acc*>(row);
  }

 private:
  static constexpr std::size_t kAlignment = 64;

  static std::size_t Aligned(std::size_t bytes) {
    return (bytes + kAlignment - 1) / kAlignment * kAlignment;
  }
  static std::size_t RowBytes(std::size_t elements, std::size_t size) {
    return Aligned((elements + kRowPadding) * size);
  }

  static AverageScratch Layout(const AverageShape& shape, std::byte* memory, std::size_t& size) {
    const auto take = [&](std::size_t bytes) {
      std::byte* const place = memory == nullptr ? nullptr : memory + size;
      size += Aligned(bytes);
      return place;
    };
    const auto row = [&](std::size_t elements, std::size_t elementSize) {
      return take(RowBytes(elements, elementSize));
    };
    constexpr std::size_t kWidest = sizeof(double);
    AverageScratch s{};
    s.shape = shape;
    s.window = reinterpret_cast<WindowRow<Stored>*>(take(shape.slots * sizeof(WindowRow<Stored>)));
    for (std::size_t slot = 0; slot < shape.slots; ++slot) {
      auto* const samples = reinterpret_cast<Stored*>(row(shape.samples, sizeof(Stored)));
      auto* const flags = reinterpret_cast<std::uint8_t*>(row(shape.pixels, 1));
      if (memory != nullptr) s.window[slot] = {samples, flags, {}, false};
    }
    s.columns = row(shape.samples, kWidest);
    s.excludedColumns = row(shape.pixels, kWidest);
    s.powers = row(shape.samples, kWidest);
    s.sums = row(shape.outputs, kWidest);
    s.counts = row(shape.outputs, kWidest);
    s.means = reinterpret_cast<Stored*>(row(shape.outputs, sizeof(Stored)));
    s.centre = reinterpret_cast<Stored*>(row(shape.outputs, sizeof(Stored)));
    s.old = reinterpret_cast<Stored*>(row(shape.outputs, sizeof(Stored)));
    s.pattern = reinterpret_cast<Stored*>(row(4 * (shape.channels + kRowPadding), sizeof(Stored)));
    s.bytes = reinterpret_cast<std::uint8_t*>(row(shape.pixels, 1));
    return s;
  }
};

/// The output converters' constants, repeated with the channels so that a vector loads the right
/// ones at any phase.
template <typename T>
struct BoundPattern {
  const T* low = nullptr;
  const T* high = nullptr;
  const T* noData = nullptr;  ///< where nothing is to be avoided: no mean comes near it
  const T* replacement = nullptr;
  std::size_t channels = 1;
  bool active = false;  ///< whether any mean can be changed at all
  bool avoids = false;

  /// `memory` has room for 4 * (channels + kRowPadding) samples.
  template <typename Stored>
  static BoundPattern Of(const AverageJob<T>& job, Stored* memory) {
    static_assert(sizeof(Stored) == sizeof(T));
    BoundPattern pattern;
    pattern.channels = job.converters.size();
    if (pattern.channels == 0) return pattern;
    const std::size_t length = pattern.channels + kRowPadding;
    T* const low = reinterpret_cast<T*>(memory);
    T* const high = low + length;
    T* const noData = high + length;
    T* const replacement = noData + length;
    using Limits = std::numeric_limits<T>;
    for (std::size_t i = 0; i < length; ++i) {
      const OutputConverter<T>& converter = job.converters[i % pattern.channels];
      low[i] = converter.low();
      high[i] = converter.high();
      noData[i] = converter.avoids() || !std::is_floating_point_v<T> ? converter.noData()
                                                                     : Limits::quiet_NaN();
      replacement[i] = converter.avoids() ? converter.replacement() : noData[i];
      // Means of floating samples leave the bounds when a sample is infinite.
      pattern.active = pattern.active || std::is_floating_point_v<T> || converter.avoids() ||
                       low[i] != Limits::lowest() || high[i] != Limits::max();
      pattern.avoids = pattern.avoids || converter.avoids();
    }
    pattern.low = low;
    pattern.high = high;
    pattern.noData = noData;
    pattern.replacement = replacement;
    return pattern;
  }
};

}  // namespace zarn::processes::filters
