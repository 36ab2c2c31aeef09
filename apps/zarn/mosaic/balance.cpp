// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/balance.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <memory>
#include <numeric>
#include <type_traits>
#include <utility>

#include "apps/zarn/anysampletype.h"
#include "apps/zarn/estimate/dodgingfit.h"
#include "apps/zarn/estimate/gainoffsetnetwork.h"
#include "apps/zarn/estimate/sceneset.h"
#include "apps/zarn/progress.h"
#include "apps/zarn/windowgeometry.h"
#include "host/mosaic/griddodgingsurface.h"

namespace zarn::app {
namespace {

// Nodes of the surfaces along the longer side of a scene.
constexpr int kNodes = 8;
// Fits of the surfaces, each onto the means that the one before has left. The second one mends what
// scenes have in common with more than one other; later ones change next to nothing.
constexpr int kRounds = 3;

/// A correction as a function, at pixels of the lattice of the survey or of the mosaic.
class Correction {
 public:
  explicit Correction(const ScenePlan& scene) : gains_(scene.gains), offsets_(scene.offsets) {
    if (scene.dodging) Set(*scene.dodging);
  }

  void Set(const DodgingPlan& dodging) {
    pivots_ = dodging.pivots;
    gainSurface_ = std::make_unique<GridDodgingSurface>(dodging.gains);
    offsetSurface_ = std::make_unique<GridDodgingSurface>(dodging.offsets);
    gain_.resize(pivots_.size());
    offset_.resize(pivots_.size());
  }

  /// In place, the channels of a pixel.
  template <typename T>
  void operator()(unsigned column, unsigned row, T* values) {
    if (gainSurface_) {
      gainSurface_->GetBilinearValue(column, row, gain_.data());
      offsetSurface_->GetBilinearValue(column, row, offset_.data());
      for (std::size_t c = 0; c < pivots_.size(); ++c) {
        values[c] = static_cast<T>((static_cast<double>(values[c]) - pivots_[c]) *
                                       static_cast<double>(gain_[c]) +
                                   pivots_[c] + static_cast<double>(offset_[c]));
      }
      return;
    }
    for (std::size_t c = 0; c < gains_.size(); ++c) {
      values[c] = static_cast<T>(static_cast<double>(values[c]) * gains_[c] + offsets_[c]);
    }
  }

 private:
  std::vector<double> gains_;
  std::vector<double> offsets_;
  std::vector<double> pivots_;
  std::unique_ptr<GridDodgingSurface> gainSurface_;
  std::unique_ptr<GridDodgingSurface> offsetSurface_;
  std::vector<float> gain_;
  std::vector<float> offset_;
};

// Nodes in pixels of a surveyed scene, as pixels of the mosaic.
DodgingGrid OnMosaic(DodgingGrid grid, const Survey& survey, const Window& area) {
  const auto place = [&](double node, std::int64_t first) {
    return (node + 0.5 + static_cast<double>(first)) * survey.step - 0.5;
  };
  grid.originX = place(grid.originX, area.x);
  grid.originY = place(grid.originY, area.y);
  grid.stepX *= survey.step;
  grid.stepY *= survey.step;
  return grid;
}

/// The scenes of a survey as a set of which the anchor comes first.
class Network {
 public:
  Network(const Survey& survey, std::size_t anchor)
      : survey_(survey), order_(survey.scenes.size()) {
    std::iota(order_.begin(), order_.end(), std::size_t{0});
    std::rotate(order_.begin(), order_.begin() + static_cast<std::ptrdiff_t>(anchor),
                order_.begin() + static_cast<std::ptrdiff_t>(anchor) + 1);
    std::vector<RasterSource> rasters;
    for (const std::size_t scene : order_) rasters.push_back(survey.Raster(scene));
    set_ = std::make_unique<SceneSet>(std::move(rasters), "");
    SilentProgress silent;
    set_->Measure(0, silent);
  }

