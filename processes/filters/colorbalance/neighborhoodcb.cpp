// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/colorbalance/neighborhoodcb.h"

#include <cstddef>

#include "host/gobs/datatypeadapter.h"
#include "host/sys/vectorised.h"
#include "processes/filters/colorbalance/balanceblock.h"
#include "processes/filters/framework/extendtypedispatch.h"

namespace zarn::processes::filters {
namespace {

double Balanced2(double v, const double* a) { return a[0] + a[1] * v; }
double Balanced4(double v, const double* a, double x, double y) {
  return a[0] + (a[1] + a[2] * y + a[3] * x) * v;
}
double Balanced7(double v, const double* a, double x, double y) {
  return a[0] + ((a[4] * y + a[2] + a[6] * x) * y + (a[5] * x + a[3]) * x + a[1]) * v;
}

/// The block's columns in the image.
std::vector<double> Columns(std::uint32_t first, std::size_t count) {
  std::vector<double> x(count);
  for (std::size_t i = 0; i < count; ++i) {
    x[i] = static_cast<double>(first + static_cast<std::uint32_t>(i));
  }
  return x;
}

/// A channel's part of a run.
ZARN_VECTORISED
void BalanceRun(double* values, std::size_t count, const double* x, double y,
                const double* coefficients, std::size_t n, double bias) {
  double a[7] = {};
  if (n <= 7) std::copy_n(coefficients, n, a);
  switch (n) {
    case 2:
      for (std::size_t i = 0; i < count; ++i) values[i] = Balanced2(values[i] + bias, a);
      break;
    case 4:
      for (std::size_t i = 0; i < count; ++i) values[i] = Balanced4(values[i] + bias, a, x[i], y);
      break;
    case 7:
      for (std::size_t i = 0; i < count; ++i) values[i] = Balanced7(values[i] + bias, a, x[i], y);
      break;
    default:
      for (std::size_t i = 0; i < count; ++i) values[i] += bias;
  }
}

struct Polynomials {
  void Run(const PixelRun& run) const {
    const auto y = static_cast<double>(y0 + static_cast<std::uint32_t>(run.row));
    for (std::size_t c = 0; c < run.channels; ++c) {
      BalanceRun(run.Channel(c), run.count, x + run.column, y, rows[c], n, biases[c]);
    }
  }

  const double* const* rows;
  std::size_t n;
  const double* biases;
  const double* x;  ///< of each column of the block
  std::uint32_t y0;
};

constexpr std::int64_t kSerialUpTo = 4096;

}  // namespace

namespace details {

template <typename T>
class CPUNeighProc : public INeighProc {
 public:
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t x0,
                       std::uint32_t y0, const std::uint8_t* inputMask) override {
    const BalanceJob<T> job(input, output, inputNoData_, outputNoData_, inputMask, converters_);
    const std::vector<double> x = Columns(x0, input.Width());
    Balance(job, ShareRowsAbove(kSerialUpTo, input),
            Polynomials{rows_.data(), n_, biases_, x.data(), y0});
    return FilterResult::Success();
  }

  void SetUp(const std::vector<double>& inputNoData, const std::vector<double>& outputNoData,
             const std::vector<double>& minima, const std::vector<double>& maxima) override {
    inputNoData_ = inputNoData;
    outputNoData_ = outputNoData;
    std::vector<ChannelBounds> bounds;
    for (std::size_t c = 0; c < minima.size(); ++c) bounds.push_back({minima[c], maxima[c]});
    converters_ = MakeConverters<T>(bounds, outputNoData);
  }

  void SetCoefficients(const std::vector<std::vector<double>>& coefficients,
                       const std::vector<double>& biases) override {
    rows_.clear();
    for (const std::vector<double>& row : coefficients) {
      rows_.push_back(row.empty() ? nullptr : row.data());
    }
    n_ = coefficients.empty() ? 0 : coefficients.front().size();
    biases_ = biases.data();
  }

 private:
  std::vector<const double*> rows_;  ///< null for an empty one
  std::size_t n_ = 0;
  const double* biases_ = nullptr;
  std::vector<double> inputNoData_;
  std::vector<double> outputNoData_;
  std::vector<OutputConverter<T>> converters_;
};

}  // namespace details

FilterResult CPUNeighborhoodCB::Process(const gobs::Raster& input, gobs::Raster& output,
                                        std::uint32_t blockX, std::uint32_t blockY,
                                        const std::uint8_t* inputMask) {
  using typedispatch::AllSampleTypes;
  if (!(input.Type() == processorType_) || input.Channels() != processorChannels_) {
    processor_.reset();
  }
  std::unique_ptr<details::INeighProc> fresh;
  if (!processor_) {
    fresh.reset(
        typedispatch::ExtendDispatchTypes<
            typedispatch::Factory1Template<details::CPUNeighProc, details::INeighProc>, 1,
            AllSampleTypes, AllSampleTypes, typedispatch::NullDataType>::Dispatch({input.Type()},
                                                                                  false));
  }
  if (auto refusal = CheckBalanced(input, output, inputNoData, outputNoData,
                                   std::min(oCoeff.size(), oBias.size()))) {
    return *refusal;
  }
  if (fresh) {
    const gobs::NativeDataTypeCode code = gobs::GetDataTypeCode(input);
    const std::vector<double> minima(input.Channels(), gobs::DataTypeAdapter::MinValue(code));
    const std::vector<double> maxima(input.Channels(), gobs::DataTypeAdapter::MaxValue(code));
    fresh->SetCoefficients(oCoeff, oBias);
    fresh->SetUp(inputNoData, outputNoData, minima, maxima);
    processor_ = std::move(fresh);
    processorType_ = input.Type();
    processorChannels_ = input.Channels();
  }
  return processor_->Process(input, output, blockX, blockY, inputMask);
}

void CPUNeighborhoodCB::SetNoDataValues(const std::vector<double>* inputValues,
                                        const std::vector<double>* outputValues) {
  IFilter::SetNoDataValues(inputValues, outputValues);
  processor_.reset();
}

}  // namespace zarn::processes::filters
