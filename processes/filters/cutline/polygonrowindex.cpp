// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/cutline/polygonrowindex.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include "processes/filters/cutline/groupededges.h"

namespace zarn::processes::filters {
namespace {

// Rows beyond any raster, far enough from the ends of the type for sums with blend widths.
constexpr double kFarRow = 0x1p50;

std::int64_t ToRow(double value) {
  return static_cast<std::int64_t>(std::clamp(value, -kFarRow, kFarRow));
}

// The row that an end of an edge reaches: an edge that ends on a centre does not span its row.
std::int64_t ReachedRow(double y) { return ToRow(std::floor(0.5000001192092896 + y)); }

std::int64_t RowOf(double y) { return ToRow(std::trunc(y)); }

}  // namespace

PolygonRowIndex::PolygonRowIndex(const PolygonParam& polygon, std::uint32_t blend) : blend_(blend) {
  if (!polygon.Exists()) return;
  const std::size_t count = polygon.vertexCount;
  const double* const vertices = polygon.vertices;
  const auto isFinite = [](double v) { return std::isfinite(v); };
  if (!std::all_of(vertices, vertices + 2 * count, isFinite)) return;
  double minY = vertices[1];
  double maxY = vertices[1];
  double largest = 0;
  for (std::size_t i = 0; i < count; ++i) {
    minY = std::min(minY, vertices[2 * i + 1]);
    maxY = std::max(maxY, vertices[2 * i + 1]);
    largest = std::max({largest, std::abs(vertices[2 * i]), std::abs(vertices[2 * i + 1])});
  }
  rowMin_ = ToRow(std::floor(minY + 0.5));
  const double rows = std::ceil(maxY - static_cast<double>(rowMin_) + 0.5);
  rowCount_ = static_cast<std::int64_t>(std::clamp(rows, 0.0, 2 * kFarRow));
  distanceTolerance_ = 1e-6 + largest * 1e-13;
  AddEdges(polygon);
  FormGroups();
}

void PolygonRowIndex::AddEdges(const PolygonParam& polygon) {
  const std::int32_t* const parts = polygon.parts;
  const std::int32_t partCount = parts == nullptr ? 0 : std::max(parts[0], 0);
  const auto startsRing = [&](std::size_t vertex) {
    return partCount > 0 &&
           std::binary_search(parts + 1, parts + 1 + partCount, static_cast<std::int64_t>(vertex));
  };
  const std::int64_t blend = blend_;
  const std::int64_t bandMin = BandMin();
  const std::int64_t bandMax = bandMin + BandCount();
  edges_.reserve(polygon.vertexCount - 1);
  for (std::size_t i = 0; i + 1 < polygon.vertexCount; ++i) {
    if (startsRing(i + 1)) continue;
    if (i == 0) hasFirstEdge_ = true;
    const double* const v = polygon.vertices + 2 * i;
    PolygonEdge edge{.x0 = v[0], .y0 = v[1], .x1 = v[2], .y1 = v[3]};
    const std::int64_t low = ReachedRow(std::min(edge.y0, edge.y1));
    const std::int64_t high = ReachedRow(std::max(edge.y0, edge.y1));
    const double height = edge.y0 - edge.y1;
    const bool horizontal = height > -kEdgeTolerance && height < kEdgeTolerance;
    edge.firstRow = horizontal ? 0 : std::max(low, rowMin_);
    edge.endRow = horizontal ? 0 : std::min(high, rowMin_ + rowCount_);
    if (blend_ > 0) {
      edge.firstBand = std::max(std::max(low, bandMin) - blend, bandMin);
      edge.lastBand = std::min(std::min(high, bandMax) + blend, bandMax);
    } else {
      edge.firstBand = edge.firstRow;
      edge.lastBand = edge.endRow - 1;
    }
    if (edge.firstBand <= edge.lastBand) edges_.push_back(edge);
  }
}

void PolygonRowIndex::FormGroups() {
  // Groups that are small beside the band tell well how far their edges are.
  const double mostExtent = std::max(4.0, blend_ / 8.0);
  for (std::uint32_t i = 0; i < edges_.size(); ++i) {
    const PolygonEdge& e = edges_[i];
    const Group own{.begin = i,
                    .end = i + 1,
                    .minX = std::min(e.x0, e.x1),
                    .minY = std::min(e.y0, e.y1),
                    .maxX = std::max(e.x0, e.x1),
                    .maxY = std::max(e.y0, e.y1),
                    .firstRow = e.firstBand,
                    .lastRow = e.lastBand,
                    .firstShared = e.firstBand,
                    .lastShared = e.lastBand};
    if (!groups_.empty()) {
      Group& last = groups_.back();
      const Group joined{.begin = last.begin,
                         .end = own.end,
                         .minX = std::min(last.minX, own.minX),
                         .minY = std::min(last.minY, own.minY),
                         .maxX = std::max(last.maxX, own.maxX),
                         .maxY = std::max(last.maxY, own.maxY),
                         .firstRow = std::min(last.firstRow, own.firstRow),
                         .lastRow = std::max(last.lastRow, own.lastRow),
                         .firstShared = std::max(last.firstShared, own.firstShared),
                         .lastShared = std::min(last.lastShared, own.lastShared)};
      if (joined.end - joined.begin <= kMostGrouped && joined.maxX - joined.minX <= mostExtent &&
          joined.maxY - joined.minY <= mostExtent) {
        last = joined;
        continue;
      }
    }
    groups_.push_back(own);
  }
  std::stable_sort(groups_.begin(), groups_.end(),
                   [](const Group& a, const Group& b) { return a.firstRow < b.firstRow; });
  for (std::size_t i = 0; i < groups_.size(); ++i) {
    if (i % kBlock == 0) blocks_.push_back({groups_[i].firstRow, groups_[i].lastRow});
    blocks_.back().lastRow = std::max(blocks_.back().lastRow, groups_[i].lastRow);
  }
}

PolygonRowIndex::Crowd PolygonRowIndex::CrowdOf(std::int64_t first, std::int64_t last) const {
  Crowd crowd;
  ForEachGroup(first, last, [&](const Group& group) {
    ++crowd.groups;
    crowd.places += GroupedEdges::PlacesFor(group.end - group.begin);
  });
  return crowd;
}

bool PolygonRowIndex::IsInside(double x, double y) const {
  const std::int64_t row = RowOf(y);
  bool inside = false;
  ForEachGroup(row, row, [&](const Group& group) {
    for (std::uint32_t i = group.begin; i < group.end; ++i) {
      const PolygonEdge& edge = edges_[i];
      if (row < edge.firstRow || row >= edge.endRow) continue;
      if (CrossesRay(edge, x, y)) inside = !inside;
    }
  });
  return inside;
}

double PolygonRowIndex::DistanceToEdge(double x, double y) const {
  const std::int64_t row = RowOf(y);
  double smallest = std::numeric_limits<double>::infinity();
  ForEachGroup(row, row, [&](const Group& group) {
    for (std::uint32_t i = group.begin; i < group.end; ++i) {
      const PolygonEdge& edge = edges_[i];
      if (row < edge.firstBand || row > edge.lastBand) continue;
      smallest = std::min(smallest, SquaredDistance(edge, x, y));
    }
  });
  return std::sqrt(smallest);
}

bool PolygonRowIndex::RowInBand(double y) const {
  const std::int64_t row = RowOf(y);
  // A polygon that is flat in y still has one row.
  if (blend_ == 0 && rowCount_ == 0 && hasFirstEdge_ && row == rowMin_) return true;
  bool any = false;
  ForEachGroup(row, row, [&](const Group& group) {
    for (std::uint32_t i = group.begin; i < group.end; ++i) {
      any = any || (row >= edges_[i].firstBand && row <= edges_[i].lastBand);
    }
  });
  return any;
}

}  // namespace zarn::processes::filters
