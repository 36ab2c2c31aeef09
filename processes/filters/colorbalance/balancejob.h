// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "host/gobs/raster.h"
#include "processes/filters/colorbalance/balancerules.h"
#include "processes/filters/framework/channelconverters.h"

namespace zarn::processes::filters {

/// Everything that one call shares between its threads. Blocks are width * height pixels from their
/// first sample on; margins are not skipped, so they have none.
template <typename T>
struct BalanceJob {
  BalanceJob(const gobs::Raster& in, gobs::Raster& out, const std::vector<double>& inputNoData,
             const std::vector<double>& outputNoData, const std::uint8_t* mask,
             std::vector<OutputConverter<T>> channelConverters)
      : input(static_cast<const T*>(in.Data())),
        output(static_cast<T*>(out.Data())),
        width(in.Width()),
        height(in.Height()),
        channels(in.Channels()),
        rules(in.Channels(), inputNoData, outputNoData, mask),
        converters(std::move(channelConverters)) {}

  std::size_t Pixels() const { return width * height; }

  const T* input;
  T* output;
  std::size_t width;
  std::size_t height;
  std::size_t channels;
  BalanceRules<T> rules;
  std::vector<OutputConverter<T>> converters;  ///< one per channel
};

/// The values of consecutive pixels of one row, channel after channel, to be balanced in place.
struct PixelRun {
  double* Channel(std::size_t c) const { return values + c * pitch; }

  double* values;  ///< those of channel c from `values + c * pitch` on
  std::size_t pitch;
  std::size_t count;  ///< pixels
  std::size_t channels;
  std::size_t column;  ///< of the first pixel, in the block
  std::size_t row;
  const std::uint8_t* excluded;  ///< not 0: the pixel's values do not count; null: all do
};

}  // namespace zarn::processes::filters
