// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/enhancement/cellestimator.h"

#include <algorithm>
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

template <typename T>
void AddSamples(const TilePixels<T>& tile, std::size_t channels, std::size_t channel,
                std::uint64_t* histogram) {
  for (std::size_t y = 0; y < tile.height; ++y) {
    const T* const samples = tile.samples + y * tile.stride * channels + channel;
    const std::uint8_t* const valid = tile.valid + y * tile.stride;
    for (std::size_t x = 0; x < tile.width; ++x) {
      histogram[samples[x * channels]] += valid[x] != 0 ? 1 : 0;
    }
  }
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
  CellStatus status = CellStatus::kValid;
  for (int c = 0; c < grid.Channels(); ++c) {
    AddSamples(tile, static_cast<std::size_t>(grid.Channels()), static_cast<std::size_t>(c),
               histogram);
    if (!SetStretch(histogram, grid, cell, c)) status = CellStatus::kInvalid;
    std::fill_n(histogram, Levels(), 0);
  }
  return status;
}

template <typename T>
bool CellEstimator<T>::SetStretch(const std::uint64_t* histogram, CellGrid& grid, std::size_t cell,
                                  int channel) const {
  int low = 0;
  int high = 0;
  trim_.Trim(histogram, parameters_.leftTrim, parameters_.rightTrim,
             static_cast<unsigned int>(Levels()), parameters_.ignoreFirstBin,
             parameters_.ignoreLastBin, -1, low, high);
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
