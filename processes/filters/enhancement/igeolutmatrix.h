// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/datasources/basicwriter.h"
#include "host/datasources/irasterreader.h"
#include "host/nspio/counter.h"
#include "host/ogc/cs/geocodinginfo.h"
#include "processes/filters/enhancement/glutparameters.h"
#include "processes/filters/filtersexport.h"

namespace zarn::processes::filters {

/// A grid of local look-up tables ("GeoLUTs") that enhances an image: the image is divided into
/// tiles, and each cell of the grid holds, per channel, gain and offset of a power-law stretch of
/// its tile. A status says whether a cell is valid ('G'), invalid ('I'), without data ('N') or
/// masked ('M'); all are valid at first, with gains and offsets of 0.
///
/// Rows, columns and channels count from 0. Those outside of the grid are ignored by what sets
/// something, and false in tests. Const operations are safe for any number of threads at once.
///
/// `LoadFromImage`, the passes and `ValidateMaxGain` report to the counter of `SetHostData`, if
/// any, from one thread at a time; what the counter throws ends them.
class ZARN_FILTERS_EXPORT IGeoLUTMatrix {
 public:
  IGeoLUTMatrix() = default;
  IGeoLUTMatrix(const IGeoLUTMatrix&) = delete;
  IGeoLUTMatrix& operator=(const IGeoLUTMatrix&) = delete;
  virtual ~IGeoLUTMatrix();

  /// The exponent of the stretch.
  virtual float GetPower() const = 0;
  /// Where the cells lie, from where the pixels of the image lie: the same offsets, and steps that
  /// are longer by the width (x) and the height (y) of a tile.
  virtual ogc::cs::GeocodingInfo GridGeocoding(const ogc::cs::GeocodingInfo& image) const = 0;
  virtual int GetChannelCount() const = 0;
  /// The counter to report to, which is borrowed, or null.
  virtual void SetHostData(nspio::Counter* counter) = 0;
  /// Fills the table of a cell and channel: `GetLevelCount` entries of the sample type (unsigned
  /// char or unsigned short). Untouched when there is no such cell or channel.
  virtual void FillLUT(void* lut, int row, int column, int channel) const = 0;
  virtual void SetCell(int row, int column, int channel, float gain, float offset) = 0;
  /// Bits of a sample: 8 or 16.
  virtual int GetPixelDepth() const = 0;
  virtual int GetGridRows() const = 0;
  virtual int GetGridColumns() const = 0;
  /// 256 or 65536.
  virtual int GetLevelCount() const = 0;
  /// Writes a raster of one byte for each cell that names its class, with colours and the
  /// parameters as metadata, placed as `image` is; and, unless `coefficients` is null, a raster of
  /// floats with the gain and the offset of each channel. Both together are what a matrix can be
  /// made from again. Exceptions of the writers pass through.
  virtual void WriteDiagnosticRaster(datasources::BasicWriter& classes,
                                     datasources::BasicWriter* coefficients,
                                     const ogc::cs::GeocodingInfo& image) const = 0;
  /// Estimates all cells that are not masked from the histograms of their tiles, in one pass over
  /// the image. The first tile begins at `GetOffset`; pixels beyond the grid are not looked at, and
  /// tiles beyond the image have no data. Throws `ParameterException` when the image has another
  /// sample type or number of channels, tiles are smaller than a pixel, or the trim method is
  /// unknown; exceptions of the reader pass through.
  virtual void LoadFromImage(datasources::IRasterReader& image) = 0;
  /// Runs the passes that are asked for: local filter, global filter, interpolation.
  virtual void Clean(const GLUTCleaning& passes) = 0;
  /// Gives invalid cells and those without data, and masked ones if asked for, gains and offsets
  /// from valid cells around them; their statuses stay. Throws `DataException` when there is no
  /// valid cell.
  virtual void InterpolateCells(bool fillsMasked) = 0;
  /// Makes valid cells invalid whose gains do not fit those around them.
  virtual void RunLocalFilter() = 0;
  /// Makes valid cells invalid that are a small group far from all others.
  virtual void RunGlobalFilter() = 0;
  /// Makes valid cells invalid that have a gain above `maxGains`, one for each channel.
  virtual void ValidateMaxGain(const float* maxGains) = 0;
  virtual int GetTileWidth() const = 0;
  virtual int GetTileHeight() const = 0;
  virtual void MarkMasked(int row, int column) = 0;
  virtual bool IsMasked(int row, int column) const = 0;
  virtual void MarkNoData(int row, int column) = 0;
  virtual bool IsValid(int row, int column) const = 0;
  /// Column and row of the image at which the first tile begins.
  virtual void SetOffset(unsigned int column, unsigned int row) = 0;
  virtual void GetOffset(unsigned int& column, unsigned int& row) const = 0;
  /// Gain and offset of a cell; untouched when there is no such cell or channel.
  virtual void GetCell(int row, int column, int channel, float& gain, float& offset) const = 0;
};

}  // namespace zarn::processes::filters
