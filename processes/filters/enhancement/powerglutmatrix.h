// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <vector>

#include "processes/filters/enhancement/cellgrid.h"
#include "processes/filters/enhancement/igeolutmatrix.h"
#include "processes/filters/enhancement/powercurve.h"
#include "processes/filters/enhancement/trimmethod.h"

namespace zarn::processes::filters {

/// The matrix for samples of type `T`: unsigned char or unsigned short.
template <typename T>
class PowerGLUTMatrix : public IGeoLUTMatrix {
 public:
  /// Sizes of the grid and channel count are not negative.
  explicit PowerGLUTMatrix(const GLUTParameters& parameters);

  float GetPower() const override { return parameters_.power; }
  ogc::cs::GeocodingInfo GridGeocoding(const ogc::cs::GeocodingInfo& image) const override;
  int GetChannelCount() const override { return grid_.Channels(); }
  void SetHostData(nspio::Counter* counter) override { counter_ = counter; }
  void FillLUT(void* lut, int row, int column, int channel) const override;
  void SetCell(int row, int column, int channel, float gain, float offset) override;
  int GetPixelDepth() const override { return parameters_.pixelDepth; }
  int GetGridRows() const override { return grid_.Rows(); }
  int GetGridColumns() const override { return grid_.Columns(); }
  int GetLevelCount() const override { return kTopLevel<T> + 1; }
  void WriteDiagnosticRaster(datasources::BasicWriter& classes,
                             datasources::BasicWriter* coefficients,
                             const ogc::cs::GeocodingInfo& image) const override;
  void LoadFromImage(datasources::IRasterReader& image) override;
  void Clean(const GLUTCleaning& passes) override;
  void InterpolateCells(bool fillsMasked) override;
  void RunLocalFilter() override;
  void RunGlobalFilter() override;
  void ValidateMaxGain(const float* maxGains) override;
  int GetTileWidth() const override { return parameters_.tileWidth; }
  int GetTileHeight() const override { return parameters_.tileHeight; }
  void MarkMasked(int row, int column) override { Mark(row, column, CellStatus::kMasked); }
  bool IsMasked(int row, int column) const override;
  void MarkNoData(int row, int column) override { Mark(row, column, CellStatus::kNoData); }
  bool IsValid(int row, int column) const override;
  void SetOffset(unsigned int column, unsigned int row) override;
  void GetOffset(unsigned int& column, unsigned int& row) const override;
  void GetCell(int row, int column, int channel, float& gain, float& offset) const override;

  /// For what reads a saved matrix.
  CellGrid& Grid() { return grid_; }

 private:
  struct Strip;

  void Mark(int row, int column, CellStatus status);
  void Tell(double fraction, const char* step) const;
  void RequireLoadable(const datasources::IRasterReader& image) const;
  void EstimateStrip(const Strip& strip, std::vector<std::uint64_t>& histograms);
  void EmptyRow(int row, int firstColumn);

  GLUTParameters parameters_;
  TrimMethodPtr trim_;
  std::vector<float> powers_;
  CellGrid grid_;
  nspio::Counter* counter_ = nullptr;
  unsigned int offsetColumn_ = 0;
  unsigned int offsetRow_ = 0;
};

extern template class PowerGLUTMatrix<unsigned char>;
extern template class PowerGLUTMatrix<unsigned short>;

}  // namespace zarn::processes::filters
