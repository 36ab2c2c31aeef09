// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/cellsamples.h"

#include <algorithm>
#include <cmath>

#include "apps/zarn/estimate/robust.h"

namespace zarn::app {
namespace {

constexpr std::int64_t kMostCellsAcross = 96;
constexpr std::int64_t kLeastSide = 8;
constexpr double kSamplesAcross = 16;

std::int64_t DivideUp(std::int64_t a, std::int64_t b) { return (a + b - 1) / b; }

}  // namespace

CellSamples::CellSamples(const Ground& frame, const WindowSize& frameSize, const Ground& own,
                         std::size_t channels)
    : frame_(frame),
      own_(own),
      channels_(channels),
      side_(std::max(kLeastSide,
                     DivideUp(std::max(frameSize.width, frameSize.height), kMostCellsAcross))),
      columns_(DivideUp(frameSize.width, side_)),
      rows_(DivideUp(frameSize.height, side_)),
      cells_(static_cast<std::size_t>(columns_ * rows_)) {
  const double ownPixels =
      static_cast<double>(side_) * std::sqrt(frame.PixelArea() / own.PixelArea());
  stride_ = std::max<std::int64_t>(1, std::llround(ownPixels / kSamplesAcross));
  const double across = std::max(1.0, ownPixels / static_cast<double>(stride_));
  whole_ = static_cast<std::size_t>(across * across);
}

void CellSamples::Add(const PixelRun& run) {
  if (run.y % stride_ != 0) return;
  const std::int64_t past = run.x % stride_;
  for (std::int64_t i = past == 0 ? 0 : stride_ - past; i < static_cast<std::int64_t>(run.count);
       i += stride_) {
    if (run.valid[i] == 0) continue;
    const double ownColumn = static_cast<double>(run.x + i) + 0.5;
    const double ownRow = static_cast<double>(run.y) + 0.5;
    const double x = own_.X(ownColumn, ownRow);
    const double y = own_.Y(ownColumn, ownRow);
    const double column = frame_.Column(x, y) - 0.5;
    const double row = frame_.Row(x, y) - 0.5;
    const auto cellColumn =
        static_cast<std::int64_t>(std::floor((column + 0.5) / static_cast<double>(side_)));
    const auto cellRow =
        static_cast<std::int64_t>(std::floor((row + 0.5) / static_cast<double>(side_)));
    if (cellColumn < 0 || cellColumn >= columns_ || cellRow < 0 || cellRow >= rows_) continue;
    Cell& cell = cells_[static_cast<std::size_t>(cellRow * columns_ + cellColumn)];
    cell.columns += column;
    cell.rows += row;
    const double* const pixel = run.samples + static_cast<std::size_t>(i) * channels_;
    for (std::size_t c = 0; c < channels_; ++c) {
      cell.samples.push_back(static_cast<float>(pixel[c]));
    }
  }
}

std::vector<CellSummary> CellSamples::Summaries() const {
  std::vector<CellSummary> summaries;
  for (std::size_t i = 0; i < cells_.size(); ++i) {
    const Cell& cell = cells_[i];
    const std::size_t count = cell.samples.size() / channels_;
    if (count == 0 || 2 * count < whole_) continue;
    CellSummary summary{i,
                        cell.columns / static_cast<double>(count),
                        cell.rows / static_cast<double>(count),
                        {},
                        {}};
    for (std::size_t c = 0; c < channels_; ++c) {
      std::vector<double> values;
      for (std::size_t k = c; k < cell.samples.size(); k += channels_) {
        values.push_back(static_cast<double>(cell.samples[k]));
      }
      summary.medians.push_back(Median(values));
      summary.deviations.push_back(RobustDeviation(std::move(values)));
    }
    summaries.push_back(std::move(summary));
  }
  return summaries;
}

}  // namespace zarn::app