  void SolveGainOffsets(std::vector<ScenePlan>& scenes) const {
    const std::vector<SceneOverlap> overlaps = FindOverlaps(*set_);
    RequireTied(*set_, overlaps, "leave them out, or use --balance none");
    const auto corrections =
        app::SolveGainOffsets(order_.size(), overlaps, survey_.channels, GainLimits{});
    for (std::size_t i = 1; i < order_.size(); ++i) {
      ScenePlan& scene = scenes[order_[i]];
      for (const GainOffset& correction : corrections[i]) {
        scene.gains.push_back(correction.gain);
        scene.offsets.push_back(correction.offset);
      }
    }
  }

  // Onto the first one, a reference image.
  void FitOntoReference(std::vector<ScenePlan>& scenes) const {
    const std::vector<std::vector<double>> targets =
        Targets(1, [&](std::size_t, const auto& cell, double* values) {
          std::copy_n(cell.values, survey_.channels, values);
        });
    for (std::size_t i = 1; i < order_.size(); ++i) {
      Fit(Pairs(targets[i], i, {}), i, GainLimits{}, scenes[order_[i]]);
    }
  }

  // Onto the means of all that have data. Contrast stays as the gains have it: a scene shares
  // itself with those means, so a regression on them would flatten it.
  // With `holdsFirst` the first one stays as it is, and rules where it has data.
  void FitOntoEachOther(bool holdsFirst, std::vector<ScenePlan>& scenes) const {
    std::vector<ScenePlan> before;
    for (const std::size_t scene : order_) {
      ScenePlan plan = scenes[scene];
      if (plan.gains.empty()) {
        plan.gains.assign(survey_.channels, 1.0);
        plan.offsets.assign(survey_.channels, 0.0);
      }
      before.push_back(std::move(plan));
    }
    constexpr double kFirm = 1e12;
    std::vector<Correction> corrections;
    corrections.reserve(before.size());
    for (const ScenePlan& plan : before) corrections.emplace_back(plan);
    for (int round = 0; round < kRounds; ++round) {
      std::vector<std::vector<double>> targets =
          Targets(order_.size(), [&](std::size_t scene, const Cell& cell, double* values) {
            Correct(corrections[scene], cell, values);
          });
      for (std::size_t i = holdsFirst ? 1 : 0; i < order_.size(); ++i) {
        if (holdsFirst) LetFirstRule(i, targets[i]);
        Correction balanced(before[i]);
        std::vector<double> values;
        VisitCells(i, [&](const Cell& cell) {
          const std::size_t at = values.size();
          values.resize(at + survey_.channels);
          if (!std::isnan(targets[i][at])) Correct(balanced, cell, &values[at]);
        });
        ScenePlan& scene = scenes[order_[i]];
        Fit(Pairs(targets[i], i, values), i, {.damping = kFirm, .contrast = 0}, scene);
        if (!scene.dodging) continue;
        AddGains(before[i], *scene.dodging);
        corrections[i].Set(*scene.dodging);
      }
    }
  }

 private:
  struct Cell {
    std::int64_t column;
    std::int64_t row;
    const double* values;  ///< per channel
  };

  // Calls `use` with all cells of a scene that have data.
  template <typename Use>
  void VisitCells(std::size_t scene, const Use& use) const {
    const CellMeans& cells = set_->Cells(scene);
    for (std::int64_t row = cells.FirstRow(); row < cells.FirstRow() + cells.Rows(); ++row) {
      for (std::int64_t column = cells.FirstColumn();
           column < cells.FirstColumn() + cells.Columns(); ++column) {
        const double* const values = cells.At(column, row);
        if (values != nullptr) use(Cell{column, row, values});
      }
    }
  }

  void Correct(Correction& correction, const Cell& cell, double* corrected) const {
    const CellLattice& lattice = set_->Cells(0).Lattice();
    const std::array<double, 6>& t = survey_.lattice.transform;
    // The mosaic's grid lies along the axes of its map.
    const double x = (lattice.CentreX(cell.column) - t[0]) / t[1] * survey_.step;
    const double y = (lattice.CentreY(cell.row) - t[3]) / t[5] * survey_.step;
    std::copy_n(cell.values, survey_.channels, corrected);
    correction(static_cast<unsigned>(std::max(0.0, x)), static_cast<unsigned>(std::max(0.0, y)),
               corrected);
  }

