// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "processes/filters/colorbalance/balancepixels.h"

namespace zarn::processes::filters {

/// The definition of a balancer that maps every sample by itself: `map(sample, channel)` is the
/// result. For pixels `begin` .. `end` - 1.
template <typename T, class Map>
void MapPixels(const BalanceJob<T>& job, std::size_t begin, std::size_t end, const Map& map) {
  for (std::size_t i = begin; i < end; ++i) {
    const T* const in = job.input + i * job.channels;
    T* const out = job.output + i * job.channels;
    if (job.rules.Excludes(in, i)) {
      job.rules.WriteExcluded(out);
    } else {
      for (std::size_t c = 0; c < job.channels; ++c) out[c] = map(in[c], c);
    }
  }
}

#if ZARN_SIMD

/// The result for each of the 256 samples of a byte type, by its bits.
template <typename T, class Map>
ByteTable MakeByteTable(const Map& map, std::size_t channel) {
  static_assert(sizeof(T) == 1);
  ByteTable table;
  for (std::size_t bits = 0; bits < table.size(); ++bits) {
    const auto sample = static_cast<T>(static_cast<std::uint8_t>(bits));
    table[bits] = static_cast<std::uint8_t>(map(sample, channel));
  }
  return table;
}

/// The same as `MapPixels`, bit for bit, by tables.
template <typename T, class Map>
void MapBytes(const BalanceJob<T>& job, const BalanceSharing& sharing, const Map& map) {
  std::vector<ByteTable> tables;
  for (std::size_t c = 0; c < job.channels; ++c) tables.push_back(MakeByteTable<T>(map, c));
  MapBlock(job, sharing, [&](const T* pixels, std::size_t count, T* results) {
    LookUpBytes(reinterpret_cast<const std::uint8_t*>(pixels), count, job.channels, tables.data(),
                reinterpret_cast<std::uint8_t*>(results));
  });
}

#endif

/// Balances a block sample by sample.
template <typename T, class Map>
void MapSamples(const BalanceJob<T>& job, const BalanceSharing& sharing, const Map& map) {
  if (job.Pixels() == 0 || job.channels == 0) return;
#if ZARN_SIMD
  constexpr std::size_t kPixelsWorthTables = 1024;
  if constexpr (sizeof(T) == 1) {
    if (RunsAreFast<T>() && job.Pixels() >= kPixelsWorthTables) {
      MapBytes(job, sharing, map);
      return;
    }
  }
#endif
  ForEachPixelBand(
      job, sharing, [](std::size_t) {},
      [&](std::size_t, std::size_t begin, std::size_t end) { MapPixels(job, begin, end, map); });
}

}  // namespace zarn::processes::filters
