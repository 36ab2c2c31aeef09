// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/enhancement/curvefield.h"

#include <algorithm>

#include "host/sys/parallel.h"
#include "host/sys/vectorised.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;
namespace parallel = sys::parallel;
using filters::PowerCurve;

/// A run of samples of one channel between the same four cells.
struct BlendRun {
  std::size_t count;
  const std::int32_t* levels;
  const float* weights;              ///< of the cells on the right, one for each sample
  float rowWeight;                   ///< of the cells below
  std::array<PowerCurve, 4> curves;  ///< above left and right, below left and right
  const float* powers;
  float top;
  std::int32_t* results;
};

// `filters::CurveValue`, as a number.
inline float Value(const PowerCurve& curve, const float* powers, float top, std::int32_t level) {
  const std::int32_t above = std::max(level - curve.low, 0);
  float value = curve.gain * powers[above];
  value = value > top ? top : value;
  value = value > 0.0F ? value : 0.0F;  // not so for NaN
  value = static_cast<float>(static_cast<std::int32_t>(value));
  value = level < curve.low ? 0.0F : value;
  return level >= curve.high ? top : value;
}

ZARN_VECTORISED void Blend(const BlendRun& run) {
  const PowerCurve c0 = run.curves[0];
  const PowerCurve c1 = run.curves[1];
  const PowerCurve c2 = run.curves[2];
  const PowerCurve c3 = run.curves[3];
  const float* const powers = run.powers;
  const float* const weights = run.weights;
  const std::int32_t* const levels = run.levels;
  std::int32_t* const results = run.results;
  const float rowWeight = run.rowWeight;
  const float top = run.top;
#pragma GCC ivdep
  for (std::size_t i = 0; i < run.count; ++i) {
    const std::int32_t level = levels[i];
    const float a = Value(c0, powers, top, level);
    const float b = Value(c1, powers, top, level);
    const float c = Value(c2, powers, top, level);
    const float d = Value(c3, powers, top, level);
    const float above = a + (b - a) * weights[i];
    const float below = c + (d - c) * weights[i];
    results[i] = static_cast<std::int32_t>(above + (below - above) * rowWeight + 0.5F);
  }
}

// Where two cells are one, so are the curves.
ZARN_VECTORISED void Follow(const BlendRun& run) {
  const PowerCurve curve = run.curves[0];
  const float* const powers = run.powers;
  const std::int32_t* const levels = run.levels;
  std::int32_t* const results = run.results;
  const float top = run.top;
#pragma GCC ivdep
  for (std::size_t i = 0; i < run.count; ++i) {
    results[i] = static_cast<std::int32_t>(Value(curve, powers, top, levels[i]));
  }
}

template <typename T>
void MoveOffNoData(const T* noData, std::size_t channels, T* pixel) {
  if (!std::equal(noData, noData + channels, pixel)) return;
  pixel[0] = static_cast<T>(pixel[0] == filters::kTopLevel<T> ? pixel[0] - 1 : pixel[0] + 1);
}

}  // namespace

// The places of all columns of a block, and where runs between the same cells end.
template <typename T>
struct CurveField<T>::Columns {
  std::vector<Place> places;
  std::vector<float> weights;
  std::vector<std::size_t> ends;
};

template <typename T>
struct CurveField<T>::Scratch {
  explicit Scratch(std::size_t count) : levels(count), results(count) {}
  std::vector<std::int32_t> levels;
  std::vector<std::int32_t> results;
};

template <typename T>
CurveField<T>::CurveField(const filters::IGeoLUTMatrix& matrix, CellBlending blending)
    : tileWidth_(static_cast<std::uint32_t>(matrix.GetTileWidth())),
      tileHeight_(static_cast<std::uint32_t>(matrix.GetTileHeight())),
      rows_(static_cast<std::uint32_t>(matrix.GetGridRows())),
      columns_(static_cast<std::uint32_t>(matrix.GetGridColumns())),
      channels_(static_cast<std::size_t>(matrix.GetChannelCount())),
      blending_(blending),
      powers_(filters::PowerTable<T>(matrix.GetPower())) {
  curves_.reserve(std::size_t{rows_} * columns_ * channels_);
  for (int row = 0; row < matrix.GetGridRows(); ++row) {
    for (int column = 0; column < matrix.GetGridColumns(); ++column) {
      for (int c = 0; c < matrix.GetChannelCount(); ++c) {
        float gain = 0;
        float offset = 0;
        matrix.GetCell(row, column, c, gain, offset);
        curves_.push_back(filters::MakePowerCurve<T>(gain, offset, matrix.GetPower()));
      }
    }
  }
}

