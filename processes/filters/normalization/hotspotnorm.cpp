// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/normalization/hotspotnorm.h"

#include <algorithm>
#include <cstddef>
#include <vector>

#include "host/sys/vectorised.h"
#include "processes/filters/colorbalance/balanceblock.h"

namespace zarn::processes::filters {
namespace {

constexpr std::size_t kCoefficients = 6;

double Surface(const double* p, double x, double y) {
  return (y * p[1] + p[3] + x * p[0]) * x + y * p[2] * y + y * p[4] + p[5];
}

/// The block's columns in the image, divided by its extent.
std::vector<double> PlaceColumns(std::uint32_t column, std::size_t count, double columns) {
  std::vector<double> x(count);
  for (std::size_t i = 0; i < count; ++i) {
    x[i] = static_cast<double>(column + static_cast<std::uint32_t>(i)) / columns;
  }
  return x;
}

/// A channel's part of a run.
ZARN_VECTORISED
void BalanceRun(double* values, std::size_t count, const double* x, double y,
                const double* coefficients) {
  double p[kCoefficients];
  std::copy_n(coefficients, kCoefficients, p);
  for (std::size_t i = 0; i < count; ++i) values[i] = values[i] - Surface(p, x[i], y);
}

struct HotSpots {
  void Run(const PixelRun& run) const {
    const double y = static_cast<double>(y0 + static_cast<std::uint32_t>(run.row)) / rows;
    for (std::size_t c = 0; c < run.channels; ++c) {
      BalanceRun(run.Channel(c), run.count, x + run.column, y, coefficients[c].data());
    }
  }

  const std::vector<double>* coefficients;
  const double* x;  ///< of each column of the block
  double rows;
  std::uint32_t y0;
};

// Channels until the first one whose coefficients are not complete.
std::size_t CompleteChannels(const std::vector<std::vector<double>>& coefficients) {
  const auto incomplete =
      std::find_if(coefficients.begin(), coefficients.end(),
                   [](const std::vector<double>& row) { return row.size() < kCoefficients; });
  return static_cast<std::size_t>(incomplete - coefficients.begin());
}

}  // namespace

FilterResult CPUHotSpotNorm::Process(const gobs::Raster& input, gobs::Raster& output,
                                     std::uint32_t blockX, std::uint32_t blockY,
                                     const std::uint8_t* inputMask) {
  const gobs::NativeDataTypeCode code = gobs::GetDataTypeCode(input);
  const std::vector<ChannelBounds> bounds = TypeBounds(code, input.Channels());
  return VisitBalanced(code, [&]<typename T>(std::type_identity<T>) {
    if (auto refusal = CheckBalanced(input, output, inputNoData, outputNoData,
                                     CompleteChannels(coefficients))) {
      return *refusal;
    }
    const BalanceJob<T> job(input, output, inputNoData, outputNoData, inputMask,
                            MakeConverters<T>(bounds, outputNoData));
    const std::vector<double> x =
        PlaceColumns(blockX, input.Width(), static_cast<double>(columnDivisor));
    const HotSpots correction{coefficients.data(), x.data(), static_cast<double>(rowDivisor),
                              blockY};
    Balance(job, ShareAlways(), correction);
    return FilterResult::Success();
  });
}

}  // namespace zarn::processes::filters
