// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/gridcut.h"

#include <algorithm>
#include <limits>
#include <utility>

namespace zarn::app {
namespace {

// Sums of pulls stop here, so that flows fit into 32 bits.
constexpr std::int32_t kMostPull = 1 << 29;

// The eight neighbours in the order of rows, so that 7 - d is the way back.
enum Direction : int { kNorthWest, kNorth, kNorthEast, kWest, kEast, kSouthWest, kSouth };
constexpr int kDirections = 8;
constexpr int Back(int direction) { return 7 - direction; }
constexpr int StepX(int direction) {
  return std::array{-1, 0, 1, -1, 1, -1, 0, 1}[static_cast<std::size_t>(direction)];
}
constexpr int StepY(int direction) { return direction < 3 ? -1 : direction < 5 ? 0 : 1; }

std::size_t CellsOf(WindowSize size) { return static_cast<std::size_t>(size.width * size.height); }

/// The flow network of the cells that are free. Nodes are numbered in the order of rows; the three
/// neighbours above or below are therefore consecutive, as far as they are free, and two numbers
/// and eight bits per node tell all its neighbours.
class Network {
 public:
  using Node = std::int32_t;

  Network(const CutProblem& problem, const std::vector<std::uint8_t>& free,
          const std::vector<std::uint8_t>& sides)
      : problem_(problem) {
    NumberNodes(free);
    for (Node node = 0; node < Count(); ++node) FindNeighbours(node, free, sides);
  }

  /// Writes the sides of the free cells.
  void Solve(std::vector<std::uint8_t>& sides) {
    PlantTrees();
    Node growing = kNobody;
    while (true) {
      // The same node goes on after a path was found from it, unless it has lost its tree.
      if (growing != kNobody && parent_[At(growing)] == kNoParent) growing = kNobody;
      if (growing == kNobody) growing = NextActive();
      if (growing == kNobody) break;
      const int meeting = Grow(growing);
      ++time_;
      if (meeting == kDirections) {
        growing = kNobody;
        continue;
      }
      Augment(growing, meeting);
      AdoptOrphans();
    }
    for (Node node = 0; node < Count(); ++node) {
      const bool second = parent_[At(node)] != kNoParent && InSecondTree(node);
      sides[cell_[At(node)]] = second ? 1 : 0;
    }
  }

 private:
  static constexpr Node kNobody = -1;
  // Values of parent_ beyond the directions.
  static constexpr std::uint8_t kTerminal = 8;
  static constexpr std::uint8_t kOrphan = 9;
  static constexpr std::uint8_t kNoParent = 10;
  static constexpr std::int32_t kFar = std::numeric_limits<std::int32_t>::max();

  static std::size_t At(Node node) { return static_cast<std::size_t>(node); }
  Node Count() const { return static_cast<Node>(cell_.size()); }

  void NumberNodes(const std::vector<std::uint8_t>& free) {
    const auto count = static_cast<std::size_t>(std::count(free.begin(), free.end(), 1));
    cell_.reserve(count);
    for (std::size_t cell = 0; cell < free.size(); ++cell) {
      if (free[cell] != 0) cell_.push_back(static_cast<std::uint32_t>(cell));
    }
    around_.resize(count);
    above_.resize(count);
    below_.resize(count);
    residual_.resize(count);
    excess_.resize(count);
    parent_.assign(count, kNoParent);
    second_.assign(count, 0);
    stamp_.assign(count, 0);
    distance_.assign(count, 0);
    next_.assign(count, kNobody);
    upper_ = 0;
    lower_ = 0;
  }

