// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "processes/filters/attribute/poolflags_simd.h"
#include "processes/filters/framework/orderedkeys.h"
#include "processes/filters/framework/sortingnetwork.h"

namespace zarn::processes::filters {

/// The pools of a run of pixels of one row, in one channel.
struct PoolSamples {
  /// Of each cell, the neighbour of the row's first pixel in the first channel: keys of the samples
  /// (`OrderedKey`), but samples as they are for means of floating ones.
  const void* const* cells;
  std::size_t cellCount;
  std::size_t channel;  ///< samples from the first channel to this one
  std::size_t first;    ///< as in `PoolRun`, like all that follow
  std::size_t count;
  const std::uint8_t* flags;
  std::size_t pitch;
  const std::uint8_t* counts8;
  const std::uint16_t* counts16;

  void* results;  ///< of the run; anything where a pool is empty
  void* work;     ///< aligned, `PoolWorkBytes` large
  const std::vector<Exchange>* network;
};

/// The most cells that the loops below take.
inline constexpr std::size_t kMostMeanCells = 32767;
inline constexpr std::size_t kMostOrderedCells = kMostSorted;

/// Means of samples `T`, as samples.
template <typename T>
void PoolMeans(const PoolSamples& pools);

/// Medians of keys, as keys. The number of cells is odd; the network selects their middle rank.
template <typename Key>
void PoolMedians(const PoolSamples& pools);

/// Trimmed means of samples `T` from their keys, as samples. The number of cells is odd; the
/// network selects the ranks of `TrimmedRanks`.
template <typename T>
void PoolTrimmedMeans(const PoolSamples& pools);

/// Bytes in which the ordering loops keep the values of one vector of pixels, or of several.
constexpr std::size_t PoolWorkBytes(std::size_t cells) { return cells * 256; }

/// The pool's place among `cells` sorted values, when excluded ones are filled in with the lowest
/// and the highest in turn, beginning with the lowest: its ranks that a trimmed mean adds up.
struct TrimmedRanks {
  std::size_t first;
  std::size_t last;

  static constexpr TrimmedRanks Of(std::size_t cells, std::size_t pooled) {
    const std::size_t below = (cells - pooled + 1) / 2;
    const std::size_t trimmed = pooled / 4;
    return {below + trimmed, below + pooled - 1 - trimmed};
  }
  /// What pools of all sizes need.
  static constexpr TrimmedRanks OfAny(std::size_t cells) {
    TrimmedRanks all = Of(cells, cells);
    for (std::size_t pooled = 1; pooled < cells; ++pooled) {
      const TrimmedRanks ranks = Of(cells, pooled);
      if (ranks.first < all.first) all.first = ranks.first;
      if (ranks.last > all.last) all.last = ranks.last;
    }
    return all;
  }
};

}  // namespace zarn::processes::filters
