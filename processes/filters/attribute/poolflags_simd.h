// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

namespace zarn::processes::filters {

/// Pixels that the vector loops over pools take at a time. All rows may be read and written up to
/// the next multiple.
inline constexpr std::size_t kPoolGroup = 64;

/// The neighbours of a row of pixels in one cell of the kernel, from the neighbour of the row's
/// first pixel on.
struct NeighbourRow {
  const void* labels;              ///< null without labels
  const std::uint8_t* unlabelled;  ///< flags of pixels without a label; null: there are none
  const std::uint8_t* excluded;    ///< flags of pixels that no pool has; null: there are none
};

/// A run of pixels of one row whose neighbours are to be told apart.
struct PoolRun {
  const NeighbourRow* cells;
  std::size_t cellCount;
  NeighbourRow centre;
  std::size_t first;  ///< pixel of the row
  std::size_t count;

  // Results, from the run's first pixel on.
  std::uint8_t* flags;      ///< 255 where the neighbour is pooled, else 0; one row for each cell
  std::size_t pitch;        ///< from one row of flags to the next
  std::uint8_t* counts8;    ///< sizes of the pools, modulo 256
  std::uint16_t* counts16;  ///< the same, modulo 65536
};

/// Integer labels as unsigned ones, signed ones bit by bit: a neighbour is near if its label minus
/// the centre's plus `below` is at most `span`, all in the type of the labels.
template <typename A>
void FlagNearLabels(const PoolRun& run, A below, A span);
/// Floating labels: a neighbour is near unless its difference to the centre is greater than
/// `tolerance` either way.
template <typename A>
void FlagNearLabels(const PoolRun& run, A tolerance);
/// Without labels.
void FlagNeighbours(const PoolRun& run);

/// Flags the pixels that stay as they are, because their pool is empty or their mask byte is 0, and
/// tells whether there are any. `mask` is null or as long as `count`, without padding.
bool FlagKept(const std::uint16_t* counts, const std::uint8_t* mask, std::size_t count,
              std::uint8_t* flags);

}  // namespace zarn::processes::filters