  // Called in the order of the nodes: the first free neighbours above and below only move on.
  void FindNeighbours(Node node, const std::vector<std::uint8_t>& free,
                      const std::vector<std::uint8_t>& sides) {
    const std::size_t i = At(node);
    const std::int64_t cell = cell_[i];
    const std::int64_t width = problem_.size.width;
    const std::int64_t x = cell % width;
    const std::int64_t y = cell / width;
    const auto moveTo = [&](std::size_t& to, std::int64_t row) {
      const std::int64_t first = row * width + std::max<std::int64_t>(x - 1, 0);
      while (to < cell_.size() && cell_[to] < first) ++to;
      return static_cast<Node>(to);
    };
    above_[i] = moveTo(upper_, y - 1);
    below_[i] = moveTo(lower_, y + 1);
    std::int64_t excess = problem_.pull[static_cast<std::size_t>(cell)];
    for (int d = 0; d < kDirections; ++d) {
      const std::int64_t otherX = x + StepX(d);
      const std::int64_t otherY = y + StepY(d);
      const bool inside =
          otherX >= 0 && otherY >= 0 && otherX < width && otherY < problem_.size.height;
      if (!inside) continue;
      const auto other = static_cast<std::size_t>(otherY * width + otherX);
      const std::int32_t capacity = CapacityTo(static_cast<std::size_t>(cell), other, d);
      if (free[other] != 0) {
        around_[i] |= static_cast<std::uint8_t>(1 << d);
        residual_[i][static_cast<std::size_t>(d)] = capacity;
      } else if (problem_.open[other] != 0) {
        excess += sides[other] == 0 ? capacity : -capacity;
      }
    }
    excess_[i] = static_cast<std::int32_t>(std::clamp<std::int64_t>(excess, -kMostPull, kMostPull));
  }

  std::int32_t CapacityTo(std::size_t cell, std::size_t other, int direction) const {
    const bool forward = direction > kWest;
    const int way = forward ? direction : Back(direction);
    const auto link = static_cast<std::size_t>(way - kEast);
    return problem_.links[forward ? cell : other][link];
  }

  bool HasNeighbour(Node node, int d) const { return (around_[At(node)] >> d & 1) != 0; }

  // Only where there is one.
  Node Neighbour(Node node, int d) const {
    if (d == kWest) return node - 1;
    if (d == kEast) return node + 1;
    const auto rank = [](int bits, int place) {
      return place == 0 ? 0 : place == 1 ? bits & 1 : (bits & 1) + (bits >> 1 & 1);
    };
    const int bits = around_[At(node)];
    return d < kWest ? above_[At(node)] + rank(bits, d)
                     : below_[At(node)] + rank(bits >> kSouthWest, d - kSouthWest);
  }

  std::int32_t& Residual(Node node, int d) {
    return residual_[At(node)][static_cast<std::size_t>(d)];
  }
  bool InSecondTree(Node node) const { return second_[At(node)] != 0; }

  // Whether flow can still go from the terminal through `node` to its neighbour (towards the
  // neighbour in the first tree, from it in the second one).
  bool CanPass(Node node, int d, bool second) {
    return second ? Residual(Neighbour(node, d), Back(d)) > 0 : Residual(node, d) > 0;
  }

  void PlantTrees() {
    for (Node node = 0; node < Count(); ++node) {
      if (excess_[At(node)] == 0) continue;
      parent_[At(node)] = kTerminal;
      second_[At(node)] = excess_[At(node)] < 0 ? 1 : 0;
      distance_[At(node)] = 1;
      Activate(node);
    }
  }

  // A list through next_, whose last node points at itself.
  void Activate(Node node) {
    if (next_[At(node)] != kNobody) return;
    if (lastActive_ == kNobody) {
      firstActive_ = node;
    } else {
      next_[At(lastActive_)] = node;
    }
    lastActive_ = node;
    next_[At(node)] = node;
  }

  Node NextActive() {
    while (firstActive_ != kNobody) {
      const Node node = firstActive_;
      const Node next = next_[At(node)];
      next_[At(node)] = kNobody;
      firstActive_ = next == node ? kNobody : next;
      if (next == node) lastActive_ = kNobody;
      if (parent_[At(node)] != kNoParent) return node;
    }
    return kNobody;
  }

  // Takes free neighbours into the tree; the direction in which the other tree was met, or
  // kDirections.
  int Grow(Node node) {
    const bool second = InSecondTree(node);
    for (int d = 0; d < kDirections; ++d) {
      if (!HasNeighbour(node, d) || !CanPass(node, d, second)) continue;
      const std::size_t other = At(Neighbour(node, d));
      if (parent_[other] == kNoParent) {
        second_[other] = second ? 1 : 0;
        Attach(other, node, d);
        Activate(static_cast<Node>(other));
      } else if ((second_[other] != 0) != second) {
        return d;
      } else if (stamp_[other] <= stamp_[At(node)] && distance_[other] > distance_[At(node)]) {
        Attach(other, node, d);  // a shorter way to the terminal
      }
    }
    return kDirections;
  }

