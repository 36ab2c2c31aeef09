// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/scenefeed.h"

#include <utility>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/interpolation.h"
#include "apps/zarn/sourcelocator.h"
#include "apps/zarn/streamer.h"
#include "apps/zarn/wholepixels.h"
#include "processes/filters/factories/averagefilterfactory.h"
#include "processes/filters/factories/dodgingcbfactory.h"
#include "processes/filters/factories/gainoffsetcbfactory.h"
#include "processes/filters/factories/hotspotnormfactory.h"
#include "processes/filters/factories/medianfilterfactory.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;

constexpr std::size_t kSurfaceBytes = std::size_t{64} << 20;

WindowFilter Owned(filters::IFilter* filter) {
  return OnWindows(std::unique_ptr<filters::IFilter>(filter), {});
}

WindowFilter MakeFilter(const SceneFilter& filter) {
  if (filter.name == "average") {
    return Owned(filters::AverageFilterFactory(filter.size).GetCPUFilter());
  }
  if (filter.name == "median") {
    return Owned(filters::MedianFilterFactory(filter.size).GetCPUFilter());
  }
  return {};
}

std::int64_t HaloOf(const SceneFilter& filter) { return filter.name.empty() ? 0 : filter.size / 2; }

}  // namespace

SceneFeed::SceneFeed(const ScenePlan& scene, const FeedRequest& request)
    : source_(scene.File()),
      noData_{.input = scene.noData, .output = {}},
      filter_(MakeFilter(request.filter)),
      surfaces_(kSurfaceBytes),
      reader_(source_, noData_,
              {.halo = HaloOf(request.filter),
               .marksNoData = true,
               .protectsInvalid = !request.filter.name.empty(),
               .preparesOutput = !request.filter.name.empty()}),
      mover_(source_, reader_,
             {.fill = {},
              .mostSourcePixels = request.mostSourcePixels,
              .prepare = [this](WindowBuffers& read) { return Prepare(read); }}) {
  MakeMover(scene, request);
  MakeCorrections(scene);
}

void SceneFeed::MakeMover(const ScenePlan& scene, const FeedRequest& request) {
  if (scene.place && request.isMosaic) {
    makeMover_ = [this, place = *scene.place] {
      return std::make_unique<WholePixels>(source_, static_cast<int>(-place.column),
                                           static_cast<int>(-place.row));
    };
    return;
  }
  const auto locator = std::make_shared<SourceLocator>(
      source_, request.grid.crs.IsEmpty() ? nullptr : &request.grid.crs, "");
  locator->SetGrid(request.grid);
  const auto field = std::make_shared<PositionField>(
      [locator](std::vector<double>& x, std::vector<double>& y) { locator->Locate(x, y); },
      request.threshold);
  makeMover_ = [this, field, method = MethodOf(request.resampling)] {
    return std::make_unique<Interpolation>(field, source_, method);
  };
}

void SceneFeed::MakeCorrections(const ScenePlan& scene) {
  if (!scene.hotSpot.empty()) {
    hotSpot_ =
        Owned(filters::HotSpotNormFactory(scene.hotSpot, static_cast<unsigned>(source_.Width()),
                                          static_cast<unsigned>(source_.Height()))
                  .GetCPUFilter());
  }
  if (scene.dodging) {
    const DodgingPlan& dodging = *scene.dodging;
    std::vector<MOSDodgingCoeffs> coefficients;
    for (const double pivot : dodging.pivots) coefficients.push_back({.d0 = pivot});
    const auto source = [&](const DodgingGrid& grid) {
      return std::make_unique<SurfaceCache::Source>(
          surfaces_, [grid] { return std::make_unique<GridDodgingSurface>(grid); });
    };
    gains_ = source(dodging.gains);
    offsets_ = source(dodging.offsets);
    balance_ = Owned(filters::DodgingCBFactory(coefficients, MOSDodgingType::kScaled, gains_.get(),
                                               offsets_.get())
                         .GetCPUFilter());
  } else if (!scene.gains.empty()) {
    balance_ = Owned(filters::GainOffsetCBFactory(scene.gains, scene.offsets).GetCPUFilter());
  }
}

void SceneFeed::Read(const Window& window, GridMover::Slot& slot) {
  slot.mover = makeMover_();
  mover_.Read(window, slot);
}

void SceneFeed::Fill(GridMover::Slot& slot) const {
  mover_.Fill(slot);
  slot.mover.reset();
  if (balance_ && slot.drawsOnSource) {
    Correct(balance_, slot.result.window, slot.result.output,
            reinterpret_cast<const std::uint8_t*>(slot.covered.Data()));
  }
}

MovablePixels SceneFeed::Prepare(WindowBuffers& read) const {
  if (filter_) FilterWindow(source_, filter_, read);
  const MovablePixels pixels =
      filter_ ? MovablePixels{read.output,
                              read.writable.Used()
                                  ? reinterpret_cast<const std::uint8_t*>(read.writable.Data())
                                  : nullptr}
              : AsRead(read);
  if (hotSpot_) Correct(hotSpot_, read.window, pixels.samples, pixels.mask);
  return pixels;
}

// Corrections look at one pixel at a time, so they may work in place.
void SceneFeed::Correct(const WindowFilter& filter, const Window& window, Plane& samples,
                        const std::uint8_t* mask) const {
  const gobs::RasterInfo info =
      DescribeBlock(window, source_.Channels().size(), source_.Type().code, 0);
  const gobs::Raster before(info, samples.Data(), samples.Size());
  gobs::Raster after(info, samples.Data(), samples.Size());
  const filters::FilterResult result = filter({.input = before, .output = after, .valid = mask});
  if (!result.Ok()) throw RunError("cannot correct " + source_.Name() + ": " + result.message);
}

}  // namespace zarn::app
