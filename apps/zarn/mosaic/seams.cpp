// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/seams.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <map>
#include <utility>

#include "apps/zarn/mosaic/gridcut.h"
#include "apps/zarn/mosaic/labellattice.h"

namespace zarn::app {
namespace {

// Costs of a unit of the seam, in median differences.
constexpr double kMostDifference = 16;  // what differs more (a roof, a cloud) differs wholly
constexpr double kStep = 0.25;
constexpr double kAtEdge = 8;  // where the common area ends; a quarter of it `feather` + 1 cells in
constexpr double kBesideOther = 32;

// In the whole numbers of the cut.
constexpr double kUnit = 256;
constexpr std::int32_t kNever = 1 << 27;

std::int32_t Rounded(double cost) {
  return static_cast<std::int32_t>(kUnit * cost + (cost < 0 ? -0.5 : 0.5));
}

// What a link stands for of the length of a seam, so that seams in any direction cost their length
// to a few percent (Y. Boykov, V. Kolmogorov: Computing Geodesics and Minimal Surfaces via Graph
// Cuts, 2003).
constexpr double kSideLength = 0.3926990816987241;    // pi / 8
constexpr double kCornerLength = 0.2776801836348979;  // pi / (8 sqrt(2))

constexpr double LengthOf(std::int64_t dx, std::int64_t dy) {
  return dx != 0 && dy != 0 ? kCornerLength : kSideLength;
}

bool IsIn(const Window& window, std::int64_t x, std::int64_t y) {
  return x >= window.x && y >= window.y && x < window.x + window.width &&
         y < window.y + window.height;
}

std::size_t CellIn(const Window& window, std::int64_t x, std::int64_t y) {
  return static_cast<std::size_t>((y - window.y) * window.width + x - window.x);
}

bool IsValid(const SceneView& scene, std::int64_t x, std::int64_t y) {
  return IsIn(scene.area, x, y) && scene.valid[CellIn(scene.area, x, y)] != 0;
}

const float* ColourAt(const SceneView& scene, std::int64_t x, std::int64_t y) {
  return scene.colours.data() + CellIn(scene.area, x, y) * scene.channels;
}

Window GrownByOne(const Window& area, WindowSize lattice) {
  const std::int64_t x = std::max<std::int64_t>(area.x - 1, 0);
  const std::int64_t y = std::max<std::int64_t>(area.y - 1, 0);
  return {x, y, std::min(area.x + area.width + 1, lattice.width) - x,
          std::min(area.y + area.height + 1, lattice.height) - y};
}

/// Brings one scene into the mosaic so far.
class Insertion {
 public:
  Insertion(const std::vector<SceneView>& scenes, std::size_t index, WindowSize lattice,
            const SeamOptions& options, std::vector<std::uint32_t>& labels,
            std::vector<std::size_t>& cellsOf)
      : scenes_(scenes),
        index_(static_cast<std::uint32_t>(index)),
        scene_(scenes[index]),
        lattice_(lattice),
        window_(GrownByOne(scene_.area, lattice)),
        options_(options),
        labels_(labels),
        cellsOf_(cellsOf) {}

  void Run() {
    Sort();
    std::vector<std::uint8_t> taken(kinds_.size());
    if (common_ > 0) taken = MinimumCut(Problem(), options_.exactCells);
    ForEachCell([&](std::size_t cell, std::int64_t x, std::int64_t y) {
      if (kinds_[cell] != kNew && taken[cell] == 0) return;
      std::uint32_t& label = labels_[CellIn(Lattice(), x, y)];
      if (label != kNoLabel) --cellsOf_[label];
      label = index_;
      ++cellsOf_[index_];
    });
  }

 private:
  enum Kind : std::uint8_t { kEmpty, kOld, kNew, kCommon };

  Window Lattice() const { return {0, 0, lattice_.width, lattice_.height}; }
  std::uint32_t LabelAt(std::int64_t x, std::int64_t y) const {
    return labels_[CellIn(Lattice(), x, y)];
  }

  template <typename Visit>
  void ForEachCell(const Visit& visit) const {
    std::size_t cell = 0;
    for (std::int64_t y = window_.y; y < window_.y + window_.height; ++y) {
      for (std::int64_t x = window_.x; x < window_.x + window_.width; ++x) visit(cell++, x, y);
    }
  }

