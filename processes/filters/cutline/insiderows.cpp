// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/cutline/insiderows.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include "host/sys/vectorised.h"

namespace zarn::processes::filters {
namespace {

// Rows of numbers, one for each edge.
enum Number { kX0, kY0, kDx, kDy, kMaxX, kMaxY, kFirstRow, kEndRow, kColumn, kNumbers };

// The column of each edge, NaN where only the exact test can tell, 0 (of no effect) where the edge
// does not span the row. `pitch` apart lie the rows of `numbers`.
ZARN_VECTORISED void EstimateColumns(double* numbers, std::size_t pitch, std::size_t count,
                                     double row, double left, double width) {
  const double* const x0 = numbers + kX0 * pitch;
  const double* const y0 = numbers + kY0 * pitch;
  const double* const dx = numbers + kDx * pitch;
  const double* const dy = numbers + kDy * pitch;
  const double* const maxX = numbers + kMaxX * pitch;
  const double* const maxY = numbers + kMaxY * pitch;
  const double* const firstRow = numbers + kFirstRow * pitch;
  const double* const endRow = numbers + kEndRow * pitch;
  double* const columns = numbers + kColumn * pitch;
  const double y = row + 0.5;
  // Well between two centres no tolerance matters, nor does rounding for such coordinates.
  constexpr double kNear = 1e-3;
  constexpr double kFar = 0x1p36;
  for (std::size_t i = 0; i < count; ++i) {
    const double crossing = dx[i] * (y - y0[i]) / dy[i] + x0[i];
    const double at = crossing + 0.5 - left;
    const double column = std::floor(at);
    const double part = at - column;
    const bool sure = (part > kNear) & (part < 1 - kNear) & (crossing <= maxX[i]) & (y <= maxY[i]) &
                      (std::abs(crossing) < kFar);
    const bool spans = (row >= firstRow[i]) & (row < endRow[i]);
    const double held = std::min(std::max(column, 0.0), width);
    const double known = sure ? held : std::numeric_limits<double>::quiet_NaN();
    columns[i] = spans ? known : 0.0;
  }
}

}  // namespace

InsideRows::InsideRows(const PolygonRowIndex& index, std::int64_t left, std::size_t width,
                       const PolygonRowIndex::Crowd& most)
    : index_(index),
      left_(static_cast<double>(left)),
      width_(width),
      edges_(most.places),
      numbers_(kNumbers * most.places) {}

void InsideRows::Prepare(std::int64_t first, std::int64_t last) {
  count_ = 0;
  const std::size_t pitch = edges_.size();
  const std::vector<PolygonEdge>& all = index_.Edges();
  index_.ForEachGroup(first, last, [&](const PolygonRowIndex::Group& group) {
    for (std::uint32_t i = group.begin; i < group.end; ++i) {
      const PolygonEdge& edge = all[i];
      if (edge.endRow <= edge.firstRow || edge.firstRow > last || edge.endRow <= first) continue;
      const double numbers[kColumn] = {edge.x0,
                                       edge.y0,
                                       edge.x1 - edge.x0,
                                       edge.y1 - edge.y0,
                                       std::max(edge.x0, edge.x1),
                                       std::max(edge.y0, edge.y1),
                                       static_cast<double>(edge.firstRow),
                                       static_cast<double>(edge.endRow)};
      for (std::size_t k = 0; k < kColumn; ++k) numbers_[k * pitch + count_] = numbers[k];
      edges_[count_++] = &edge;
    }
  });
}

// The number of columns, from the left, whose centres count the edge: those that do lie left of
// those that do not.
std::size_t InsideRows::ColumnOf(const PolygonEdge& edge, double y) const {
  const auto counts = [&](std::size_t column) {
    return CrossesRay(edge, left_ + static_cast<double>(column) + 0.5, y);
  };
  std::size_t low = 0;
  std::size_t high = width_;
  const double crossing = (edge.x1 - edge.x0) * (y - edge.y0) / (edge.y1 - edge.y0) + edge.x0;
  const double guess = crossing - left_;
  if (guess > 2 && guess < static_cast<double>(width_) - 2) {
    const auto at = static_cast<std::size_t>(guess);
    if (counts(at - 2)) low = at - 1;
    if (!counts(at + 2)) high = at + 2;
  }
  while (low < high) {
    const std::size_t middle = low + (high - low) / 2;
    if (counts(middle)) {
      low = middle + 1;
    } else {
      high = middle;
    }
  }
  return low;
}

void InsideRows::Compute(std::int64_t row, PixelBits& inside) {
  std::fill(inside.begin(), inside.end(), 0);
  if (count_ == 0) return;
  const std::size_t pitch = edges_.size();
  const auto rowNumber = static_cast<double>(row);
  EstimateColumns(numbers_.data(), pitch, count_, rowNumber, left_, static_cast<double>(width_));
  const double* const columns = numbers_.data() + kColumn * pitch;
  std::uint64_t state = 0;
  for (std::size_t i = 0; i < count_; ++i) {
    const bool known = columns[i] >= 0;
    const std::size_t column =
        known ? static_cast<std::size_t>(columns[i]) : ColumnOf(*edges_[i], rowNumber + 0.5);
    if (column > 0) state ^= 1;
    if (column < width_) inside[column / kWordColumns] ^= std::uint64_t{column > 0} << column % 64;
  }
  // Each column's bit becomes the parity of the toggles up to it, beside those of all columns.
  for (std::uint64_t& word : inside) {
    for (int shift = 1; shift < 64; shift *= 2) word ^= word << shift;
    word ^= 0 - state;
    state = word >> 63;
  }
  if (width_ % kWordColumns != 0) {
    inside.back() &= (std::uint64_t{1} << width_ % kWordColumns) - 1;
  }
}

}  // namespace zarn::processes::filters
