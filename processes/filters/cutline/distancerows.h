// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "processes/filters/cutline/distancerows_simd.h"
#include "processes/filters/cutline/groupededges.h"
#include "processes/filters/cutline/pixelbits.h"
#include "processes/filters/cutline/polygonrowindex.h"

namespace zarn::processes::filters {

/// The weights of a row's pixels within the band of a cutline, exactly as
/// `PolygonRowIndex::DistanceToEdge` gives them.
///
/// Each edge lowers the squared distances of the columns that it may be near to; pixels farther
/// than the blend width from all edges are either copied or left, whatever their distance. For some
/// rows at a time every column gets a bound that its pixels are not farther away than, and an edge
/// is looked at in those columns only where it may be nearer.
class DistanceRows {
 public:
  /// For rows of `width` pixels from column `left` on. Keeps the address of `index`; `most` is
  /// the most that `Prepare` will meet.
  DistanceRows(const PolygonRowIndex& index, std::int64_t left, std::size_t width,
               const PolygonRowIndex::Crowd& most);

  /// Collects the edges of the rows `first` .. `last`.
  void Prepare(std::int64_t first, std::int64_t last);
  /// Writes the bits of the pixels of one of these rows whose weights lie between -1 and 1.
  void Compute(std::int64_t row, const PixelBits& inside, PixelBits& band);
  /// The weights of those pixels.
  const double* Weights() const { return distances_.data(); }

 private:
  struct Columns {
    std::size_t first;
    std::size_t end;
  };
  struct Prepared {
    const PolygonRowIndex::Group* group;
    std::size_t place;  // of its edges in `grouped_`
    // Of a group of one edge: columns per row, and how far to both sides of it the columns within
    // reach of its line extend in a row. Infinite or no number where it is horizontal.
    double slope;
    double half;
    Columns columns;  // no row at hand needs it elsewhere

    double XAt(const PolygonEdge& edge, double y) const { return edge.x0 + slope * (y - edge.y0); }
  };
  struct Rows {
    std::int64_t first;
    std::int64_t last;
  };
  // A group that the row at hand is within reach of.
  struct Near {
    const PolygonRowIndex::Group* group;
    std::size_t place;
    double above;  // how far the row is from its box
    Columns columns;
    Columns own;  // where the row meets the group itself
  };

  // The centres of the first and the last of the rows at hand.
  double Top() const { return static_cast<double>(rows_.first) + 0.5; }
  double Bottom() const { return static_cast<double>(rows_.last) + 0.5; }
  // What two distances may be taken for each other by.
  double Slack() const { return 4 * index_.DistanceTolerance(); }

  void BoundDistances();
  void Trim();
  Columns NeededColumns(const Prepared& prepared) const;
  Near Reach(const Prepared& prepared, double y) const;
  Columns Held(double low, double high) const;
  void BeginWord(std::size_t word);
  void Touch(Columns columns);
  void LowerNarrow(std::int64_t row);
  void CollectNear(std::int64_t row, double y);
  void OrderNear();
  void Lower(const Near& near, Columns columns, std::int64_t row);

  const PolygonRowIndex& index_;
  double left_;
  std::size_t width_;
  double reach_;
  Rows rows_{};
  std::size_t count_ = 0;
  std::vector<Prepared> groups_;
  GroupedEdges grouped_;        ///< those of groups of several
  std::vector<double> bounds_;  ///< no pixel of the rows at hand is farther from the polygon
  std::vector<double> spread_;  ///< scratch beside them
  std::size_t narrowCount_ = 0;
  std::vector<NarrowEdge> narrow_;  ///< taken out of `groups_`
  PixelBits narrowWords_;           ///< the words that they have to do with
  std::size_t nearCount_ = 0;
  std::vector<Near> near_;
  std::vector<Near> ordered_;
  bool vectors_;
  std::vector<double> distances_;  ///< squared ones, then weights; whole words
  PixelBits touched_;              ///< the words of `distances_` that are in use
  PixelBits known_;                ///< those that hold the weights of the row above
  std::int64_t above_ = 0;         ///< that row, if any is known
};

}  // namespace zarn::processes::filters
