// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/enhancement/cellestimator.h"

#include <algorithm>
#include <array>
#include <cmath>

#include "processes/filters/enhancement/powercurve.h"

namespace zarn::processes::filters {
namespace {

constexpr std::int64_t kLeastShare = 16;  // of a whole tile, one in so many pixels is valid

template <typename T>
std::int64_t CountValid(const TilePixels<T>& tile) {
  std::int64_t count = 0;
  for (std::size_t y = 0; y < tile.height; ++y) {
    const std::uint8_t* const valid = tile.valid + y * tile.stride;
    count += std::count_if(valid, valid + tile.width, [](std::uint8_t v) { return v != 0; });
  }
  return count;
}

// Only the bins of levels that occur are looked at, and emptied in the end: there are tiles of much
// fewer pixels than levels.
template <typename T>
HistogramBins AddSamples(const TilePixels<T>& tile, std::size_t channels, std::size_t channel,
                         std::uint64_t* histogram) {
  unsigned int least = kTopLevel<T>;
  unsigned int most = 0;
  for (std::size_t y = 0; y < tile.height; ++y) {
    const T* const samples = tile.samples + y * tile.stride * channels + channel;
    const std::uint8_t* const valid = tile.valid + y * tile.stride;
    for (std::size_t x = 0; x < tile.width; ++x) {
      const unsigned int level = samples[x * channels];
      const bool counts = valid[x] != 0;
      histogram[level] += counts ? 1 : 0;
      least = std::min(least, counts ? level : least);
      most = std::max(most, counts ? level : most);
    }
  }
  return {histogram, static_cast<unsigned int>(kTopLevel<T>) + 1, std::min(least, most), most + 1};
}

// The same for many bytes that are all valid, in four histograms in turn: neighbours are often
// alike, and a count waits for the one before where both go to the same bin.
HistogramBins AddManyBytes(const TilePixels<std::uint8_t>& tile, std::size_t channels,
                           std::size_t channel, std::uint64_t* histogram) {
  std::array<std::array<std::uint64_t, 256>, 4> counts{};
  for (std::size_t y = 0; y < tile.height; ++y) {
    const std::uint8_t* sample = tile.samples + y * tile.stride * channels + channel;
    std::size_t x = 0;
    for (; x + 4 <= tile.width; x += 4) {
      for (std::array<std::uint64_t, 256>& part : counts) {
        ++part[*sample];
        sample += channels;
      }
    }
    for (; x < tile.width; ++x, sample += channels) ++counts[0][*sample];
  }
  for (std::size_t level = 0; level < 256; ++level) {
    for (const std::array<std::uint64_t, 256>& part : counts) histogram[level] += part[level];
  }
  return {histogram, 256, 0, 256};
}

template <typename T>
HistogramBins Count(const TilePixels<T>& tile, bool allValid, std::size_t channels,
                    std::size_t channel, std::uint64_t* histogram) {
  if constexpr (sizeof(T) == 1) {
    constexpr std::size_t kMany = 2048;
    if (allValid && tile.width * tile.height >= kMany) {
      return AddManyBytes(tile, channels, channel, histogram);
    }
  }
  return AddSamples(tile, channels, channel, histogram);
}

}  // namespace

template <typename T>
std::size_t CellEstimator<T>::Levels() {
  return static_cast<std::size_t>(kTopLevel<T>) + 1;
}

template <typename T>
CellStatus CellEstimator<T>::Estimate(const TilePixels<T>& tile, CellGrid& grid, std::size_t cell,
                                      std::uint64_t* histogram) const {
  const std::int64_t whole = std::int64_t{parameters_.tileWidth} * parameters_.tileHeight;
  const std::int64_t valid = CountValid(tile);
  if (valid == 0 || valid * kLeastShare < whole) return CellStatus::kNoData;
  const bool allValid = valid == static_cast<std::int64_t>(tile.width * tile.height);
  CellStatus status = CellStatus::kValid;
  for (int c = 0; c < grid.Channels(); ++c) {
    const HistogramBins bins = Count(tile, allValid, static_cast<std::size_t>(grid.Channels()),
                                     static_cast<std::size_t>(c), histogram);
    if (!SetStretch(bins, grid, cell, c)) status = CellStatus::kInvalid;
    std::fill(histogram + bins.begin, histogram + bins.end, 0);
  }
  return status;
}

template <typename T>
bool CellEstimator<T>::SetStretch(const HistogramBins& bins, CellGrid& grid, std::size_t cell,
                                  int channel) const {
  int low = 0;
  int high = 0;
  Trim(trim_, bins, parameters_.leftTrim, parameters_.rightTrim, parameters_.ignoreFirstBin,
       parameters_.ignoreLastBin, low, high);
  if (low < 0 || high > kTopLevel<T> || low >= high) return false;
  const double span = std::pow(high - low + 2.5, static_cast<double>(parameters_.power));
  const auto gain = static_cast<float>(kTopLevel<T> / span);
  const bool rises = parameters_.power > 0 && std::isnormal(gain);
  if (rises) grid.Set(cell, channel, gain, static_cast<float>(low - 1));
  return rises;
}

template class CellEstimator<std::uint8_t>;
template class CellEstimator<std::uint16_t>;

}  // namespace zarn::processes::filters
