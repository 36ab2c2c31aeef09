// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

#include "processes/filters/framework/outputconverter.h"

namespace zarn::processes::filters {

/// Vector loops over runs of samples, for the eight sample types up to 32 bits and double. All rows
/// are padded: they may be read and written up to this many elements past the length given.
inline constexpr std::size_t kSampleRowPadding = 64;

/// How far ahead loops over large blocks ask for memory: results that are written in between keep
/// the machine from looking ahead by itself.
inline constexpr std::size_t kBytesAhead = 2048;

/// Whether this machine has vectors at all: emulated ones would be slower than plain loops.
bool HasVectors();

/// Channels of `count` interleaved pixels, those of channel c from `planes + c * pitch` on.
template <typename T>
void SplitChannels(const T* pixels, std::size_t count, std::size_t channels, T* planes,
                   std::size_t pitch);

/// What `JoinChannels` writes for pixels that are excluded.
template <typename T>
struct ExcludedPixels {
  const std::uint8_t* flags = nullptr;  ///< one per pixel, not 0: excluded; null: none is
  const T* value = nullptr;             ///< the pixel to write, or null for those of `old`
  const T* old = nullptr;               ///< interleaved; looked at only without `value`
};

/// The inverse of `SplitChannels`.
template <typename T>
void JoinChannels(const T* planes, std::size_t pitch, std::size_t count, std::size_t channels,
                  const ExcludedPixels<T>& excluded, T* pixels);

/// Replaces those of `count` interleaved pixels that are excluded.
template <typename T>
void ReplaceExcluded(const ExcludedPixels<T>& excluded, std::size_t count, std::size_t channels,
                     T* pixels);

/// Flags the pixels whose mask byte is 0 or whose channels all equal `noData` (as
/// `PixelNearlyEquals` has it) and tells whether there are any. Either pointer may be null.
template <typename T>
bool FlagExcluded(const T* planes, std::size_t pitch, std::size_t count, std::size_t channels,
                  const T* noData, const std::uint8_t* mask, std::uint8_t* flags);

/// Whether any of the samples may nearly equal `value`: false is certain, true is not.
template <typename T>
bool AnySampleNear(const T* samples, std::size_t count, T value);

/// Samples as doubles.
template <typename T>
void WidenSamples(const T* samples, std::size_t count, double* values);

/// `converter` applied to `count` values: the same bits.
template <typename T>
void NarrowSamples(const double* values, std::size_t count, const OutputConverter<T>& converter,
                   T* samples);

/// What becomes of each of the 256 values of a byte.
using ByteTable = std::array<std::uint8_t, 256>;

/// Looks up each byte of `count` interleaved pixels in its channel's table. The results may take
/// the place of the pixels.
void LookUpBytes(const std::uint8_t* pixels, std::size_t count, std::size_t channels,
                 const ByteTable* tables, std::uint8_t* results);

/// Copies `size` bytes past the caches; for results that are too large to stay in them. The regions
/// do not overlap. `FinishStreaming` comes before the thread lets others see them.
void StreamBytes(const std::byte* from, std::size_t size, std::byte* to);
void FinishStreaming();

}  // namespace zarn::processes::filters