template <typename T>
typename CurveField<T>::Place CurveField<T>::PlaceOf(std::uint64_t position, std::uint32_t tile,
                                                     std::uint32_t cells) const {
  if (blending_ == CellBlending::kNone) {
    const auto cell =
        static_cast<std::uint32_t>(std::min<std::uint64_t>(position / tile, cells - 1));
    return {cell, cell, 0.0F};
  }
  // In half pixels from the centre of the first cell to that of the pixel.
  const std::uint64_t twice = 2 * position + 1;
  if (twice <= tile) return {0, 0, 0.0F};
  const std::uint64_t halves = twice - tile;
  const auto first = static_cast<std::uint32_t>(halves / (2 * std::uint64_t{tile}));
  if (first + 1 >= cells) return {cells - 1, cells - 1, 0.0F};
  const std::uint64_t rest = halves % (2 * std::uint64_t{tile});
  return {first, first + 1, static_cast<float>(rest) / (2.0F * static_cast<float>(tile))};
}

template <typename T>
typename CurveField<T>::Columns CurveField<T>::PlaceColumns(const gobs::Raster& block) const {
  Columns columns;
  for (std::size_t x = 0; x < block.Width(); ++x) {
    const Place place = PlaceOf(std::uint64_t{block.OriginX()} + x, tileWidth_, columns_);
    const bool isNew = x > 0 && (place.first != columns.places.back().first ||
                                 place.second != columns.places.back().second);
    if (isNew) columns.ends.push_back(x);
    columns.places.push_back(place);
    columns.weights.push_back(place.weight);
  }
  columns.ends.push_back(block.Width());
  return columns;
}

template <typename T>
std::array<PowerCurve, 4> CurveField<T>::Corners(const Place& row, const Place& column,
                                                 std::size_t channel) const {
  const auto curve = [&](std::size_t r, std::size_t c) {
    return curves_[(r * columns_ + c) * channels_ + channel];
  };
  return {curve(row.first, column.first), curve(row.first, column.second),
          curve(row.second, column.first), curve(row.second, column.second)};
}

template <typename T>
void CurveField<T>::EnhanceRow(const T* samples, const std::uint8_t* valid, const T* noData,
                               const Place& row, const Columns& columns, Scratch& scratch,
                               T* results) const {
  std::size_t begin = 0;
  for (const std::size_t end : columns.ends) {
    const Place& column = columns.places[begin];
    const std::size_t count = end - begin;
    const bool isOneCell = row.first == row.second && column.first == column.second;
    for (std::size_t c = 0; c < channels_; ++c) {
      const T* const from = samples + begin * channels_ + c;
      for (std::size_t i = 0; i < count; ++i) scratch.levels[i] = from[i * channels_];
      const BlendRun run{count,
                         scratch.levels.data(),
                         columns.weights.data() + begin,
                         row.weight,
                         Corners(row, column, c),
                         powers_.data(),
                         static_cast<float>(filters::kTopLevel<T>),
                         scratch.results.data()};
      if (isOneCell) {
        Follow(run);
      } else {
        Blend(run);
      }
      T* const to = results + begin * channels_ + c;
      for (std::size_t i = 0; i < count; ++i) {
        const auto result = static_cast<T>(scratch.results[i]);
        to[i * channels_] = valid == nullptr || valid[begin + i] != 0 ? result : to[i * channels_];
      }
    }
    begin = end;
  }
  if (noData == nullptr) return;
  for (std::size_t x = 0; x < columns.places.size(); ++x) {
    if (valid == nullptr || valid[x] != 0)
      MoveOffNoData(noData, channels_, results + x * channels_);
  }
}

template <typename T>
void CurveField<T>::Apply(const gobs::Raster& input, const std::uint8_t* valid, const T* noData,
                          gobs::Raster& output) const {
  const std::size_t width = input.Width();
  const auto rows = static_cast<std::ptrdiff_t>(input.Height());
  const Columns columns = PlaceColumns(input);
  const std::ptrdiff_t bands = parallel::BandCount(rows);
  std::vector<Scratch> scratch(static_cast<std::size_t>(bands), Scratch(width));
  const auto* const samples = static_cast<const T*>(input.Data());
  auto* const results = static_cast<T*>(output.Data());
  parallel::ForEachRowBand(
      rows, bands, [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
        for (std::ptrdiff_t y = begin; y < end; ++y) {
          const std::size_t first = static_cast<std::size_t>(y) * width;
          const Place row = PlaceOf(std::uint64_t{input.OriginY()} + static_cast<std::uint64_t>(y),
                                    tileHeight_, rows_);
          EnhanceRow(samples + first * channels_, valid == nullptr ? nullptr : valid + first,
                     noData, row, columns, scratch[static_cast<std::size_t>(band)],
                     results + first * channels_);
        }
      });
}

template class CurveField<std::uint8_t>;
template class CurveField<std::uint16_t>;

}  // namespace zarn::app