  void Sort() {
    kinds_.resize(static_cast<std::size_t>(window_.width * window_.height));
    ForEachCell([&](std::size_t cell, std::int64_t x, std::int64_t y) {
      const bool old = LabelAt(x, y) != kNoLabel;
      const bool fresh = IsValid(scene_, x, y);
      kinds_[cell] = old && fresh ? kCommon : old ? kOld : fresh ? kNew : kEmpty;
      if (kinds_[cell] == kCommon) ++common_;
      if (kinds_[cell] == kNew) ++own_;
    });
  }

  // The difference between the mosaic and the new scene, per channel.
  float Difference(std::int64_t x, std::int64_t y, std::size_t channel) const {
    const float a = ColourAt(scenes_[LabelAt(x, y)], x, y)[channel];
    const float b = ColourAt(scene_, x, y)[channel];
    return std::abs(a - b);
  }

  // What a channel usually differs by; where most of it does not differ, the mean; 0 where nothing
  // does.
  std::vector<double> UsualDifferences() const {
    constexpr std::size_t kEnough = 1 << 16;
    const std::size_t every = common_ / kEnough + 1;
    std::vector<std::vector<float>> samples(scene_.channels);
    std::size_t count = 0;
    ForEachCell([&](std::size_t cell, std::int64_t x, std::int64_t y) {
      if (kinds_[cell] != kCommon || count++ % every != 0) return;
      for (std::size_t c = 0; c < samples.size(); ++c) {
        const float difference = Difference(x, y, c);
        if (std::isfinite(difference)) samples[c].push_back(difference);
      }
    });
    std::vector<double> usual;
    for (std::vector<float>& sample : samples) {
      usual.push_back(0);
      if (sample.empty()) continue;
      const auto middle = sample.begin() + static_cast<std::ptrdiff_t>(sample.size() / 2);
      std::nth_element(sample.begin(), middle, sample.end());
      usual.back() = *middle;
      if (usual.back() > 0) continue;
      double sum = 0;
      for (const float difference : sample) sum += difference;
      usual.back() = sum / static_cast<double>(sample.size());
    }
    return usual;
  }

  // What a unit of a seam costs that passes the cell, per common cell of the window.
  std::vector<float> CellCosts(const std::vector<std::int32_t>& distance) const {
    const std::vector<double> usual = UsualDifferences();
    const double room = std::max(options_.feather, 1.0) + 1;
    std::vector<float> costs(kinds_.size());
    ForEachCell([&](std::size_t cell, std::int64_t x, std::int64_t y) {
      if (kinds_[cell] != kCommon) return;
      double sum = 0;
      for (std::size_t c = 0; c < usual.size(); ++c) {
        const double difference = Difference(x, y, c);
        if (difference == 0) continue;
        const double share = usual[c] > 0 ? difference / usual[c] : kMostDifference;
        // (so also where it is NaN)
        sum += share < kMostDifference ? share : kMostDifference;
      }
      const double inside = distance[cell] / 5.0 - 0.5;
      const double nearness = room / (room + inside);
      costs[cell] =
          static_cast<float>(sum / static_cast<double>(std::max<std::size_t>(usual.size(), 1)) +
                             kStep + kAtEdge * nearness * nearness);
    });
    return costs;
  }

  CutProblem Problem() const {
    std::vector<std::uint8_t> isCommon(kinds_.size());
    for (std::size_t i = 0; i < kinds_.size(); ++i) isCommon[i] = kinds_[i] == kCommon ? 1 : 0;
    const WindowSize size{window_.width, window_.height};
    const std::vector<std::int32_t> distance = DistanceToUnmarked(isCommon, size);
    const std::vector<float> costs = CellCosts(distance);
    CutProblem problem(size);
    problem.open = std::move(isCommon);
    ForEachCell([&](std::size_t cell, std::int64_t x, std::int64_t y) {
      if (kinds_[cell] != kCommon) return;
      double pull = 0;
      for (std::int64_t dy = -1; dy <= 1; ++dy) {
        for (std::int64_t dx = -1; dx <= 1; ++dx) {
          if (!IsIn(window_, x + dx, y + dy)) continue;
          const std::size_t other = CellIn(window_, x + dx, y + dy);
          const double beside = LengthOf(dx, dy) * (kBesideOther + costs[cell]);
          if (kinds_[other] == kOld) pull += beside;
          if (kinds_[other] == kNew) pull -= beside;
          const bool isForward = dy > 0 || (dy == 0 && dx > 0);
          if (kinds_[other] != kCommon || !isForward) continue;
          const auto link =
              dy == 0 ? CutProblem::kEast : static_cast<CutProblem::Link>(CutProblem::kSouth + dx);
          problem.links[cell][link] = Rounded(LengthOf(dx, dy) * (costs[cell] + costs[other]) / 2);
        }
      }
      problem.pull[cell] = Rounded(pull);
    });
    KeepCores(distance, problem);
    return problem;
  }

