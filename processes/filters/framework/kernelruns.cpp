// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/kernelruns.h"

#include <algorithm>
#include <cstdint>
#include <map>
#include <utility>

namespace zarn::processes::filters {
namespace {

struct Cell {
  std::ptrdiff_t dx;
  std::ptrdiff_t dy;
};

// Calls `use(cell)` for the centre and for each cell that an image of this size can see.
template <typename Use>
void ForEachCell(const std::vector<int>& offsets, std::ptrdiff_t width, std::ptrdiff_t height,
                 const Use& use) {
  use(Cell{0, 0});
  for (std::size_t k = 0; k + 1 < offsets.size(); k += 2) {
    const Cell cell{offsets[k], offsets[k + 1]};
    const bool visible =
        cell.dx > -width && cell.dx < width && cell.dy > -height && cell.dy < height;
    if (visible) use(cell);
  }
}

}  // namespace

KernelRuns::KernelRuns(const std::vector<int>& offsets, std::ptrdiff_t width,
                       std::ptrdiff_t height) {
  ForEachCell(offsets, width, height, [&](const Cell& cell) {
    top = std::min(top, cell.dy);
    bottom = std::max(bottom, cell.dy);
  });

  // The columns of each row, one row after the other. Lists are usually in order of columns, which
  // then are in order here as well.
  std::vector<std::size_t> ends(static_cast<std::size_t>(bottom - top + 2));
  const auto rowOf = [&](const Cell& cell) { return static_cast<std::size_t>(cell.dy - top); };
  ForEachCell(offsets, width, height, [&](const Cell& cell) { ++ends[rowOf(cell) + 1]; });
  for (std::size_t row = 1; row < ends.size(); ++row) ends[row] += ends[row - 1];
  std::vector<std::ptrdiff_t> columns(ends.back());
  ForEachCell(offsets, width, height,
              [&](const Cell& cell) { columns[ends[rowOf(cell)]++] = cell.dx; });

  std::map<std::pair<std::ptrdiff_t, std::ptrdiff_t>, std::size_t> known;
  auto begin = columns.begin();
  for (std::ptrdiff_t dy = top; dy <= bottom; ++dy) {
    const auto end = columns.begin() + static_cast<std::ptrdiff_t>(ends[rowOf({0, dy})]);
    if (!std::is_sorted(begin, end)) std::sort(begin, end);
    while (begin != end) {
      const std::ptrdiff_t first = *begin;
      std::ptrdiff_t last = first;
      while (begin != end && *begin <= last + 1) last = *begin++;
      const auto [place, isNew] = known.try_emplace({first, last}, runs.size());
      if (isNew) runs.push_back({first, last, {}});
      runs[place->second].rows.push_back(dy);
    }
  }
}

}  // namespace zarn::processes::filters
