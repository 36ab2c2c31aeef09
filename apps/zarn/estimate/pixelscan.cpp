// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/pixelscan.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <vector>

#include "apps/zarn/blockreader.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/pipeline.h"
#include "apps/zarn/streamer.h"
#include "processes/filters/framework/nodata.h"
#include "processes/filters/framework/sampletypes.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;

constexpr std::size_t kMemory = std::size_t{96} << 20;
constexpr std::size_t kSlots = 2;  // one window being read, one visited

// The area grown to whole blocks of the file, so that none is decoded for two windows.
Window WithWholeBlocks(const RasterSource& source, const Window& area) {
  const auto grow = [](std::int64_t begin, std::int64_t length, std::int64_t block,
                       std::int64_t image) {
    const std::int64_t first = begin / block * block;
    const std::int64_t end = std::min(image, (begin + length + block - 1) / block * block);
    return std::array{first, end - first};
  };
  const auto [x, width] = grow(area.x, area.width, source.BlockWidth(), source.Width());
  const auto [y, height] = grow(area.y, area.height, source.BlockHeight(), source.Height());
  return {x, y, width, height};
}

template <typename T>
void VisitRows(const WindowBuffers& buffers, std::size_t channels, const std::vector<T>& noData,
               const std::function<void(const PixelRun&)>& visit) {
  const auto width = static_cast<std::size_t>(buffers.window.width);
  std::vector<double> samples(width * channels);
  std::vector<std::uint8_t> valid(width, 1);
  for (std::int64_t y = 0; y < buffers.window.height; ++y) {
    const T* const row = reinterpret_cast<const T*>(buffers.samples.At(0, y));
    std::transform(row, row + samples.size(), samples.begin(),
                   [](T sample) { return static_cast<double>(sample); });
    if (buffers.valid.Used()) {
      std::copy_n(reinterpret_cast<const std::uint8_t*>(buffers.valid.At(0, y)), width,
                  valid.begin());
    }
    for (std::size_t x = 0; x < width; ++x) {
      const T* const pixel = row + x * channels;
      bool counts = buffers.valid.Used() ? valid[x] != 0 : true;
      counts =
          counts && (noData.empty() || !filters::PixelNearlyEquals(pixel, noData.data(), channels));
      for (std::size_t c = 0; c < channels && counts; ++c) {
        counts = std::isfinite(samples[x * channels + c]);
      }
      valid[x] = counts ? 1 : 0;
    }
    visit({buffers.window.x, buffers.window.y + y, width, samples.data(), valid.data()});
  }
}

}  // namespace

void ScanPixels(const RasterSource& source, const NoDataValues& noData, const Window& area,
                nspio::Counter& progress, const std::function<void(const PixelRun&)>& visit) {
  const Window whole = WithWholeBlocks(source, area);
  BlockReader reader(source, noData, {.preparesOutput = false});
  const WindowPlan plan({.image = {whole.width, whole.height},
                         .outputBlock = {source.BlockWidth(), source.BlockHeight()},
                         .halo = 0,
                         .sampleBytes = reader.SampleBytes(),
                         .sideBytes = reader.SideBytes(),
                         .slots = kSlots,
                         .memory = kMemory,
                         .forced = {}});
  FitBlockCache(source, plan, 0);
  std::array<WindowBuffers, kSlots> slots;
  const Stage read = [&](std::size_t index, std::size_t slot) {
    Window window = plan.At(index);
    window.x += whole.x;
    window.y += whole.y;
    reader.Read(window, nullptr, slots[slot]);
  };
  const Stage process = [&](std::size_t index, std::size_t slot) {
    const filters::FilterResult result = filters::VisitSampleType(
        source.Type().code, "its samples are not of a type that can be corrected",
        [&]<typename T>(std::type_identity<T>) {
          VisitRows<T>(slots[slot], source.Channels().size(),
                       filters::ConvertNoData<T>(noData.input), visit);
          return filters::FilterResult::Success();
        });
    if (!result.Ok()) {
      throw RunError(source.Name() + " is " + source.Type().Name() + ": " + result.message);
    }
    progress.Update(static_cast<double>(index + 1) / static_cast<double>(plan.Count()));
  };
  RunPipeline(plan.Count(), kSlots, {read, process}, 1);
}

}  // namespace zarn::app
