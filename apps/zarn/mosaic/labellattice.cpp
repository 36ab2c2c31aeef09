// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/labellattice.h"

#include <algorithm>
#include <array>
#include <map>
#include <utility>

namespace zarn::app {
namespace {

// The neighbours by the sides, as far as the lattice has them.
template <typename Visit>
void ForEachSide(std::size_t cell, WindowSize lattice, const Visit& visit) {
  const auto width = static_cast<std::size_t>(lattice.width);
  const auto height = static_cast<std::size_t>(lattice.height);
  if (cell % width > 0) visit(cell - 1);
  if (cell % width + 1 < width) visit(cell + 1);
  if (cell >= width) visit(cell - width);
  if (cell / width + 1 < height) visit(cell + width);
}

/// The nearest labelled cell of each column, as seen from one row.
struct ColumnSite {
  std::int64_t column = 0;
  std::int64_t distance = 0;  ///< rows
  std::uint32_t label = kNoLabel;

  std::int64_t SquareTo(std::int64_t x) const {
    return (x - column) * (x - column) + distance * distance;
  }
  bool IsNearer(const ColumnSite& other, std::int64_t x) const {
    return std::pair(SquareTo(x), label) < std::pair(other.SquareTo(x), other.label);
  }
  // The last column of a row of `width` in which this site is as near as `other`, which lies
  // further right.
  std::int64_t LastBefore(const ColumnSite& other) const {
    const std::int64_t twice = 2 * (other.column - column);
    const std::int64_t above = other.column * other.column + other.distance * other.distance -
                               column * column - distance * distance;
    return above >= 0 ? above / twice : -((-above + twice - 1) / twice);
  }
};

// The nearest site of each column of a row from the sites of the columns: the lower envelope of
// parabolas (A. Meijster, J. Roerdink, W. Hesselink: A General Algorithm for Computing Distance
// Transforms in Linear Time, 2000).
void FillRow(const std::vector<ColumnSite>& sites, std::vector<ColumnSite>& envelope,
             std::vector<std::int64_t>& lasts, std::uint32_t* row) {
  envelope.clear();
  lasts.clear();
  for (const ColumnSite& site : sites) {
    if (site.label == kNoLabel) continue;
    while (!envelope.empty()) {
      const std::int64_t last = envelope.back().LastBefore(site);
      // (The site before counts to its last column itself: there both may be equally near.)
      if (envelope.size() == 1 || last >= lasts.back()) {
        lasts.push_back(last);
        break;
      }
      envelope.pop_back();
      lasts.pop_back();
    }
    envelope.push_back(site);
  }
  std::size_t at = 0;
  for (std::size_t x = 0; x < sites.size(); ++x) {
    const auto column = static_cast<std::int64_t>(x);
    while (at + 1 < envelope.size() && lasts[at] < column) ++at;
    const ColumnSite* best = &envelope[at];
    for (std::size_t i = at + 1; i < envelope.size() && lasts[i - 1] == column; ++i) {
      if (envelope[i].IsNearer(*best, column)) best = &envelope[i];
    }
    row[x] = best->label;
  }
}

}  // namespace

std::vector<std::int32_t> DistanceToUnmarked(const std::vector<std::uint8_t>& marked,
                                             WindowSize lattice) {
  constexpr std::int32_t kSide = 5;
  constexpr std::int32_t kCorner = 7;
  const std::int64_t width = lattice.width;
  const std::int64_t height = lattice.height;
  const auto beyond = static_cast<std::int32_t>(kCorner * (width + height + 1));
  std::vector<std::int32_t> distance(marked.size());
  for (std::size_t i = 0; i < marked.size(); ++i) distance[i] = marked[i] != 0 ? beyond : 0;
  // Down with what lies before a cell, up with what lies behind it.
  for (const std::int64_t sign : {1, -1}) {
    for (std::int64_t row = 0; row < height; ++row) {
      const std::int64_t y = sign > 0 ? row : height - 1 - row;
      for (std::int64_t column = 0; column < width; ++column) {
        const std::int64_t x = sign > 0 ? column : width - 1 - column;
        std::int32_t& here = distance[static_cast<std::size_t>(y * width + x)];
        const auto pass = [&](std::int64_t dx, std::int64_t dy, std::int32_t step) {
          const std::int64_t otherX = x - sign * dx;
          const std::int64_t otherY = y - sign * dy;
          if (otherX < 0 || otherX >= width || otherY < 0 || otherY >= height) return;
          here = std::min(here, distance[static_cast<std::size_t>(otherY * width + otherX)] + step);
        };
        if (here == 0) continue;
        pass(1, 0, kSide);
        pass(0, 1, kSide);
        pass(1, 1, kCorner);
        pass(-1, 1, kCorner);
      }
    }
  }
  return distance;
}

void FillFromNearest(std::vector<std::uint32_t>& labels, WindowSize lattice) {
  const auto width = static_cast<std::size_t>(lattice.width);
  const auto height = static_cast<std::size_t>(lattice.height);
  if (std::find(labels.begin(), labels.end(), kNoLabel) == labels.end()) return;
  if (std::all_of(labels.begin(), labels.end(), [](auto label) { return label == kNoLabel; })) {
    std::fill(labels.begin(), labels.end(), 0);
    return;
  }
  // How far down the next label of each column is. Labels above are found on the way down.
  std::vector<std::uint32_t> below(labels.size(), kNoLabel);  // rows
  for (std::size_t y = height; y-- > 0;) {
    for (std::size_t x = 0; x < width; ++x) {
      const std::size_t cell = y * width + x;
      if (labels[cell] != kNoLabel) {
        below[cell] = 0;
      } else if (y + 1 < height && below[cell + width] != kNoLabel) {
        below[cell] = below[cell + width] + 1;
      }
    }
  }
  std::vector<ColumnSite> above(width);
  std::vector<ColumnSite> sites(width);
  std::vector<ColumnSite> envelope;
  std::vector<std::int64_t> lasts;
  for (std::size_t y = 0; y < height; ++y) {
    for (std::size_t x = 0; x < width; ++x) {
      const std::size_t cell = y * width + x;
      const auto column = static_cast<std::int64_t>(x);
      if (below[cell] == 0) {
        above[x] = {column, 0, labels[cell]};
      } else {
        ++above[x].distance;
      }
      sites[x] = above[x];
      if (below[cell] != kNoLabel) {
        const ColumnSite site{column, below[cell], labels[cell + below[cell] * width]};
        if (above[x].label == kNoLabel || site.IsNearer(above[x], column)) sites[x] = site;
      }
    }
    FillRow(sites, envelope, lasts, labels.data() + y * width);
  }
}

namespace {

/// Looks for islands by flooding no more than `smallest` cells from each cell. Most cells are known
/// to be no part of one because the cell before or above is not.
class IslandSearch {
 public:
  IslandSearch(std::vector<std::uint32_t>& labels, WindowSize lattice, std::size_t smallest)
      : labels_(labels), lattice_(lattice), smallest_(smallest), state_(labels.size()) {}

