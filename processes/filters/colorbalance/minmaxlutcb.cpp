// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/colorbalance/minmaxlutcb.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <type_traits>

#include "host/gobs/saturatecast.h"
#include "processes/filters/colorbalance/balanceblock.h"
#include "processes/filters/colorbalance/mapsamples.h"

namespace zarn::processes::filters {
namespace {

// The whole difference: no integer type up to 32 bits overflows in 64; floating samples subtract in
// their own type.
template <typename T>
double Above(T v, T low) {
  if constexpr (std::is_floating_point_v<T>) {
    return static_cast<double>(v - low);
  } else {
    return static_cast<double>(std::int64_t{v} - std::int64_t{low});
  }
}

/// One channel: its table over the samples from `low` to `high`.
template <typename T>
struct RangeTable {
  RangeTable(const LookUpTable& entries, double min, double max)
      : table(entries),
        low(gobs::SaturateCast<T>(min)),
        high(gobs::SaturateCast<T>(max)),
        scale(255.0 / (max - min)) {}

  T operator()(T v, const OutputConverter<T>& converter) const {
    if (v > high) return high;
    if (v < low) return low;
    const double x = Above(v, low) * scale;
    const int i0 = Position(v, x);
    const int i1 = std::min(i0 + 1, 255);
    double t = table[static_cast<std::size_t>(i0)];
    // The slope is 0 on purpose: only a position that is no number shows through.
    if (i1 != i0) t = (t - t) * (x - i0) + t;
    return converter(static_cast<double>(low) + t / scale);
  }

  // A range without extent puts its only sample at the table's end.
  int Position(T v, double x) const {
    if (std::isnan(x) && v == v) return 255;
    return gobs::SaturateCast<std::uint8_t>(x);
  }

  const LookUpTable& table;
  T low;
  T high;
  double scale;
};

}  // namespace

FilterResult CPUMinMaxLUTCB::Process(const gobs::Raster& input, gobs::Raster& output,
                                     std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                     const std::uint8_t* inputMask) {
  const auto code = gobs::GetDataTypeCode(input);
  return VisitBalanced(code, [&]<typename T>(std::type_identity<T>) {
    if (auto refusal = CheckBalanced(input, output, inputNoData, outputNoData,
                                     std::min({luts.size(), mins.size(), maxs.size()}))) {
      return *refusal;
    }
    std::vector<RangeTable<T>> tables;
    std::vector<ChannelBounds> bounds;
    for (std::size_t c = 0; c < input.Channels(); ++c) {
      tables.emplace_back(luts[c], mins[c], maxs[c]);
      bounds.push_back({static_cast<double>(tables[c].low), static_cast<double>(tables[c].high)});
    }
    const BalanceJob<T> job(input, output, inputNoData, outputNoData, inputMask,
                            MakeConverters<T>(bounds, outputNoData));
    MapSamples(job, ShareAbove(kLUTSerialUpTo, input),
               [&](T v, std::size_t c) { return tables[c](v, job.converters[c]); });
    return FilterResult::Success();
  });
}

}  // namespace zarn::processes::filters