  void Attach(std::size_t child, Node node, int d) {
    parent_[child] = static_cast<std::uint8_t>(Back(d));
    stamp_[child] = stamp_[At(node)];
    distance_[child] = distance_[At(node)] + 1;
  }

  // Pushes as much as the path from the first terminal over the link that was found to the second
  // one takes.
  void Augment(Node node, int meeting) {
    const bool fromSecond = InSecondTree(node);
    const Node other = Neighbour(node, meeting);
    const Node first = fromSecond ? other : node;
    const Node second = fromSecond ? node : other;
    const int d = fromSecond ? Back(meeting) : meeting;
    std::int32_t flow = Residual(first, d);
    flow = std::min(flow, Bottleneck(first, false));
    flow = std::min(flow, Bottleneck(second, true));
    Residual(first, d) -= flow;
    Residual(second, Back(d)) += flow;
    Push(first, false, flow);
    Push(second, true, flow);
  }

  std::int32_t Bottleneck(Node node, bool second) {
    std::int32_t least = kFar;
    while (parent_[At(node)] != kTerminal) {
      const int d = parent_[At(node)];
      const Node parent = Neighbour(node, d);
      least = std::min(least, second ? Residual(node, d) : Residual(parent, Back(d)));
      node = parent;
    }
    return std::min(least, std::abs(excess_[At(node)]));
  }

  void Push(Node node, bool second, std::int32_t flow) {
    while (parent_[At(node)] != kTerminal) {
      const int d = parent_[At(node)];
      const Node parent = Neighbour(node, d);
      std::int32_t& used = second ? Residual(node, d) : Residual(parent, Back(d));
      std::int32_t& back = second ? Residual(parent, Back(d)) : Residual(node, d);
      used -= flow;
      back += flow;
      if (used == 0) Orphan(node);
      node = parent;
    }
    excess_[At(node)] += second ? flow : -flow;
    if (excess_[At(node)] == 0) Orphan(node);
  }

  void Orphan(Node node) {
    parent_[At(node)] = kOrphan;
    orphans_.push_back(node);
  }

  void AdoptOrphans() {
    for (std::size_t i = 0; i < orphans_.size(); ++i) Adopt(orphans_[i]);
    orphans_.clear();
  }

  // Hangs the node up at the neighbour that is nearest to the terminal, or sets it free and its
  // children adrift.
  void Adopt(Node node) {
    const bool second = InSecondTree(node);
    int best = kDirections;
    std::int32_t nearest = kFar;
    for (int d = 0; d < kDirections; ++d) {
      if (!HasNeighbour(node, d)) continue;
      const Node other = Neighbour(node, d);
      if (!CanPass(other, Back(d), second) || !IsIn(other, second)) continue;
      const std::int32_t distance = DistanceToTerminal(other);
      if (distance < nearest) {
        nearest = distance;
        best = d;
      }
    }
    if (best != kDirections) {
      parent_[At(node)] = static_cast<std::uint8_t>(best);
      stamp_[At(node)] = time_;
      distance_[At(node)] = nearest + 1;
      return;
    }
    parent_[At(node)] = kNoParent;
    for (int d = 0; d < kDirections; ++d) {
      if (!HasNeighbour(node, d)) continue;
      const Node other = Neighbour(node, d);
      if (!IsIn(other, second)) continue;
      if (CanPass(other, Back(d), second)) Activate(other);
      const std::uint8_t parent = parent_[At(other)];
      if (parent == Back(d)) Orphan(other);
    }
  }

  bool IsIn(Node node, bool second) const {
    return parent_[At(node)] != kNoParent && InSecondTree(node) == second;
  }