  // The cells of the island that begins at `start`; empty where there is none.
  const std::vector<std::size_t>& At(std::size_t start) {
    island_.clear();
    const auto width = static_cast<std::size_t>(lattice_.width);
    const auto continues = [&](std::size_t before) {
      return state_[before] == kMainland && labels_[before] == labels_[start];
    };
    if (state_[start] == kKnownIsland) return island_;
    if (state_[start] == kMainland || (start >= width && continues(start - width)) ||
        (start % width > 0 && continues(start - 1))) {
      state_[start] = kMainland;
      return island_;
    }
    const bool isIsland = Flood(start);
    for (const std::size_t cell : island_) state_[cell] = isIsland ? kKnownIsland : kMainland;
    if (!isIsland) island_.clear();
    return island_;
  }

 private:
  enum State : std::uint8_t { kUnknown, kMainland, kKnownIsland, kFlooded };

  bool Flood(std::size_t start) {
    island_.push_back(start);
    state_[start] = kFlooded;
    bool isIsland = true;
    for (std::size_t i = 0; i < island_.size() && isIsland; ++i) {
      ForEachSide(island_[i], lattice_, [&](std::size_t other) {
        if (labels_[other] != labels_[start] || state_[other] == kFlooded) return;
        if (state_[other] == kMainland) isIsland = false;
        if (state_[other] != kUnknown) return;
        state_[other] = kFlooded;
        island_.push_back(other);
      });
      isIsland = isIsland && island_.size() < smallest_;
    }
    return isIsland;
  }

  std::vector<std::uint32_t>& labels_;
  WindowSize lattice_;
  std::size_t smallest_;
  std::vector<State> state_;
  std::vector<std::size_t> island_;
};

// The labels around an island, that with the longest common border first.
std::vector<std::uint32_t> Around(const std::vector<std::size_t>& island,
                                  const std::vector<std::uint32_t>& labels, WindowSize lattice) {
  std::map<std::uint32_t, std::size_t> borders;
  for (const std::size_t cell : island) {
    ForEachSide(cell, lattice, [&](std::size_t other) {
      if (labels[other] != labels[cell]) ++borders[labels[other]];
    });
  }
  std::vector<std::pair<std::uint32_t, std::size_t>> sorted(borders.begin(), borders.end());
  std::stable_sort(sorted.begin(), sorted.end(),
                   [](const auto& a, const auto& b) { return a.second > b.second; });
  std::vector<std::uint32_t> around;
  around.reserve(sorted.size());
  for (const auto& [label, border] : sorted) around.push_back(label);
  return around;
}

}  // namespace

void MergeIslands(std::vector<std::uint32_t>& labels, WindowSize lattice, std::size_t smallest,
                  const std::function<bool(std::size_t, std::uint32_t)>& canTake) {
  // An island that was merged may itself be part of one.
  constexpr int kMostRounds = 8;
  bool changed = smallest > 1;
  for (int round = 0; changed && round < kMostRounds; ++round) {
    changed = false;
    IslandSearch search(labels, lattice, smallest);
    for (std::size_t start = 0; start < labels.size(); ++start) {
      const std::vector<std::size_t>& island = search.At(start);
      if (island.empty()) continue;
      for (const std::uint32_t taker : Around(island, labels, lattice)) {
        const bool takesAll = std::all_of(island.begin(), island.end(),
                                          [&](std::size_t cell) { return canTake(cell, taker); });
        if (!takesAll) continue;
        for (const std::size_t cell : island) labels[cell] = taker;
        changed = true;
        break;
      }
    }
  }
}

}  // namespace zarn::app
