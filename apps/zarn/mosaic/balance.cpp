// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/balance.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <map>
#include <memory>
#include <numeric>
#include <type_traits>
#include <utility>

#include "apps/zarn/anysampletype.h"
#include "apps/zarn/estimate/dodgingfit.h"
#include "apps/zarn/estimate/gainoffsetnetwork.h"
#include "apps/zarn/estimate/sceneset.h"
#include "apps/zarn/progress.h"
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

  void FitSurfaces(std::vector<ScenePlan>& scenes) const {
    const bool hasReference = order_.front() >= scenes.size();
    std::vector<Correction> corrections;
    for (const std::size_t scene : order_) {
      corrections.emplace_back(scene < scenes.size() ? scenes[scene] : ScenePlan{});
    }
    for (int round = 0; round < (hasReference ? 1 : kRounds); ++round) {
      const std::vector<std::vector<double>> means = Targets(corrections, hasReference);
      for (std::size_t i = hasReference ? 1 : 0; i < order_.size(); ++i) {
        const std::vector<CellPair> cells = CellsOnto(means[i], i);
        if (cells.size() < kLeastCommonCells) continue;
        const Ground& ground = set_->Grounds()[i];
        const DodgingFit fit = FitDodging(
            cells, ground, LayGrid(ground.Size(), survey_.channels, kNodes), GainLimits{});
        const Window& area = survey_.scenes[order_[i]].area;
        scenes[order_[i]].dodging = DodgingPlan{fit.pivots, OnMosaic(fit.gains, survey_, area),
                                                OnMosaic(fit.offsets, survey_, area)};
      }
      for (std::size_t i = hasReference ? 1 : 0; i < order_.size(); ++i) {
        const std::optional<DodgingPlan>& dodging = scenes[order_[i]].dodging;
        if (dodging) corrections[i].Set(*dodging);
      }
    }
  }

 private:
  // Calls `use` with all cells of a scene that have data.
  template <typename Use>
  void VisitCells(std::size_t scene, const Use& use) const {
    const CellMeans& cells = set_->Cells(scene);
    for (std::int64_t row = cells.FirstRow(); row < cells.FirstRow() + cells.Rows(); ++row) {
      for (std::int64_t column = cells.FirstColumn();
           column < cells.FirstColumn() + cells.Columns(); ++column) {
        const double* const values = cells.At(column, row);
        if (values != nullptr) use(column, row, values);
      }
    }
  }

  std::vector<double> Corrected(Correction& correction, std::int64_t column, std::int64_t row,
                                const double* values) const {
    const CellLattice& lattice = set_->Cells(0).Lattice();
    const std::array<double, 6>& t = survey_.lattice.transform;
    // The mosaic's grid lies along the axes of its map.
    const double x = (lattice.CentreX(column) - t[0]) / t[1] * survey_.step;
    const double y = (lattice.CentreY(row) - t[3]) / t[5] * survey_.step;
    std::vector<double> corrected(values, values + survey_.channels);
    correction(static_cast<unsigned>(std::max(0.0, x)), static_cast<unsigned>(std::max(0.0, y)),
               corrected.data());
    return corrected;
  }

  // What each scene is to become: per scene the cells one after the other, [cell][channel], NaN
  // where it is alone.
  std::vector<std::vector<double>> Targets(std::vector<Correction>& corrections,
                                           bool hasReference) const;
  std::vector<CellPair> CellsOnto(const std::vector<double>& targets, std::size_t scene) const;

  const Survey& survey_;
  std::vector<std::size_t> order_;
  std::unique_ptr<SceneSet> set_;
};

std::vector<std::vector<double>> Network::Targets(std::vector<Correction>& corrections,
                                                  bool hasReference) const {
  struct Sum {
    std::vector<double> values;
    int count = 0;
  };
  std::map<std::pair<std::int64_t, std::int64_t>, Sum> sums;
  const std::size_t contributors = hasReference ? 1 : order_.size();
  for (std::size_t i = 0; i < contributors; ++i) {
    VisitCells(i, [&](std::int64_t column, std::int64_t row, const double* values) {
      Sum& sum = sums[{row, column}];
      const std::vector<double> corrected = Corrected(corrections[i], column, row, values);
      sum.values.resize(corrected.size());
      for (std::size_t c = 0; c < corrected.size(); ++c) sum.values[c] += corrected[c];
      ++sum.count;
    });
  }
  const int least = hasReference ? 1 : 2;
  std::vector<std::vector<double>> targets(order_.size());
  for (std::size_t i = 0; i < order_.size(); ++i) {
    VisitCells(i, [&](std::int64_t column, std::int64_t row, const double*) {
      const auto found = sums.find({row, column});
      const bool known = found != sums.end() && found->second.count >= least;
      for (std::size_t c = 0; c < survey_.channels; ++c) {
        targets[i].push_back(known ? found->second.values[c] / found->second.count
                                   : std::numeric_limits<double>::quiet_NaN());
      }
    });
  }
  return targets;
}

std::vector<CellPair> Network::CellsOnto(const std::vector<double>& targets,
                                         std::size_t scene) const {
  std::vector<CellPair> pairs;
  const CellLattice& lattice = set_->Cells(scene).Lattice();
  const double* target = targets.data();
  VisitCells(scene, [&](std::int64_t column, std::int64_t row, const double* values) {
    if (!std::isnan(*target)) {
      pairs.push_back({lattice.CentreX(column), lattice.CentreY(row), target, values});
    }
    target += survey_.channels;
  });
  return pairs;
}

}  // namespace

void Balance(BalanceKind kind, const Survey& survey, std::size_t anchor,
             std::vector<ScenePlan>& scenes) {
  if (kind == BalanceKind::kNone) return;
  const Network network(survey, anchor);
  network.SolveGainOffsets(scenes);
  if (kind == BalanceKind::kDodging) network.FitSurfaces(scenes);
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
