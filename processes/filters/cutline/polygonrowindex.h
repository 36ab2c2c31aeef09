// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "processes/filters/cutline/polygonedge.h"
#include "processes/filters/cutline/polygonparam.h"

namespace zarn::processes::filters {

/// The edges of a polygon, found by the rows that they have to do with.
///
/// Consecutive short edges form groups that know their bounds, and only groups are looked up: the
/// memory goes with the number of edges, however many rows they span. A polygon with a vertex that
/// is not finite has no edges, so it admits no pixel. Read only once built.
class PolygonRowIndex {
 public:
  /// Edges `begin` .. `end` - 1 of `Edges()`, `kMostGrouped` of them at the most, and what all of
  /// them keep within.
  struct Group {
    std::uint32_t begin;
    std::uint32_t end;
    double minX;
    double minY;
    double maxX;
    double maxY;
    std::int64_t firstRow;     ///< the first row that any edge has to do with
    std::int64_t lastRow;      ///< the last one
    std::int64_t firstShared;  ///< the first row that all edges have to do with
    std::int64_t lastShared;   ///< the last one
  };

  /// How much some rows have to do with.
  struct Crowd {
    std::size_t groups = 0;
    std::size_t places = 0;  ///< of their edges, as `GroupedEdges` lays them out
  };

  /// Copies the vertices; `blend` is the half width of the band in pixels, 0 for none.
  PolygonRowIndex(const PolygonParam& polygon, std::uint32_t blend);

  // The definition, pixel by pixel. Points are pixel centres.

  /// Even-odd rule with a ray towards +x. An edge that the point lies on counts as crossed.
  bool IsInside(double x, double y) const;
  /// The distance to the nearest edge that the row of `y` has to do with; infinite without one.
  double DistanceToEdge(double x, double y) const;
  /// Whether the row of `y` has to do with any edge.
  bool RowInBand(double y) const;

  std::uint32_t Blend() const { return blend_; }
  /// The rows [BandMin(), BandMin() + BandCount()] hold everything that is not outside.
  std::int64_t BandMin() const { return rowMin_ - std::int64_t{blend_}; }
  std::int64_t BandCount() const { return rowCount_ + 2 * std::int64_t{blend_}; }
  const std::vector<PolygonEdge>& Edges() const { return edges_; }

  /// What a computed distance may differ by from the true one.
  double DistanceTolerance() const { return distanceTolerance_; }

  /// Counts what the rows `first` .. `last` have to do with.
  Crowd CrowdOf(std::int64_t first, std::int64_t last) const;

  /// Calls `use(group)` for the groups that have to do with any of the rows `first` .. `last`.
  template <typename Use>
  void ForEachGroup(std::int64_t first, std::int64_t last, const Use& use) const {
    for (std::size_t block = 0; block < blocks_.size(); ++block) {
      if (blocks_[block].firstRow > last) return;
      if (blocks_[block].lastRow < first) continue;
      const std::size_t end = std::min(groups_.size(), (block + 1) * kBlock);
      for (std::size_t i = block * kBlock; i < end; ++i) {
        if (groups_[i].firstRow <= last && groups_[i].lastRow >= first) use(groups_[i]);
      }
    }
  }

 private:
  struct Rows {
    std::int64_t firstRow;
    std::int64_t lastRow;
  };

  static constexpr std::size_t kBlock = 64;

  void AddEdges(const PolygonParam& polygon);
  void FormGroups();

  std::vector<PolygonEdge> edges_;
  std::vector<Group> groups_;  ///< by their first rows
  std::vector<Rows> blocks_;   ///< the rows of each `kBlock` consecutive groups
  std::uint32_t blend_;
  std::int64_t rowMin_ = 0;
  std::int64_t rowCount_ = 0;
  bool hasFirstEdge_ = false;
  double distanceTolerance_ = 0;
};

}  // namespace zarn::processes::filters
