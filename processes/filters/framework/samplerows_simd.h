// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

#include "processes/filters/framework/converterconstants.h"

namespace zarn::processes::filters {

/// Vector loops over runs of interleaved pixels, for the eight sample types up to 32 bits and
/// double. Samples of pixels and mask bytes are never touched past the run. Rows of our own are
/// padded: they may be read and written up to this many elements past it.
inline constexpr std::size_t kSampleRowPadding = 64;

/// How far ahead loops over large blocks ask for memory: results that are written in between keep
/// the machine from looking ahead by itself.
inline constexpr std::size_t kBytesAhead = 4096;

/// Whether this machine has vectors at all: emulated ones would be slower than plain loops.
bool HasVectors();

/// The samples of `count` pixels as doubles, those of channel c from `values + c * pitch` on, in
/// padded rows. Meanwhile the machine is asked for the memory of as many pixels `ahead`, which is
/// not accessed.
template <typename T>
void WidenPixels(const T* pixels, std::size_t count, std::size_t channels, const T* ahead,
                 double* values, std::size_t pitch);

/// The inverse of `WidenPixels`, through the converter of each channel: the same bits. Asks for the
/// memory `ahead` as well.
template <typename T>
void NarrowPixels(const double* values, std::size_t pitch, std::size_t count, std::size_t channels,
                  const ConverterConstants<T>* converters, const T* ahead, T* pixels);

/// Replaces those of `count` pixels that are flagged, in a padded row, by the pixel `value`.
template <typename T>
void ReplaceExcluded(const std::uint8_t* flags, const T* value, std::size_t count,
                     std::size_t channels, T* pixels);

/// Flags the pixels whose mask byte is 0 or whose channels all equal `noData` (as
/// `PixelNearlyEquals` has it) in a padded row and tells whether there are any. Either pointer may
/// be null.
template <typename T>
bool FlagExcluded(const T* pixels, std::size_t count, std::size_t channels, const T* noData,
                  const std::uint8_t* mask, std::uint8_t* flags);

/// Flags the pixels whose channels all equal `value` exactly, in a padded row.
template <typename T>
void FlagEqual(const T* pixels, std::size_t count, std::size_t channels, const T* value,
               std::uint8_t* flags);

/// Whether any of the samples may nearly equal `value`: false is certain, true is not.
template <typename T>
bool AnySampleNear(const T* samples, std::size_t count, T value);

/// What becomes of each of the 256 values of a byte.
using ByteTable = std::array<std::uint8_t, 256>;

/// Looks up each byte of `count` interleaved pixels in its channel's table. The results may take
/// the place of the pixels.
void LookUpBytes(const std::uint8_t* pixels, std::size_t count, std::size_t channels,
                 const ByteTable* tables, std::uint8_t* results);

}  // namespace zarn::processes::filters
