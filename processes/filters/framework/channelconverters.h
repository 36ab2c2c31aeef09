// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

#include "host/gobs/datatypeadapter.h"
#include "host/gobs/datatypes.h"
#include "processes/filters/framework/outputconverter.h"

namespace zarn::processes::filters {

/// Lowest and highest result of a channel.
struct ChannelBounds {
  double low;
  double high;
};

/// The limits of the sample type for each channel. Throws `ParameterException` for codes without
/// limits, so a filter that calls this before it looks at the type lets that through.
inline std::vector<ChannelBounds> TypeBounds(gobs::NativeDataTypeCode code,
                                             std::uint32_t channels) {
  std::vector<ChannelBounds> bounds;
  for (std::uint32_t c = 0; c < channels; ++c) {
    bounds.push_back(
        {gobs::DataTypeAdapter::MinValue(code), gobs::DataTypeAdapter::MaxValue(code)});
  }
  return bounds;
}

/// The same for filters that need no limits, but refuse blocks of an unknown type in that way.
inline void RequireTypeLimits(gobs::NativeDataTypeCode code, std::uint32_t channels) {
  TypeBounds(code, channels);
}

/// One converter for each channel; an empty no-data list avoids nothing.
template <typename T>
std::vector<OutputConverter<T>> MakeConverters(const std::vector<ChannelBounds>& bounds,
                                               const std::vector<double>& outputNoData) {
  std::vector<OutputConverter<T>> converters;
  converters.reserve(bounds.size());
  for (std::size_t c = 0; c < bounds.size(); ++c) {
    const std::optional<double> noData =
        outputNoData.empty() ? std::nullopt : std::optional(outputNoData[c]);
    converters.emplace_back(bounds[c].low, bounds[c].high, noData);
  }
  return converters;
}

}  // namespace zarn::processes::filters
