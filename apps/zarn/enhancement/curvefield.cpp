// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/enhancement/curvefield.h"

#include <algorithm>
#include <numeric>

#include "host/sys/parallel.h"
#include "host/sys/vectorised.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;
namespace parallel = sys::parallel;
using filters::PowerCurve;

constexpr std::size_t kByteLevels = 256;

inline float Between(float first, float second, float weight) {
  return first + (second - first) * weight;
}

// `filters::CurveValue`, as a number and without branches.
inline float Value(const PowerCurve& curve, float top, std::int32_t level, float power) {
  const float least = level >= curve.high ? top : 0.0F;
  float value = curve.gain * power;
  value = value > least ? value : least;  // not so for NaN
  value = value < top ? value : top;
  return static_cast<float>(static_cast<std::int32_t>(value));
}

// Levels as numbers and their entries in four tables. Apart from the arithmetic, because the
// compiler does not vectorise what has look-ups in it.
template <typename T>
void LookUpPowers(const std::array<const float*, 4>& tables, const T* samples, std::size_t channels,
                  std::size_t count, std::int32_t* levels, float* powers, std::size_t pitch) {
  const auto [first, second, third, fourth] = tables;
  for (std::size_t i = 0; i < count; ++i) {
    const T level = samples[i * channels];
    levels[i] = level;
    powers[i] = first[level];
    powers[pitch + i] = second[level];
    powers[2 * pitch + i] = third[level];
    powers[3 * pitch + i] = fourth[level];
  }
}

// The entries of two tables for each sample.
template <typename T>
void LookUpPairs(const float* left, const float* right, const T* samples, std::size_t channels,
                 std::size_t count, float* leftEntries, float* rightEntries) {
  for (std::size_t i = 0; i < count; ++i) {
    const T level = samples[i * channels];
    leftEntries[i] = left[level];
    rightEntries[i] = right[level];
  }
}

template <typename T>
void PutLevels(const std::int32_t* levels, const std::uint8_t* valid, std::size_t channels,
               std::size_t count, T* samples) {
  if (valid == nullptr && channels == 1) {  // the compiler vectorises this one
    for (std::size_t i = 0; i < count; ++i) samples[i] = static_cast<T>(levels[i]);
    return;
  }
  if (valid == nullptr) {
    for (std::size_t i = 0; i < count; ++i) samples[i * channels] = static_cast<T>(levels[i]);
    return;
  }
  for (std::size_t i = 0; i < count; ++i) {
    T& sample = samples[i * channels];
    sample = valid[i] != 0 ? static_cast<T>(levels[i]) : sample;
  }
}

ZARN_VECTORISED void CurveValues(const PowerCurve& curve, float top, const std::int32_t* levels,
                                 const float* powers, std::size_t count, float* values) {
  const PowerCurve own = curve;
  for (std::size_t i = 0; i < count; ++i) values[i] = Value(own, top, levels[i], powers[i]);
}

// What lies between two rows of values, at `weight` of the way.
ZARN_VECTORISED void BlendRows(const float* above, const float* below, float weight,
                               std::size_t count, float* blended) {
  for (std::size_t i = 0; i < count; ++i) blended[i] = Between(above[i], below[i], weight);
}

ZARN_VECTORISED void BlendColumns(const float* left, const float* right, const float* weights,
                                  std::size_t count, std::int32_t* results) {
  for (std::size_t i = 0; i < count; ++i) {
    results[i] = static_cast<std::int32_t>(Between(left[i], right[i], weights[i]) + 0.5F);
  }
}

// All of it at once.
ZARN_VECTORISED void BlendCurves(const std::array<PowerCurve, 4>& curves, float top,
                                 const std::int32_t* levels, const float* powers, std::size_t pitch,
                                 float rowWeight, const float* weights, std::size_t count,
                                 std::int32_t* results) {
  const std::array<PowerCurve, 4> own = curves;
  for (std::size_t i = 0; i < count; ++i) {
    const float left = Between(Value(own[0], top, levels[i], powers[i]),
                               Value(own[1], top, levels[i], powers[pitch + i]), rowWeight);
    const float right = Between(Value(own[2], top, levels[i], powers[2 * pitch + i]),
                                Value(own[3], top, levels[i], powers[3 * pitch + i]), rowWeight);
    results[i] = static_cast<std::int32_t>(Between(left, right, weights[i]) + 0.5F);
  }
}

template <typename T>
void MoveOffNoData(const T* noData, std::size_t channels, T* pixel) {
  if (!std::equal(noData, noData + channels, pixel)) return;
  pixel[0] = static_cast<T>(pixel[0] == filters::kTopLevel<T> ? pixel[0] - 1 : pixel[0] + 1);
}

}  // namespace

template <typename T>
struct CurveField<T>::Block {
  const T* samples;
  const std::uint8_t* valid;
  const T* noData;
  T* results;
  std::size_t width;
};