  // Along the parents; kFar when they end at an orphan. What was found is noted on the way, for the
  // next that asks at the same time.
  std::int32_t DistanceToTerminal(Node node) {
    std::int32_t steps = 0;
    Node at = node;
    while (true) {
      if (stamp_[At(at)] == time_) {
        steps += distance_[At(at)];
        break;
      }
      const std::uint8_t parent = parent_[At(at)];
      if (parent == kTerminal) {
        stamp_[At(at)] = time_;
        distance_[At(at)] = 1;
        steps += 1;
        break;
      }
      if (parent >= kTerminal) return kFar;
      at = Neighbour(at, parent);
      ++steps;
    }
    std::int32_t distance = steps;
    for (at = node; stamp_[At(at)] != time_; at = Neighbour(at, parent_[At(at)])) {
      stamp_[At(at)] = time_;
      distance_[At(at)] = distance--;
    }
    return steps;
  }

  const CutProblem& problem_;
  std::vector<std::uint32_t> cell_;
  std::vector<std::uint8_t> around_;  ///< a bit per direction in which there is a neighbour
  std::vector<Node> above_;           ///< the first neighbour in the row above
  std::vector<Node> below_;
  std::vector<std::array<std::int32_t, kDirections>> residual_;
  std::vector<std::int32_t> excess_;  ///< what the first terminal can give, or (-) the second take
  std::vector<std::uint8_t> parent_;  ///< direction, or one of the values above
  std::vector<std::uint8_t> second_;  ///< which tree, where there is a parent
  std::vector<std::int32_t> stamp_;   ///< when distance_ was true
  std::vector<std::int32_t> distance_;
  std::vector<Node> next_;
  std::vector<Node> orphans_;
  Node firstActive_ = kNobody;
  Node lastActive_ = kNobody;
  std::int32_t time_ = 1;
  std::size_t upper_ = 0;
  std::size_t lower_ = 0;
};

constexpr std::array<std::int64_t, CutProblem::kLinks> kLinkX{1, -1, 0, 1};
constexpr std::array<std::int64_t, CutProblem::kLinks> kLinkY{0, 1, 1, 1};

// Visits every link that costs something, with the cell that holds it.
template <typename Visit>
void ForEachLink(const CutProblem& problem, const Visit& visit) {
  std::size_t cell = 0;
  for (std::int64_t y = 0; y < problem.size.height; ++y) {
    for (std::int64_t x = 0; x < problem.size.width; ++x, ++cell) {
      if (problem.open[cell] == 0) continue;
      for (std::size_t link = 0; link < CutProblem::kLinks; ++link) {
        const std::int32_t cost = problem.links[cell][link];
        if (cost != 0) visit(x, y, link, cost);
      }
    }
  }
}

std::size_t CellAt(WindowSize size, std::int64_t x, std::int64_t y) {
  return static_cast<std::size_t>(y * size.width + x);
}

// The other end of a link.
std::size_t CellBeyond(WindowSize size, std::int64_t x, std::int64_t y, std::size_t link) {
  return CellAt(size, x + kLinkX[link], y + kLinkY[link]);
}

/// A problem in which squares of 2 x 2 cells stay together.
struct CoarserProblem {
  explicit CoarserProblem(const CutProblem& fine);

  std::size_t SquareOf(std::int64_t x, std::int64_t y) const {
    return CellAt(problem.size, x / 2, y / 2);
  }

