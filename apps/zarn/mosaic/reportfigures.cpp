// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/reportfigures.h"

#include <algorithm>
#include <cmath>

#include "apps/zarn/mosaic/balance.h"
#include "apps/zarn/mosaic/labellattice.h"

namespace zarn::app {
namespace {

constexpr std::size_t kBins = 64;

WindowSize LatticeOf(const Survey& survey) { return {survey.lattice.width, survey.lattice.height}; }

// Calls `visit(index in the scene, cell of the lattice)` with the cells in which a scene has data.
template <typename Visit>
void VisitValid(const Window& area, const std::vector<std::uint8_t>& valid, WindowSize lattice,
                const Visit& visit) {
  std::size_t index = 0;
  for (std::int64_t row = 0; row < area.height; ++row) {
    auto cell = static_cast<std::size_t>((area.y + row) * lattice.width + area.x);
    for (std::int64_t column = 0; column < area.width; ++column, ++index, ++cell) {
      if (valid[index] != 0) visit(index, cell);
    }
  }
}

// Whether the centres of the cells of `area` lie in a polygon, row by row.
std::vector<std::uint8_t> CentresWithin(const Polygon& polygon, const Window& area, int step) {
  std::vector<std::vector<double>> crossings(static_cast<std::size_t>(area.height));
  const std::vector<double>& v = polygon.vertices;
  for (std::size_t part = 0; part < polygon.starts.size(); ++part) {
    const auto begin = static_cast<std::size_t>(polygon.starts[part]);
    const std::size_t end = part + 1 < polygon.starts.size()
                                ? static_cast<std::size_t>(polygon.starts[part + 1])
                                : v.size() / 2;
    for (std::size_t i = begin; i < end; ++i) {
      const std::size_t next = i + 1 < end ? i + 1 : begin;
      const double x0 = v[2 * i];
      const double y0 = v[2 * i + 1] / step;
      const double y1 = v[2 * next + 1] / step;
      const double slope = (v[2 * next] - x0) / (y1 - y0);
      // Rows in whose middle the edge is, its lower end excluded.
      const double first = std::max(std::ceil(std::min(y0, y1) - 0.5), static_cast<double>(area.y));
      for (double row = first; row + 0.5 < std::max(y0, y1); ++row) {
        if (row >= static_cast<double>(area.y + area.height)) break;
        crossings[static_cast<std::size_t>(row) - static_cast<std::size_t>(area.y)].push_back(
            x0 + (row + 0.5 - y0) * slope);
      }
    }
  }
  std::vector<std::uint8_t> within;
  for (std::vector<double>& row : crossings) {
    std::sort(row.begin(), row.end());
    auto next = row.begin();
    for (std::int64_t column = 0; column < area.width; ++column) {
      const double centre = (static_cast<double>(area.x + column) + 0.5) * step;
      next = std::find_if(next, row.end(), [&](double x) { return x > centre; });
      within.push_back((next - row.begin()) % 2 == 0 ? 0 : 1);
    }
  }
  return within;
}

/// Sums up values about the first of them, so that nothing is lost where they are large.
class Moments {
 public:
  void Add(double value) {
    if (count_ == 0) first_ = value;
    ++count_;
    sum_ += value - first_;
    squares_ += (value - first_) * (value - first_);
  }
  void Add(const Moments& other) {
    if (other.count_ == 0) return;
    if (count_ == 0) first_ = other.first_;
    const auto count = static_cast<double>(other.count_);
    const double shift = other.first_ - first_;
    count_ += other.count_;
    squares_ += other.squares_ + 2 * shift * other.sum_ + count * shift * shift;
    sum_ += other.sum_ + count * shift;
  }
  std::int64_t Count() const { return count_; }
  double Mean() const { return count_ > 0 ? first_ + sum_ / static_cast<double>(count_) : 0; }
  double Deviation() const {
    if (count_ == 0) return 0;
    const auto count = static_cast<double>(count_);
    return std::sqrt(std::max(0.0, squares_ / count - sum_ / count * (sum_ / count)));
  }

