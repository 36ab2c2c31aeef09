// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/regrid.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <optional>
#include <string>

#include "apps/zarn/blockreader.h"
#include "apps/zarn/blockwriter.h"
#include "apps/zarn/carryover.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/gridmover.h"
#include "apps/zarn/maskfile.h"
#include "apps/zarn/pipeline.h"
#include "apps/zarn/progress.h"
#include "apps/zarn/streamer.h"
#include "host/core/exception.h"
#include "host/sys/openmp.h"

namespace zarn::app {
namespace {

// Larger windows gain nothing; a turned image draws on more of the source the wider they are.
constexpr std::int64_t kLargestSide = 1024;

class Regridder {
 public:
  Regridder(const RasterSource& source, const Regridding& plan, const NoDataValues& noData,
            BlockReader& reader, std::int64_t mostSourcePixels)
      : mover_(source, reader,
               {.fill = noData.output,
                .movesAlphas = true,
                .writesMask = NeedsMask(source, noData.output),
                .mostSourcePixels = mostSourcePixels}) {
    for (GridMover::Slot& slot : slots_) slot.mover = plan.makeMover();
  }

  void Stream(const WindowPlan& plan, BlockWriter& writer, nspio::Counter& progress) {
    const Stage read = [&](std::size_t index, std::size_t slot) {
      mover_.Read(plan.At(index), slots_[slot]);
      drawsOnSource_ |= slots_[slot].drawsOnSource;
    };
    const Stage move = [&](std::size_t, std::size_t slot) { mover_.Fill(slots_[slot]); };
    const Stage write = [&](std::size_t index, std::size_t slot) {
      writer.Write(slots_[slot].result);
      progress.Update(static_cast<double>(index + 1) / static_cast<double>(plan.Count()));
    };
    RunPipeline(plan.Count(), kStreamSlots, {read, move, write}, 1);
  }

  /// Whether any window so far had a part in the source.
  bool DrawsOnSource() const { return drawsOnSource_; }

 private:
  GridMover mover_;
  bool drawsOnSource_ = false;
  std::array<GridMover::Slot, kStreamSlots> slots_;
};

void RequireKnownType(const RasterSource& source) {
  using enum gobs::NativeDataTypeCode;
  if (source.Type().code != kUnknown && source.Type().code != kNone) return;
  throw RunError("cannot resample " + source.Name() + ": band " +
                 std::to_string(source.Channels().front()) + " is " + source.Type().Name() +
                 ": Unknown sample type.");
}

// A third of the memory for what belongs to the output, the rest for the source.
WindowSize ChooseWindow(double bytes, double bytesPerPixel) {
  const auto side = static_cast<std::int64_t>(std::sqrt(bytes / 3 / bytesPerPixel));
  const std::int64_t unit = side >= 256 ? 256 : 16;
  const std::int64_t rounded = std::clamp<std::int64_t>(side / unit * unit, 16, kLargestSide);
  return {rounded, rounded};
}

}  // namespace

void RunRegridding(const ImageFilterOptions& options,
                   const std::function<Regridding(const RasterSource&)>& fit) {
  if (options.quiet) SilenceWarnings();
  SetGdalThreads(options.threads);
  const std::optional<WindowSize> forcedWindow = ParseWindow(options.window);

  const RasterSource source(options.input);
  RequireKnownType(source);
  const NoDataValues noData = ResolveNoData(source, options.srcNoData, options.dstNoData);
  std::optional<MaskFile> mask;
  if (!options.mask.empty()) {
    mask.emplace(options.mask, source);
    RefuseMaskAsOutput(options);
  }
  const Regridding regridding = fit(source);

  StagedOutput output(options.output, source, noData.output,
                      regridding.grid ? &*regridding.grid : nullptr,
                      NeedsMask(source, noData.output));
  BlockReader reader(
      source, noData,
      {.mask = mask ? &*mask : nullptr, .marksNoData = true, .preparesOutput = false});
  BlockWriter writer(source, output.Dataset(), output.Name());
  int blockWidth = 1;
  int blockHeight = 1;
  output.Dataset().GetRasterBand(1)->GetBlockSize(&blockWidth, &blockHeight);
  const std::size_t bandBytes =
      static_cast<std::size_t>(source.Dataset().GetRasterCount()) * source.Type().Bytes();
  const std::size_t sideBytes = regridding.bytesPerPixel + 2;
  const double memory = static_cast<double>(options.memory) * (1 << 20);
  const double slotBytes = memory / kStreamSlots;
  const WindowSize window =
      forcedWindow.value_or(ChooseWindow(slotBytes, static_cast<double>(bandBytes + sideBytes)));
  const WindowPlan plan(
      {.image = {output.Dataset().GetRasterXSize(), output.Dataset().GetRasterYSize()},
       .outputBlock = {blockWidth, blockHeight},
       .halo = 0,
       .sampleBytes = bandBytes,
       .sideBytes = sideBytes,
       .slots = kStreamSlots,
       .memory = static_cast<std::size_t>(memory),
       .forced = window});
  FitBlockCache(source, plan, 0);
  // Read with each pixel: what it becomes where nothing is computed, and what belongs to it.
  const std::size_t sourceBytes = 2 * reader.SampleBytes() + reader.SideBytes();
  // What a block can hold at most bounds it too.
  const double mostSourceBytes =
      std::min<double>(slotBytes * 2 / 3, std::numeric_limits<std::uint32_t>::max());
  Regridder regridder(
      source, regridding, noData, reader,
      static_cast<std::int64_t>(mostSourceBytes / static_cast<double>(sourceBytes)));

  const sys::OMPThreadCount threads(sys::OMPThreadsFor(options.threads));
  TerminalProgress progress(options.quiet);
  ProgressSpan moving(progress, 0, output.CopiesAtTheEnd() ? 0.5 : 0.99);
  ProgressSpan publishing(progress, output.CopiesAtTheEnd() ? 0.5 : 0.99, 1);
  regridder.Stream(plan, writer, moving);
  output.Publish(publishing);
  if (!regridder.DrawsOnSource()) {
    Warn("no pixel of " + source.Name() + " lies on the grid of " + output.Name() +
         "; all of it is uncovered");
  }
}

}  // namespace zarn::app