  // Nothing, or next to nothing, of a scene of `cells` cells.
  static bool IsHardly(std::size_t part, std::size_t cells) { return 100 * part < cells; }

  void KeepCores(const std::vector<std::int32_t>& distance, CutProblem& problem) const {
    if (IsHardly(own_, own_ + common_) && !HasTwin()) {
      const std::int32_t most = *std::max_element(distance.begin(), distance.end());
      for (std::size_t i = 0; i < kinds_.size(); ++i) {
        if (kinds_[i] == kCommon && 2 * distance[i] >= most) problem.pull[i] = -kNever;
      }
    }
    std::map<std::uint32_t, std::size_t> commonOf;
    ForEachCell([&](std::size_t cell, std::int64_t x, std::int64_t y) {
      if (kinds_[cell] == kCommon) ++commonOf[LabelAt(x, y)];
    });
    for (const auto& [label, cells] : commonOf) {
      if (IsHardly(cellsOf_[label] - cells, cellsOf_[label])) KeepCore(label, problem);
    }
  }

  // Whether an earlier scene has the same area, but for next to nothing.
  bool HasTwin() const {
    const std::size_t cells = own_ + common_;
    return std::any_of(scenes_.begin(), scenes_.begin() + index_, [&](const SceneView& other) {
      const auto ofOther = static_cast<std::size_t>(
          std::count_if(other.valid.begin(), other.valid.end(), [](auto valid) { return valid; }));
      std::size_t shared = 0;
      ForEachCell([&](std::size_t, std::int64_t x, std::int64_t y) {
        if (IsValid(scene_, x, y) && IsValid(other, x, y)) ++shared;
      });
      return IsHardly(cells + ofOther - 2 * shared, cells);
    });
  }

  void KeepCore(std::uint32_t label, CutProblem& problem) const {
    std::vector<std::uint8_t> part(kinds_.size());
    ForEachCell([&](std::size_t cell, std::int64_t x, std::int64_t y) {
      part[cell] = kinds_[cell] == kCommon && LabelAt(x, y) == label ? 1 : 0;
    });
    const auto distance = DistanceToUnmarked(part, {window_.width, window_.height});
    const std::int32_t half = *std::max_element(distance.begin(), distance.end()) / 2;
    const auto keep = [&](std::int32_t least, bool evenOfNewCore) {
      bool keepsSome = false;
      for (std::size_t i = 0; i < part.size(); ++i) {
        if (part[i] == 0 || distance[i] < least) continue;
        if (problem.pull[i] == -kNever && !evenOfNewCore) continue;
        problem.pull[i] = kNever;
        keepsSome = true;
      }
      return keepsSome;
    };
    // What the core of the new scene leaves of this one, or of all the part. Where it leaves
    // nothing, this one is the smaller, and the new scene has room around it.
    if (!keep(half, false) && !keep(0, false)) keep(half, true);
  }

