// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "host/gobs/datatypes.h"
#include "processes/filters/colorbalance/icolorbalance.h"

namespace zarn::processes::filters {

namespace details {

/// Balances blocks of one sample type by polynomials of the position.
class INeighProc {
 public:
  INeighProc() = default;
  INeighProc(const INeighProc&) = delete;
  INeighProc& operator=(const INeighProc&) = delete;
  virtual ~INeighProc() = default;

  /// The block's first pixel is at (x0, y0) of the whole image.
  virtual FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t x0,
                               std::uint32_t y0, const std::uint8_t* inputMask) = 0;

  /// No-data values and output bounds; before the first block.
  virtual void SetUp(const std::vector<double>& inputNoData,
                     const std::vector<double>& outputNoData, const std::vector<double>& minima,
                     const std::vector<double>& maxima) = 0;

  /// The channels' coefficients and biases, which the filter owns.
  virtual void SetCoefficients(const std::vector<std::vector<double>>& coefficients,
                               const std::vector<double>& biases) = 0;
};

}  // namespace details

/// A gain that varies with the position. With x and y the column and row in the whole image, v the
/// sample plus the channel's bias and a the channel's coefficients, a sample becomes
///
/// | coefficients | |
/// |---|---|
/// | 2 | a0 + a1 v |
/// | 4 | a0 + (a1 + a2 y + a3 x) v |
/// | 7 | a0 + (a1 + a2 y + a3 x + a4 y^2 + a5 x^2 + a6 x y) v |
/// | others | v |
///
/// All ten sample types; others end in the dispatcher's `Exception`. Blocks of more than 4096
/// pixels and at least two rows are shared out to threads. The filter keeps a processor for the
/// sample type and channel count of the block before, so it serves one caller at a time and cannot
/// be copied.
class NeighborhoodCBBase : public IColorBalance {
 public:
  NeighborhoodCBBase(std::vector<std::vector<double>> coefficients, std::vector<double> biases)
      : oCoeff(std::move(coefficients)), oBias(std::move(biases)) {}

  ColorBalanceKind Kind() const override { return ColorBalanceKind::kNeighborhood; }

 protected:
  std::vector<std::vector<double>> oCoeff;
  std::vector<double> oBias;
};

class CPUNeighborhoodCB : public NeighborhoodCBBase {
 public:
  using NeighborhoodCBBase::NeighborhoodCBBase;

  /// The block's first pixel is at (blockX, blockY) of the whole image; positions wrap at 2^32.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
  void SetNoDataValues(const std::vector<double>* inputValues,
                       const std::vector<double>* outputValues) override;

 private:
  std::unique_ptr<details::INeighProc> processor_;
  gobs::DataType processorType_{};
  std::uint32_t processorChannels_ = 0;
};

}  // namespace zarn::processes::filters