  /// Means over scenes, by cell, where there are at least so many.
  class Means {
   public:
    Means(const Window& cells, std::size_t channels, int least)
        : cells_(cells),
          channels_(channels),
          least_(least),
          sums_(static_cast<std::size_t>(cells.width * cells.height) * channels),
          counts_(static_cast<std::size_t>(cells.width * cells.height)) {}

    // All cells are counted before the first value is added.
    void Count(const Cell& cell) { ++counts_[PlaceOf(cell)]; }
    bool Wants(const Cell& cell) const {
      return Meet({cell.column, cell.row, 1, 1}, cells_) && counts_[PlaceOf(cell)] >= least_;
    }
    void Add(const Cell& cell, const double* values) {
      double* const sums = &sums_[PlaceOf(cell) * channels_];
      for (std::size_t c = 0; c < channels_; ++c) sums[c] += values[c];
    }
    void Get(const Cell& cell, double* means) const {
      const bool known = Wants(cell);
      for (std::size_t c = 0; c < channels_; ++c) {
        means[c] = known ? sums_[PlaceOf(cell) * channels_ + c] / counts_[PlaceOf(cell)]
                         : std::numeric_limits<double>::quiet_NaN();
      }
    }

   private:
    std::size_t PlaceOf(const Cell& cell) const {
      return static_cast<std::size_t>((cell.row - cells_.y) * cells_.width + cell.column -
                                      cells_.x);
    }

    Window cells_;
    std::size_t channels_;
    int least_;
    std::vector<double> sums_;
    std::vector<int> counts_;
  };

  // The cells that the first `count` scenes lie in.
  Window CellsOf(std::size_t count) const {
    Window all;
    for (std::size_t i = 0; i < count; ++i) {
      const CellMeans& cells = set_->Cells(i);
      all = Union(all, {cells.FirstColumn(), cells.FirstRow(), cells.Columns(), cells.Rows()});
    }
    return all;
  }

  // What the scenes are to become, per scene the cells one after the other, [cell][channel]: the
  // mean of what the first `count` scenes are there by `value`, NaN where there is only one of
  // several.
  template <typename Value>
  std::vector<std::vector<double>> Targets(std::size_t count, const Value& value) const {
    const std::size_t channels = survey_.channels;
    Means means(CellsOf(count), channels, count == 1 ? 1 : 2);
    for (std::size_t i = 0; i < count; ++i) {
      VisitCells(i, [&](const Cell& cell) { means.Count(cell); });
    }
    std::vector<double> values(channels);
    for (std::size_t i = 0; i < count; ++i) {
      VisitCells(i, [&](const Cell& cell) {
        if (!means.Wants(cell)) return;
        value(i, cell, values.data());
        means.Add(cell, values.data());
      });
    }
    std::vector<std::vector<double>> targets(order_.size());
    for (std::size_t i = 0; i < order_.size(); ++i) {
      VisitCells(i, [&](const Cell& cell) {
        targets[i].resize(targets[i].size() + channels);
        means.Get(cell, targets[i].data() + targets[i].size() - channels);
      });
    }
    return targets;
  }

  void LetFirstRule(std::size_t scene, std::vector<double>& targets) const {
    double* target = targets.data();
    VisitCells(scene, [&](const Cell& cell) {
      const double* const first = set_->Cells(0).At(cell.column, cell.row);
      if (first != nullptr) std::copy_n(first, survey_.channels, target);
      target += survey_.channels;
    });
  }

