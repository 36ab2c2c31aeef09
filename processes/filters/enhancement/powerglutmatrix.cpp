// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/enhancement/powerglutmatrix.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <exception>
#include <memory>
#include <mutex>
#include <string>
#include <type_traits>

#include "host/core/exception.h"
#include "host/gobs/raster.h"
#include "host/nspio/debugger.h"
#include "processes/filters/enhancement/cellcleaning.h"
#include "processes/filters/enhancement/cellestimator.h"
#include "processes/filters/enhancement/glutdiagnostics.h"
#include "processes/filters/framework/parallel.h"

namespace zarn::processes::filters {
namespace {

constexpr const char* kSourceFile = "processes/filters/enhancement/powerglutmatrix";
constexpr std::size_t kStripBytes = std::size_t{32} << 20;  // of the image in memory at a time

[[noreturn]] void Refuse(const std::string& message, const char* parameter, int line) {
  constexpr int kInvalid = 0;
  throw ParameterException(message, parameter, kInvalid, kSourceFile, "LoadFromImage", line);
}

template <typename T>
constexpr gobs::NativeDataTypeCode CodeOf() {
  return sizeof(T) == 1 ? gobs::NativeDataTypeCode::kUInt8 : gobs::NativeDataTypeCode::kUInt16;
}

}  // namespace

// Part of a row of tiles, in memory: from cell (row, column) on.
template <typename T>
struct PowerGLUTMatrix<T>::Strip {
  int row;
  int column;
  int cells;
  std::size_t width;
  std::size_t height;
  const T* samples;
  const std::uint8_t* valid;
};

template <typename T>
PowerGLUTMatrix<T>::PowerGLUTMatrix(const GLUTParameters& parameters)
    : parameters_(parameters),
      trim_(CreateTrimMethod(static_cast<TrimMethod>(parameters.trimMethod))),
      powers_(PowerTable<T>(parameters.power)),
      grid_(parameters.gridRows, parameters.gridColumns, parameters.channelCount) {
  constexpr double kDefaultTrim = 0.02;
  if (parameters_.leftTrim == -1.0) parameters_.leftTrim = parameters_.rightTrim = kDefaultTrim;
}

template <typename T>
ogc::cs::GeocodingInfo PowerGLUTMatrix<T>::GridGeocoding(
    const ogc::cs::GeocodingInfo& image) const {
  ogc::cs::GeocodingInfo grid = image;
  grid.xPerColumn *= parameters_.tileWidth;
  grid.xPerRow *= parameters_.tileWidth;
  grid.yPerColumn *= parameters_.tileHeight;
  grid.yPerRow *= parameters_.tileHeight;
  return grid;
}

template <typename T>
void PowerGLUTMatrix<T>::FillLUT(void* lut, int row, int column, int channel) const {
  if (!grid_.Contains(row, column, channel)) return;
  const std::size_t cell = grid_.Cell(row, column);
  const PowerCurve curve =
      MakePowerCurve<T>(grid_.Gain(cell, channel), grid_.Offset(cell, channel), parameters_.power);
  auto* const entries = static_cast<T*>(lut);
  for (int level = 0; level <= kTopLevel<T>; ++level) {
    entries[level] = CurveValue<T>(curve, powers_.data(), level);
  }
}

template <typename T>
void PowerGLUTMatrix<T>::SetCell(int row, int column, int channel, float gain, float offset) {
  if (!grid_.Contains(row, column, channel)) return;
  grid_.Set(grid_.Cell(row, column), channel, gain, offset);
}

template <typename T>
void PowerGLUTMatrix<T>::GetCell(int row, int column, int channel, float& gain,
                                 float& offset) const {
  if (!grid_.Contains(row, column, channel)) return;
  gain = grid_.Gain(grid_.Cell(row, column), channel);
  offset = grid_.Offset(grid_.Cell(row, column), channel);
}

template <typename T>
void PowerGLUTMatrix<T>::WriteDiagnosticRaster(datasources::BasicWriter& classes,
                                               datasources::BasicWriter* coefficients,
                                               const ogc::cs::GeocodingInfo& image) const {
  const datasources::AuxiliaryData auxiliary = DescribeGrid(parameters_, GridGeocoding(image));
  WriteClasses(grid_, auxiliary, classes);
  if (coefficients != nullptr) WriteCoefficients(grid_, auxiliary, *coefficients);
}

template <typename T>
void PowerGLUTMatrix<T>::RequireLoadable(const datasources::IRasterReader& image) const {
  if (!trim_) Refuse("Unknown trim method", "trimMethod", __LINE__);
  if (parameters_.tileWidth < 1 || parameters_.tileHeight < 1) {
    Refuse("Tiles have no pixels", "tileWidth", __LINE__);
  }
  if (image.DataTypeCode() != CodeOf<T>() ||
      image.Channels() != static_cast<std::uint32_t>(grid_.Channels())) {
    Refuse("The image has another sample type or number of channels", "image", __LINE__);
  }
}

template <typename T>
void PowerGLUTMatrix<T>::LoadFromImage(datasources::IRasterReader& image) {
  RequireLoadable(image);
  const auto tileWidth = static_cast<std::int64_t>(parameters_.tileWidth);
  const auto tileHeight = static_cast<std::int64_t>(parameters_.tileHeight);
  // Pixels of the image below and to the right of the first tile's corner.
  const std::int64_t width = std::int64_t{image.Width()} - offsetColumn_;
  const std::int64_t height = std::int64_t{image.Height()} - offsetRow_;
  const std::size_t tileBytes = static_cast<std::size_t>(tileWidth) *
                                static_cast<std::size_t>(tileHeight) *
                                std::max<std::size_t>(image.Channels(), 1) * sizeof(T);
  const auto stripCells = static_cast<int>(std::clamp<std::size_t>(
      kStripBytes / tileBytes, 1, static_cast<std::size_t>(std::max(grid_.Columns(), 1))));
  std::vector<std::uint64_t> histograms(static_cast<std::size_t>(parallel::BandCount(stripCells)) *
                                        CellEstimator<T>::Levels());
  std::vector<std::uint8_t> valid;
  for (int row = 0; row < grid_.Rows(); ++row) {
    const std::int64_t y = row * tileHeight;
    int column = 0;
    for (; column < grid_.Columns(); column += stripCells) {
      const std::int64_t x = column * tileWidth;
      if (x >= width || y >= height) break;
      const int cells = std::min(stripCells, grid_.Columns() - column);
      const gobs::RasterInfo info(
          static_cast<std::uint32_t>(std::min(cells * tileWidth, width - x)),
          static_cast<std::uint32_t>(std::min(tileHeight, height - y)), image.Channels(),
          CodeOf<T>(),
          {.originX = offsetColumn_ + static_cast<std::uint32_t>(x),
           .originY = offsetRow_ + static_cast<std::uint32_t>(y)});
      gobs::Raster block(info);
      valid.resize(std::size_t{info.Width()} * info.Height());
      image.Read(block, valid.data());
      EstimateStrip({row, column, cells, info.Width(), info.Height(),
                     static_cast<const T*>(block.Data()), valid.data()},
                    histograms);
    }
    EmptyRow(row, column);
    Tell((row + 1.0) / grid_.Rows(), "Loading histograms");
  }
}

// Tiles that lie beyond the image.
template <typename T>
void PowerGLUTMatrix<T>::EmptyRow(int row, int firstColumn) {
  for (int column = firstColumn; column < grid_.Columns(); ++column) {
    if (!IsMasked(row, column)) MarkNoData(row, column);
  }
}

template <typename T>
void PowerGLUTMatrix<T>::EstimateStrip(const Strip& strip, std::vector<std::uint64_t>& histograms) {
  const auto tileWidth = static_cast<std::size_t>(parameters_.tileWidth);
  const auto channels = static_cast<std::size_t>(grid_.Channels());
  const CellEstimator<T> estimator(parameters_, *trim_);
  const std::ptrdiff_t bands = parallel::BandCount(strip.cells);
  parallel::ForEachRowBand(
      strip.cells, bands, [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
        std::uint64_t* const histogram =
            histograms.data() + static_cast<std::size_t>(band) * CellEstimator<T>::Levels();
        for (std::ptrdiff_t i = begin; i < end; ++i) {
          const std::size_t cell = grid_.Cell(strip.row, strip.column + static_cast<int>(i));
          if (grid_.Status(cell) == CellStatus::kMasked) continue;
          const std::size_t x = static_cast<std::size_t>(i) * tileWidth;
          if (x >= strip.width) {
            grid_.SetStatus(cell, CellStatus::kNoData);
            continue;
          }
          const TilePixels<T> tile{strip.samples + x * channels, strip.valid + x,
                                   std::min(tileWidth, strip.width - x), strip.height, strip.width};
          grid_.SetStatus(cell, estimator.Estimate(tile, grid_, cell, histogram));
        }
      });
}

template <typename T>
void PowerGLUTMatrix<T>::Clean(const GLUTCleaning& passes) {
  if (passes.localFilter) RunLocalFilter();
  if (passes.globalFilter) RunGlobalFilter();
  if (passes.interpolation) InterpolateCells(passes.fillsMasked);
}

template <typename T>
void PowerGLUTMatrix<T>::RunLocalFilter() {
  constexpr const char* kStep = "Running local filter";
  Tell(0, kStep);
  filters::RunLocalFilter(grid_);
  Tell(1, kStep);
}

template <typename T>
void PowerGLUTMatrix<T>::RunGlobalFilter() {
  constexpr const char* kStep = "Running global filter";
  Tell(0, kStep);
  try {
    filters::RunGlobalFilter(grid_);
  } catch (...) {
    if (nspio::Debugger::moDebugLevel > 0) {
      nspio::Debugger::Debug("An exception occurred", 1, "zarn_filters", kSourceFile, __LINE__);
    }
  }
  Tell(1, kStep);
}

template <typename T>
void PowerGLUTMatrix<T>::InterpolateCells(bool fillsMasked) {
  constexpr const char* kStep = "Running interpolation";
  Tell(0, kStep);
  filters::InterpolateCells(grid_, fillsMasked);
  Tell(1, kStep);
}

template <typename T>
void PowerGLUTMatrix<T>::ValidateMaxGain(const float* maxGains) {
  std::mutex mutex;
  int done = 0;
  std::exception_ptr failure;
  const auto exceeds = [&](std::size_t cell) {
    for (int c = 0; c < grid_.Channels(); ++c) {
      if (grid_.Gain(cell, c) > maxGains[c]) return true;
    }
    return false;
  };
  // The counter must not be called by two threads; a row is long against the wait. What it throws
  // waits until all rows are judged.
  const auto tell = [&] {
    const std::lock_guard lock(mutex);
    ++done;
    if (failure) return;
    try {
      Tell(static_cast<double>(done) / grid_.Rows(), "");
    } catch (...) {
      failure = std::current_exception();
    }
  };
  parallel::ForEachRowBand(grid_.Rows(), parallel::BandCount(grid_.Rows()),
                           [&](std::ptrdiff_t, std::ptrdiff_t begin, std::ptrdiff_t end) {
                             for (auto row = static_cast<int>(begin); row < end; ++row) {
                               for (int column = 0; column < grid_.Columns(); ++column) {
                                 const std::size_t cell = grid_.Cell(row, column);
                                 if (grid_.IsValid(cell) && exceeds(cell)) {
                                   grid_.SetStatus(cell, CellStatus::kInvalid);
                                 }
                               }
                               tell();
                             }
                           });
  if (failure) std::rethrow_exception(failure);
}

template <typename T>
bool PowerGLUTMatrix<T>::IsMasked(int row, int column) const {
  return grid_.Contains(row, column) &&
         grid_.Status(grid_.Cell(row, column)) == CellStatus::kMasked;
}

template <typename T>
bool PowerGLUTMatrix<T>::IsValid(int row, int column) const {
  return grid_.Contains(row, column) && grid_.IsValid(grid_.Cell(row, column));
}

template <typename T>
void PowerGLUTMatrix<T>::SetOffset(unsigned int column, unsigned int row) {
  offsetColumn_ = column;
  offsetRow_ = row;
}

template <typename T>
void PowerGLUTMatrix<T>::GetOffset(unsigned int& column, unsigned int& row) const {
  column = offsetColumn_;
  row = offsetRow_;
}

template <typename T>
void PowerGLUTMatrix<T>::Mark(int row, int column, CellStatus status) {
  if (grid_.Contains(row, column)) grid_.SetStatus(grid_.Cell(row, column), status);
}

template <typename T>
void PowerGLUTMatrix<T>::Tell(double fraction, const char* step) const {
  if (counter_ != nullptr) counter_->Update(fraction, step);
}

template class PowerGLUTMatrix<unsigned char>;
template class PowerGLUTMatrix<unsigned short>;

}  // namespace zarn::processes::filters