  const std::vector<SceneView>& scenes_;
  std::uint32_t index_;
  const SceneView& scene_;
  WindowSize lattice_;
  Window window_;  ///< of the new scene, with what borders on it
  const SeamOptions& options_;
  std::vector<std::uint32_t>& labels_;
  std::vector<std::size_t>& cellsOf_;  ///< how many cells show each scene
  std::vector<Kind> kinds_;
  std::size_t common_ = 0;
  std::size_t own_ = 0;
};

/// The seam between two scenes.
struct Seam {
  std::int64_t length = 0;
  std::vector<std::int64_t> cells;  ///< within 2 of it, in the order of rows
};
using Seams = std::map<std::pair<std::uint32_t, std::uint32_t>, Seam>;

Seams TraceSeams(const std::vector<std::uint32_t>& labels, WindowSize lattice) {
  Seams seams;
  const Window all{0, 0, lattice.width, lattice.height};
  const auto cross = [&](std::int64_t x, std::int64_t y, std::int64_t dx, std::int64_t dy) {
    if (!IsIn(all, x + dx, y + dy)) return;
    const std::uint32_t a = labels[CellIn(all, x, y)];
    const std::uint32_t b = labels[CellIn(all, x + dx, y + dy)];
    if (a == b || a == kNoLabel || b == kNoLabel) return;
    Seam& seam = seams[std::minmax(a, b)];
    ++seam.length;
    for (std::int64_t i = -1; i <= 2; ++i) {
      const std::int64_t cellX = x + i * dx;
      const std::int64_t cellY = y + i * dy;
      if (IsIn(all, cellX, cellY)) seam.cells.push_back(cellY * lattice.width + cellX);
    }
  };
  for (std::int64_t y = 0; y < lattice.height; ++y) {
    for (std::int64_t x = 0; x < lattice.width; ++x) {
      cross(x, y, 1, 0);
      cross(x, y, 0, 1);
    }
  }
  for (auto& [pair, seam] : seams) {
    std::sort(seam.cells.begin(), seam.cells.end());
    seam.cells.erase(std::unique(seam.cells.begin(), seam.cells.end()), seam.cells.end());
  }
  return seams;
}

}  // namespace

std::vector<std::uint32_t> FindSeams(const std::vector<SceneView>& scenes, WindowSize lattice,
                                     const SeamOptions& options, nspio::Counter& progress) {
  std::vector<std::uint32_t> labels(static_cast<std::size_t>(lattice.width * lattice.height),
                                    kNoLabel);
  std::vector<std::size_t> cellsOf(scenes.size());
  for (std::size_t i = 0; i < scenes.size(); ++i) {
    Insertion(scenes, i, lattice, options, labels, cellsOf).Run();
    progress.Update(static_cast<double>(i + 1) / static_cast<double>(scenes.size() + 1));
  }
  std::vector<std::uint8_t> hasData(labels.size());
  for (std::size_t i = 0; i < labels.size(); ++i) hasData[i] = labels[i] != kNoLabel ? 1 : 0;
  FillFromNearest(labels, lattice);
  const auto width = static_cast<std::size_t>(lattice.width);
  MergeIslands(labels, lattice, options.smallestIsland, [&](std::size_t cell, std::uint32_t label) {
    return hasData[cell] == 0 || IsValid(scenes[label], static_cast<std::int64_t>(cell % width),
                                         static_cast<std::int64_t>(cell / width));
  });
  progress.Update(1);
  return labels;
}

std::vector<SeamResidual> SeamResiduals(const std::vector<std::uint32_t>& labels,
                                        WindowSize lattice, const std::vector<SceneView>& scenes) {
  std::vector<SeamResidual> residuals;
  for (const auto& [pair, seam] : TraceSeams(labels, lattice)) {
    const SceneView& first = scenes[pair.first];
    const SceneView& second = scenes[pair.second];
    SeamResidual residual{pair.first, pair.second, seam.length, 0, {}, {}};
    residual.meanDifference.resize(first.channels);
    residual.rootMeanSquare.resize(first.channels);
    for (const std::int64_t cell : seam.cells) {
      const std::int64_t x = cell % lattice.width;
      const std::int64_t y = cell / lattice.width;
      if (!IsValid(first, x, y) || !IsValid(second, x, y)) continue;
      ++residual.cells;
      for (std::size_t c = 0; c < first.channels; ++c) {
        const double difference =
            static_cast<double>(ColourAt(second, x, y)[c]) - ColourAt(first, x, y)[c];
        residual.meanDifference[c] += difference;
        residual.rootMeanSquare[c] += difference * difference;
      }
    }
    const auto cells = static_cast<double>(std::max<std::int64_t>(residual.cells, 1));
    for (double& mean : residual.meanDifference) mean /= cells;
    for (double& square : residual.rootMeanSquare) square = std::sqrt(square / cells);
    residuals.push_back(std::move(residual));
  }
  return residuals;
}

}  // namespace zarn::app
