// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/streamer.h"

#include <cpl_conv.h>

#include <algorithm>
#include <array>

#include "apps/zarn/pipeline.h"

namespace zarn::app {
gobs::RasterInfo DescribeBlock(const Window& window, std::size_t channels,
                               gobs::NativeDataTypeCode type, std::int64_t halo) {
  const auto margin = static_cast<std::uint32_t>(halo);
  return gobs::RasterInfo(static_cast<std::uint32_t>(window.width),
                          static_cast<std::uint32_t>(window.height),
                          static_cast<std::uint32_t>(channels), type,
                          gobs::BlockFrame{margin, margin, static_cast<std::uint32_t>(window.x),
                                           static_cast<std::uint32_t>(window.y)});
}

void FilterWindow(const RasterSource& source, const BlockFunction& filter, WindowBuffers& buffers) {
  const auto channels = source.Channels().size();
  const gobs::Raster input = gobs::Raster::WrapConst(
      DescribeBlock(buffers.window, channels, source.Type().code, buffers.halo),
      buffers.samples.Data(), buffers.samples.Size());
  gobs::Raster output(DescribeBlock(buffers.window, channels, source.Type().code, 0),
                      buffers.output.Data(), buffers.output.Size());
  const auto bytes = [](const Plane& plane, bool wanted) {
    return wanted ? reinterpret_cast<const std::uint8_t*>(plane.Data()) : nullptr;
  };
  WindowBlocks blocks{.input = input,
                      .output = output,
                      .valid = bytes(buffers.valid, buffers.masked),
                      .writable = bytes(buffers.writable, buffers.writable.Used())};
  if (!buffers.labels.Used()) {
    filter(blocks);
    return;
  }
  const gobs::Raster labels =
      gobs::Raster::WrapConst(DescribeBlock(buffers.window, 1, buffers.labelType, buffers.halo),
                              buffers.labels.Data(), buffers.labels.Size());
  blocks.labels = &labels;
  filter(blocks);
}

void StreamWindows(const RasterSource& source, const WindowPlan& plan, BlockReader& reader,
                   const BlockFunction& filter, BlockWriter& writer, nspio::Counter& progress) {
  std::array<WindowBuffers, kStreamSlots> slots;
  const Stage read = [&](std::size_t index, std::size_t slot) {
    const WindowBuffers* const above =
        plan.ContinuesColumn(index) ? &slots[(index - 1) % kStreamSlots] : nullptr;
    reader.Read(plan.At(index), above, slots[slot]);
  };
  const Stage process = [&](std::size_t, std::size_t slot) {
    FilterWindow(source, filter, slots[slot]);
  };
  const Stage write = [&](std::size_t index, std::size_t slot) {
    writer.Write(slots[slot]);
    progress.Update(static_cast<double>(index + 1) / static_cast<double>(plan.Count()));
  };
  RunPipeline(plan.Count(), kStreamSlots, {read, process, write}, 1);
}

void FitBlockCache(const RasterSource& source, const WindowPlan& plan, std::int64_t halo) {
  if (CPLGetConfigOption("GDAL_CACHEMAX", nullptr) != nullptr) return;
  constexpr double kLeast = 64 << 20;
  constexpr double kMost = 512 << 20;
  constexpr double kForWriting = 32 << 20;
  const double columns = std::min<double>(
      source.Width(), static_cast<double>(plan.Size().width + 2 * halo + source.BlockWidth()));
  const double blockRow = columns * source.BlockHeight() * source.Dataset().GetRasterCount() *
                          static_cast<double>(source.Type().Bytes());
  const double wanted = blockRow + kForWriting;
  GDALSetCacheMax64(static_cast<GIntBig>(wanted > kMost ? kLeast : std::max(wanted, kLeast)));
}

}  // namespace zarn::app