  // The cells of a scene that have targets; their values are `values`, or where that is empty those
  // of the survey. Both are as `Targets` has them and must outlive the pairs.
  std::vector<CellPair> Pairs(const std::vector<double>& targets, std::size_t scene,
                              const std::vector<double>& values) const {
    std::vector<CellPair> pairs;
    const CellLattice& lattice = set_->Cells(scene).Lattice();
    std::size_t i = 0;
    VisitCells(scene, [&](const Cell& cell) {
      if (!std::isnan(targets[i])) {
        pairs.push_back({lattice.CentreX(cell.column), lattice.CentreY(cell.row), &targets[i],
                         values.empty() ? cell.values : &values[i]});
      }
      i += survey_.channels;
    });
    return pairs;
  }

  // Leaves a scene without surfaces that has too little in common with others.
  void Fit(const std::vector<CellPair>& cells, std::size_t scene, const GainLimits& limits,
           ScenePlan& plan) const {
    if (cells.size() < kLeastCommonCells) return;
    const Ground& ground = set_->Grounds()[scene];
    const DodgingFit fit =
        FitDodging(cells, ground, LayGrid(ground.Size(), survey_.channels, kNodes), limits);
    const Window& area = survey_.scenes[order_[scene]].area;
    plan.dodging = DodgingPlan{fit.pivots, OnMosaic(fit.gains, survey_, area),
                               OnMosaic(fit.offsets, survey_, area)};
  }

  // Offsets that were fitted after gain and offset, as surfaces that hold both:
  // v g + o + d = (v - p) g + p + (p g - p + o + d).
  static void AddGains(const ScenePlan& before, DodgingPlan& dodging) {
    const std::size_t channels = dodging.pivots.size();
    for (std::size_t i = 0; i < dodging.offsets.values.size(); ++i) {
      const std::size_t c = i % channels;
      const double pivot = dodging.pivots[c];
      const double offset = pivot * before.gains[c] - pivot + before.offsets[c];
      dodging.offsets.values[i] =
          static_cast<float>(offset + static_cast<double>(dodging.offsets.values[i]));
    }
    // A gain that is the same everywhere is a surface of one node.
    dodging.gains.columns = 1;
    dodging.gains.rows = 1;
    dodging.gains.values.assign(before.gains.begin(), before.gains.end());
  }

  const Survey& survey_;
  std::vector<std::size_t> order_;
  std::unique_ptr<SceneSet> set_;
};

}  // namespace

void Balance(BalanceKind kind, const Survey& survey, std::size_t anchor, bool holdsAnchor,
             std::vector<ScenePlan>& scenes) {
  if (kind == BalanceKind::kNone) return;
  const Network network(survey, anchor);
  network.SolveGainOffsets(scenes);
  if (kind != BalanceKind::kDodging) return;
  if (anchor >= scenes.size()) {
    network.FitOntoReference(scenes);
  } else {
    network.FitOntoEachOther(holdsAnchor, scenes);
  }
}

SceneView ViewOf(const Survey& survey, std::size_t index, const ScenePlan* scene) {
  const SurveyedScene& surveyed = survey.scenes[index];
  SceneView view{surveyed.area, survey.channels, {}, surveyed.valid};
  const std::size_t count = surveyed.valid.size() * survey.channels;
  view.colours.resize(count);
  VisitAnySampleType(survey.type.code, [&]<typename T>(std::type_identity<T>, std::size_t parts) {
    const T* const samples = reinterpret_cast<const T*>(surveyed.samples.data());
    for (std::size_t i = 0; i < count; ++i) {
      view.colours[i] = static_cast<float>(samples[i * parts]);
    }
  });
  if (scene == nullptr) return view;
  Correction correct(*scene);
  float* colour = view.colours.data();
  const auto centre = [&](std::int64_t cell) {
    return static_cast<unsigned>(cell * survey.step + survey.step / 2);
  };
  for (std::int64_t row = 0; row < surveyed.area.height; ++row) {
    for (std::int64_t column = 0; column < surveyed.area.width; ++column) {
      correct(centre(column + surveyed.area.x), centre(row + surveyed.area.y), colour);
      colour += survey.channels;
    }
  }
  return view;
}

}  // namespace zarn::app