 private:
  std::int64_t count_ = 0;
  double first_ = 0;
  double sum_ = 0;
  double squares_ = 0;
};

std::vector<SceneView> ViewsOf(const Planning& planning, bool corrected) {
  std::vector<SceneView> views;
  views.reserve(planning.plan.scenes.size());
  for (std::size_t i = 0; i < planning.plan.scenes.size(); ++i) {
    views.push_back(ViewOf(*planning.survey, i, corrected ? &planning.plan.scenes[i] : nullptr));
  }
  return views;
}

// How many scenes have data in each cell of the lattice.
std::vector<std::uint32_t> ScenesPerCell(const Survey& survey) {
  const WindowSize lattice = LatticeOf(survey);
  std::vector<std::uint32_t> counts(static_cast<std::size_t>(lattice.width * lattice.height));
  for (const SurveyedScene& scene : survey.scenes) {
    VisitValid(scene.area, scene.valid, lattice,
               [&](std::size_t, std::size_t cell) { ++counts[cell]; });
  }
  return counts;
}

// Calls `use(value, cell)` with the values of a scene that others share.
template <typename Use>
void VisitCommon(const SceneView& view, std::size_t band, WindowSize lattice,
                 const std::vector<std::uint32_t>& counts, const Use& use) {
  VisitValid(view.area, view.valid, lattice, [&](std::size_t index, std::size_t cell) {
    if (counts[cell] < 2) return;
    const auto value = static_cast<double>(view.colours[index * view.channels + band]);
    if (std::isfinite(value)) use(value, cell);
  });
}

Agreement Measure(const std::vector<SceneView>& views, WindowSize lattice,
                  const std::vector<std::uint32_t>& shown, const std::vector<std::uint32_t>& counts,
                  std::vector<Moments>& pooled) {
  Agreement agreement;
  agreement.seams = SeamResiduals(shown, lattice, views);
  agreement.scenes.assign(views.size(), std::vector<CommonValues>(pooled.size()));
  for (std::size_t band = 0; band < pooled.size(); ++band) {
    std::vector<double> sums(counts.size());
    for (const SceneView& view : views) {
      VisitCommon(view, band, lattice, counts,
                  [&](double value, std::size_t cell) { sums[cell] += value; });
    }
    for (std::size_t i = 0; i < views.size(); ++i) {
      Moments own;
      Moments others;
      VisitCommon(views[i], band, lattice, counts, [&](double value, std::size_t cell) {
        own.Add(value);
        others.Add((sums[cell] - value) / (counts[cell] - 1));
      });
      agreement.scenes[i][band] = {.count = own.Count(),
                                   .mean = own.Mean(),
                                   .deviation = own.Deviation(),
                                   .othersMean = others.Mean(),
                                   .bins = {}};
      pooled[band].Add(own);
    }
  }
  return agreement;
}

void FillBins(const std::vector<SceneView>& views, WindowSize lattice,
              const std::vector<std::uint32_t>& counts, const std::vector<HistogramAxis>& axes,
              Agreement& agreement) {
  for (std::size_t i = 0; i < views.size(); ++i) {
    for (std::size_t band = 0; band < axes.size(); ++band) {
      const HistogramAxis& axis = axes[band];
      std::vector<std::int64_t>& bins = agreement.scenes[i][band].bins;
      bins.assign(axis.bins, 0);
      VisitCommon(views[i], band, lattice, counts, [&](double value, std::size_t) {
        const double bin = (value - axis.begin) / axis.width;
        if (bin >= 0 && bin < static_cast<double>(axis.bins)) ++bins[static_cast<std::size_t>(bin)];
      });
    }
  }
}

// Three deviations about the mean. Bins of whole numbers are whole numbers wide, as some would
// else hold one number more than others.
HistogramAxis AxisFor(const Moments& pooled, bool isInteger) {
  const double reach = std::max(3 * pooled.Deviation(), 1e-6 * std::abs(pooled.Mean()) + 1e-12);
  HistogramAxis axis{.begin = pooled.Mean() - reach,
                     .width = 2 * reach / static_cast<double>(kBins),
                     .bins = kBins,
                     .decimals = 0};
  if (isInteger) {
    axis.width = std::ceil(axis.width);
    axis.begin = std::floor(axis.begin) - 0.5;
    axis.bins = static_cast<std::size_t>(std::ceil(2 * reach / axis.width)) + 1;
  }
  // Differences are looked at to a ten-thousandth of what there is to see, within reason.
  const double least = std::max(2 * reach, 0.01 * std::abs(pooled.Mean()));
  axis.decimals = static_cast<int>(std::clamp(4 - std::floor(std::log10(least)), 0.0, 12.0));
  return axis;
}

}  // namespace

std::vector<std::uint32_t> ShownScenes(const Planning& planning) {
  const Survey& survey = *planning.survey;
  const WindowSize lattice = LatticeOf(survey);
  std::vector<std::uint32_t> shown(static_cast<std::size_t>(lattice.width * lattice.height),
                                   kNoLabel);
  for (std::size_t i = 0; i < survey.scenes.size(); ++i) {
    const SurveyedScene& scene = survey.scenes[i];
    const auto label = static_cast<std::uint32_t>(i);
    const Polygon& cutline = planning.plan.scenes[i].cutline;
    // A seam may have left nothing of a scene.
    if (cutline.Empty() && !planning.labels.empty()) continue;
    const std::vector<std::uint8_t> within =
        cutline.Empty() ? scene.valid : CentresWithin(cutline, scene.area, survey.step);
    VisitValid(scene.area, scene.valid, lattice, [&](std::size_t index, std::size_t cell) {
      if (within[index] != 0) shown[cell] = label;
    });
  }
  if (!planning.plan.fillsGaps) return shown;
  for (std::size_t i = 0; i < survey.scenes.size(); ++i) {
    const SurveyedScene& scene = survey.scenes[i];
    VisitValid(scene.area, scene.valid, lattice, [&](std::size_t, std::size_t cell) {
      if (shown[cell] == kNoLabel) shown[cell] = static_cast<std::uint32_t>(i);
    });
  }
  return shown;
}

ReportFigures MeasureAgreement(const Planning& planning) {
  const Survey& survey = *planning.survey;
  const WindowSize lattice = LatticeOf(survey);
  const std::vector<std::uint32_t> shown = ShownScenes(planning);
  const std::vector<std::uint32_t> counts = ScenesPerCell(survey);
  std::vector<Moments> pooled(survey.channels);
  ReportFigures figures;
  // One state at a time: the values of all scenes take memory.
  figures.before = Measure(ViewsOf(planning, false), lattice, shown, counts, pooled);
  figures.after = Measure(ViewsOf(planning, true), lattice, shown, counts, pooled);
  const bool isInteger = GDALDataTypeIsInteger(survey.type.gdal) != 0;
  for (const Moments& band : pooled) figures.axes.push_back(AxisFor(band, isInteger));
  FillBins(ViewsOf(planning, false), lattice, counts, figures.axes, figures.before);
  FillBins(ViewsOf(planning, true), lattice, counts, figures.axes, figures.after);
  return figures;
}

}  // namespace zarn::app