/// Rows or columns between the same two cells.
template <typename T>
struct CurveField<T>::Run {
  std::size_t begin;
  std::size_t end;
  std::uint32_t first;
  std::uint32_t second;
};

template <typename T>
struct CurveField<T>::Axis {
  std::vector<Run> runs;
  std::vector<float> weights;  ///< of the second cell, for each row or column
};

// Rows of numbers, each for a row of a tile or for all levels of a byte.
template <typename T>
struct CurveField<T>::Scratch {
  explicit Scratch(std::size_t width)
      : pitch(std::max(width, kByteLevels)), levels(pitch), results(pitch), floats(8 * pitch) {}
  float* Corner(std::size_t corner) { return floats.data() + corner * pitch; }
  float* Left() { return Corner(4); }
  float* Right() { return Corner(5); }
  float* LeftOfPixels() { return Corner(6); }
  float* RightOfPixels() { return Corner(7); }

  std::size_t pitch;
  std::vector<std::int32_t> levels;
  std::vector<std::int32_t> results;
  std::vector<float> floats;
};

template <typename T>
CurveField<T>::CurveField(const filters::IGeoLUTMatrix& matrix, CellBlending blending)
    : tileWidth_(static_cast<std::uint32_t>(matrix.GetTileWidth())),
      tileHeight_(static_cast<std::uint32_t>(matrix.GetTileHeight())),
      rows_(static_cast<std::uint32_t>(matrix.GetGridRows())),
      columns_(static_cast<std::uint32_t>(matrix.GetGridColumns())),
      channels_(static_cast<std::size_t>(matrix.GetChannelCount())),
      blending_(blending),
      powers_(kLevels) {
  const std::vector<float> powers = filters::PowerTable<T>(matrix.GetPower());
  powers_.insert(powers_.end(), powers.begin(), powers.end());
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
typename CurveField<T>::Axis CurveField<T>::PlaceAlong(std::uint64_t origin, std::size_t count,
                                                       std::uint32_t tile,
                                                       std::uint32_t cells) const {
  Axis axis;
  const auto add = [&](std::uint64_t first, std::uint64_t second, float weight) {
    const auto a = static_cast<std::uint32_t>(std::min<std::uint64_t>(first, cells - 1));
    const auto b = static_cast<std::uint32_t>(std::min<std::uint64_t>(second, cells - 1));
    const bool goesOn =
        !axis.runs.empty() && axis.runs.back().first == a && axis.runs.back().second == b;
    if (!goesOn) axis.runs.push_back({axis.weights.size(), 0, a, b});
    axis.weights.push_back(a == b ? 0.0F : weight);
    axis.runs.back().end = axis.weights.size();
  };
  for (std::uint64_t position = origin; position < origin + count; ++position) {
    // In half pixels, from the centre of the first cell to that of the pixel.
    const std::uint64_t step = 2 * std::uint64_t{tile};
    const std::uint64_t halves = 2 * position + 1;
    if (blending_ == CellBlending::kNone) {
      add(position / tile, position / tile, 0);
    } else if (halves <= tile) {
      add(0, 0, 0);
    } else {
      const std::uint64_t first = (halves - tile) / step;
      add(first, first + 1, static_cast<float>((halves - tile) % step) / static_cast<float>(step));
    }
  }
  return axis;
}

template <typename T>
std::array<PowerCurve, 4> CurveField<T>::Corners(const Run& rows, const Run& columns,
                                                 std::size_t channel) const {
  const auto curve = [&](std::size_t r, std::size_t c) {
    return curves_[(r * columns_ + c) * channels_ + channel];
  };
  return {curve(rows.first, columns.first), curve(rows.second, columns.first),
          curve(rows.first, columns.second), curve(rows.second, columns.second)};
}

template <typename T>
std::array<const float*, 4> CurveField<T>::Tables(const std::array<Curve, 4>& curves) const {
  std::array<const float*, 4> tables{};
  for (std::size_t k = 0; k < curves.size(); ++k) {
    tables[k] = powers_.data() + kLevels - static_cast<std::size_t>(curves[k].low);
  }
  return tables;
}

// Each level once for the whole tile.
template <typename T>
void CurveField<T>::EnhanceTile(const Block& block, const Axis& rows, const Axis& columns,
                                const Run& rowRun, const Run& columnRun, std::size_t channel,
                                Scratch& scratch) const {
  static constexpr auto kAllLevels = [] {
    std::array<T, kByteLevels> levels{};
    std::iota(levels.begin(), levels.end(), T{0});
    return levels;
  }();
  const std::array<Curve, 4> curves = Corners(rowRun, columnRun, channel);
  // Outside these levels all four agree.
  const auto from = static_cast<std::size_t>(
      std::min({curves[0].low, curves[1].low, curves[2].low, curves[3].low}));
  const auto to = static_cast<std::size_t>(
      std::max({curves[0].high, curves[1].high, curves[2].high, curves[3].high}));
  LookUpPowers(Tables(curves), kAllLevels.data() + from, 1, to - from, scratch.levels.data(),
               scratch.Corner(0), scratch.pitch);
  for (std::size_t k = 0; k < curves.size(); ++k) {
    CurveValues(curves[k], kTop, scratch.levels.data(), scratch.Corner(k), to - from,
                scratch.Corner(k));
  }
  for (float* const row : {scratch.Left(), scratch.Right()}) {
    std::fill(row, row + from, 0.0F);
    std::fill(row + to, row + kByteLevels, kTop);
  }
  const std::size_t width = columnRun.end - columnRun.begin;
  for (std::size_t y = rowRun.begin; y < rowRun.end; ++y) {
    const std::size_t first = y * block.width + columnRun.begin;
    BlendRows(scratch.Corner(0), scratch.Corner(1), rows.weights[y], to - from,
              scratch.Left() + from);
    BlendRows(scratch.Corner(2), scratch.Corner(3), rows.weights[y], to - from,
              scratch.Right() + from);
    LookUpPairs(scratch.Left(), scratch.Right(), block.samples + first * channels_ + channel,
                channels_, width, scratch.LeftOfPixels(), scratch.RightOfPixels());
    BlendColumns(scratch.LeftOfPixels(), scratch.RightOfPixels(),
                 columns.weights.data() + columnRun.begin, width, scratch.results.data());
    PutLevels(scratch.results.data(), block.valid == nullptr ? nullptr : block.valid + first,
              channels_, width, block.results + first * channels_ + channel);
  }
}

// Each pixel by itself.
template <typename T>
void CurveField<T>::EnhanceRow(const Block& block, std::size_t y, const Run& rowRun,
                               float rowWeight, const Axis& columns, Scratch& scratch) const {
  std::int32_t* const levels = scratch.levels.data();
  std::int32_t* const results = scratch.results.data();
  for (const Run& run : columns.runs) {
    const std::size_t width = run.end - run.begin;
    const std::size_t first = y * block.width + run.begin;
    const std::uint8_t* const valid = block.valid == nullptr ? nullptr : block.valid + first;
    for (std::size_t c = 0; c < channels_; ++c) {
      const std::array<Curve, 4> curves = Corners(rowRun, run, c);
      LookUpPowers(Tables(curves), block.samples + first * channels_ + c, channels_, width, levels,
                   scratch.Corner(0), scratch.pitch);
      BlendCurves(curves, kTop, levels, scratch.Corner(0), scratch.pitch, rowWeight,
                  columns.weights.data() + run.begin, width, results);
      PutLevels(results, valid, channels_, width, block.results + first * channels_ + c);
    }
  }
}

template <typename T>
void CurveField<T>::EnhanceRows(const Block& block, const Axis& rows, const Axis& columns,
                                std::size_t begin, std::size_t end, Scratch& scratch) const {
  const bool tabulates = sizeof(T) == 1 && std::size_t{tileWidth_} * tileHeight_ >= kByteLevels;
  for (const Run& run : rows.runs) {
    Run part = run;
    part.begin = std::max(part.begin, begin);
    part.end = std::min(part.end, end);
    if (part.begin >= part.end) continue;
    if (!tabulates) {
      for (std::size_t y = part.begin; y < part.end; ++y) {
        EnhanceRow(block, y, part, rows.weights[y], columns, scratch);
      }
      continue;
    }
    for (const Run& columnRun : columns.runs) {
      for (std::size_t c = 0; c < channels_; ++c) {
        EnhanceTile(block, rows, columns, part, columnRun, c, scratch);
      }
    }
  }
  if (block.noData == nullptr) return;
  for (std::size_t i = begin * block.width; i < end * block.width; ++i) {
    if (block.valid != nullptr && block.valid[i] == 0) continue;
    MoveOffNoData(block.noData, channels_, block.results + i * channels_);
  }
}

template <typename T>
void CurveField<T>::Apply(const gobs::Raster& input, const std::uint8_t* valid, const T* noData,
                          gobs::Raster& output) const {
  const Axis columns = PlaceAlong(input.OriginX(), input.Width(), tileWidth_, columns_);
  const Axis rows = PlaceAlong(input.OriginY(), input.Height(), tileHeight_, rows_);
  const Block block{static_cast<const T*>(input.Data()), valid, noData,
                    static_cast<T*>(output.Data()), input.Width()};
  const auto count = static_cast<std::ptrdiff_t>(input.Height());
  const std::ptrdiff_t bands = parallel::BandCount(count);
  std::vector<Scratch> scratch(static_cast<std::size_t>(bands), Scratch(input.Width()));
  parallel::ForEachRowBand(
      count, bands, [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
        EnhanceRows(block, rows, columns, static_cast<std::size_t>(begin),
                    static_cast<std::size_t>(end), scratch[static_cast<std::size_t>(band)]);
      });
}

template class CurveField<std::uint8_t>;
template class CurveField<std::uint16_t>;

}  // namespace zarn::app
