// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/colorbalance/gainoffsetcb.h"

#include <algorithm>
#include <cstddef>

#include "host/sys/vectorised.h"
#include "processes/filters/colorbalance/balanceblock.h"
#include "processes/filters/colorbalance/mapsamples.h"
#if ZARN_SIMD
#include "processes/filters/colorbalance/gainoffsetcb_simd.h"
#endif

namespace zarn::processes::filters {
namespace {

double Balanced(double v, double gain, double offset) { return v * gain + offset; }

ZARN_VECTORISED
void BalanceRun(double* values, std::size_t count, double gain, double offset) {
  for (std::size_t i = 0; i < count; ++i) values[i] = Balanced(values[i], gain, offset);
}

struct GainOffset {
  void Run(const PixelRun& run) const {
    for (std::size_t c = 0; c < run.channels; ++c) {
      BalanceRun(run.Channel(c), run.count, gains[c], offsets[c]);
    }
  }

  const double* gains;
  const double* offsets;
};

constexpr std::int64_t kSerialUpTo = 4000;

}  // namespace

FilterResult CPUGainOffsetCB::Process(const gobs::Raster& input, gobs::Raster& output,
                                      std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                      const std::uint8_t* inputMask) {
  const gobs::NativeDataTypeCode code = gobs::GetDataTypeCode(input);
  const std::vector<ChannelBounds> bounds = TypeBounds(code, input.Channels());
  return VisitBalanced(code, [&]<typename T>(std::type_identity<T>) {
    if (auto refusal = CheckBalanced(input, output, inputNoData, outputNoData,
                                     std::min(gains.size(), offsets.size()))) {
      return *refusal;
    }
    const BalanceJob<T> job(input, output, inputNoData, outputNoData, inputMask,
                            MakeConverters<T>(bounds, outputNoData));
    const BalanceSharing sharing = ShareAbove(kSerialUpTo, input);
    if constexpr (sizeof(T) == 1) {
      MapSamples(job, sharing, [&](T v, std::size_t c) {
        return job.converters[c](Balanced(static_cast<double>(v), gains[c], offsets[c]));
      });
    } else {
#if ZARN_SIMD
      if (RunsAreFast<T>() && job.Pixels() > 0 && job.channels > 0) {
        const GainOffsetPattern<T> pattern(gains.data(), offsets.data(), job.converters);
        MapBlock(job, sharing, [&](const T* pixels, std::size_t count, T* results) {
          pattern.Apply(pixels, count * job.channels, results);
        });
        return FilterResult::Success();
      }
#endif
      Balance(job, sharing, GainOffset{gains.data(), offsets.data()});
    }
    return FilterResult::Success();
  });
}

}  // namespace zarn::processes::filters