  CutProblem problem;
  std::vector<std::uint8_t> torn;  ///< squares some of whose cells are pulled to either side
};

template <typename Visit>
void ForEachCell(WindowSize size, const Visit& visit) {
  std::size_t cell = 0;
  for (std::int64_t y = 0; y < size.height; ++y) {
    for (std::int64_t x = 0; x < size.width; ++x) visit(cell++, x, y);
  }
}

std::int32_t Added(std::int32_t a, std::int32_t b) {
  const std::int64_t sum = static_cast<std::int64_t>(a) + b;
  return static_cast<std::int32_t>(std::clamp<std::int64_t>(sum, -kMostPull, kMostPull));
}

CoarserProblem::CoarserProblem(const CutProblem& fine)
    : problem({(fine.size.width + 1) / 2, (fine.size.height + 1) / 2}), torn(problem.open.size()) {
  std::vector<std::uint8_t> pulls(torn.size());
  ForEachCell(fine.size, [&](std::size_t cell, std::int64_t x, std::int64_t y) {
    if (fine.open[cell] == 0) return;
    const std::size_t square = SquareOf(x, y);
    problem.open[square] = 1;
    problem.pull[square] = Added(problem.pull[square], fine.pull[cell]);
    constexpr std::uint8_t kToFirst = 1;
    constexpr std::uint8_t kToSecond = 2;
    if (fine.pull[cell] > 0) pulls[square] |= kToFirst;
    if (fine.pull[cell] < 0) pulls[square] |= kToSecond;
    torn[square] = pulls[square] == (kToFirst | kToSecond) ? 1 : 0;
  });
  ForEachLink(fine, [&](std::int64_t x, std::int64_t y, std::size_t link, std::int32_t cost) {
    const std::int64_t across = (x + kLinkX[link]) / 2 - x / 2;
    const std::int64_t down = (y + kLinkY[link]) / 2 - y / 2;
    if (across == 0 && down == 0) return;
    const std::size_t here = SquareOf(x, y);
    const std::size_t holder = down == 0 && across < 0 ? here - 1 : here;
    const auto way = down == 0 ? CutProblem::kEast : CutProblem::kSouth + across;
    std::int32_t& sum = problem.links[holder][static_cast<std::size_t>(way)];
    sum = Added(sum, cost);
  });
}

// Grows the marked cells by one in all directions, `times` over.
void Widen(std::vector<std::uint8_t>& marked, WindowSize size, int times) {
  const auto width = static_cast<std::size_t>(size.width);
  const auto height = static_cast<std::size_t>(size.height);
  for (int i = 0; i < times; ++i) {
    std::vector<std::uint8_t> across(marked);
    for (std::size_t cell = 0; cell < marked.size(); ++cell) {
      if (marked[cell] == 0) continue;
      if (cell % width > 0) across[cell - 1] = 1;
      if (cell % width + 1 < width) across[cell + 1] = 1;
    }
    marked = across;
    for (std::size_t cell = 0; cell < across.size(); ++cell) {
      if (across[cell] == 0) continue;
      if (cell >= width) marked[cell - width] = 1;
      if (cell / width + 1 < height) marked[cell + width] = 1;
    }
  }
}

}  // namespace

CutProblem::CutProblem(WindowSize cells)
    : size(cells), open(CellsOf(cells)), links(open.size()), pull(open.size()) {}

std::vector<std::uint8_t> MinimumCut(const CutProblem& problem, std::size_t exactCells) {
  std::vector<std::uint8_t> sides(problem.open.size());
  std::vector<std::uint8_t> free(problem.open);
  const auto openCells = std::count(problem.open.begin(), problem.open.end(), 1);
  if (static_cast<std::size_t>(openCells) > std::max<std::size_t>(exactCells, 1)) {
    const CoarserProblem coarser(problem);
    const std::vector<std::uint8_t> coarse = MinimumCut(coarser.problem, exactCells);
    std::vector<std::uint8_t> near(coarser.torn);
    const WindowSize squares = coarser.problem.size;
    ForEachLink(coarser.problem,
                [&](std::int64_t x, std::int64_t y, std::size_t link, std::int32_t) {
                  const std::size_t a = CellAt(squares, x, y);
                  const std::size_t b = CellBeyond(squares, x, y, link);
                  if (coarse[a] != coarse[b]) near[a] = near[b] = 1;
                });
    constexpr int kSquaresBeside = 3;
    Widen(near, squares, kSquaresBeside);
    ForEachCell(problem.size, [&](std::size_t cell, std::int64_t x, std::int64_t y) {
      const std::size_t square = coarser.SquareOf(x, y);
      sides[cell] = problem.open[cell] != 0 ? coarse[square] : 0;
      if (near[square] == 0) free[cell] = 0;
    });
  }
  Network(problem, free, sides).Solve(sides);
  return sides;
}

std::int64_t CutCost(const CutProblem& problem, const std::vector<std::uint8_t>& sides) {
  std::int64_t cost = 0;
  ForEachLink(problem, [&](std::int64_t x, std::int64_t y, std::size_t link, std::int32_t c) {
    if (sides[CellAt(problem.size, x, y)] != sides[CellBeyond(problem.size, x, y, link)]) cost += c;
  });
  for (std::size_t cell = 0; cell < sides.size(); ++cell) {
    if (problem.open[cell] == 0) continue;
    if ((problem.pull[cell] > 0) == (sides[cell] != 0)) cost += std::abs(problem.pull[cell]);
  }
  return cost;
}

}  // namespace zarn::app
