// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/tilecomposer.h"

#include <algorithm>
#include <cstring>
#include <limits>
#include <string>
#include <utility>

#include "apps/zarn/anysampletype.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/opaquealpha.h"
#include "apps/zarn/sourcemaptype.h"
#include "apps/zarn/streamer.h"
#include "processes/filters/factories/cutlineblendingfactory.h"
#include "processes/filters/framework/nodata.h"
#include "processes/filters/framework/outputconverter.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;

std::uint8_t* Bytes(Plane& plane) { return reinterpret_cast<std::uint8_t*>(plane.Data()); }
const std::uint8_t* Bytes(const Plane& plane) {
  return reinterpret_cast<const std::uint8_t*>(plane.Data());
}

// Arrays that the library takes over.
filters::PolygonParam ParamOf(const Polygon& polygon) {
  if (polygon.Empty()) return {};
  auto* const vertices = new double[polygon.vertices.size()];
  std::copy(polygon.vertices.begin(), polygon.vertices.end(), vertices);
  auto* const parts = new std::int32_t[polygon.starts.size() + 1];
  parts[0] = static_cast<std::int32_t>(polygon.starts.size());
  std::copy(polygon.starts.begin(), polygon.starts.end(), parts + 1);
  return {.vertices = vertices,
          .vertexCount = static_cast<std::uint32_t>(polygon.vertices.size() / 2),
          .parts = parts};
}

// Calls `use` with the numbers of a map as its samples.
template <typename Use>
void VisitMap(const SampleType& type, Plane& map, const Use& use) {
  switch (type.Bytes()) {
    case 1:
      return use(reinterpret_cast<std::uint8_t*>(map.Data()));
    case 2:
      return use(reinterpret_cast<std::uint16_t*>(map.Data()));
    default:
      return use(reinterpret_cast<std::uint32_t*>(map.Data()));
  }
}

// What no-data pixels hold, and the sample that takes the place of its first one in pixels that
// have data and happen to look the same.
template <typename T>
struct NoDataPixel {
  NoDataPixel(const std::vector<double>& values, std::size_t parts)
      : samples(values.size() * parts, T{0}) {
    for (std::size_t i = 0; i < values.size(); ++i) {
      samples[i * parts] = filters::RoundToSample<T>(values[i]);
    }
    using Limits = std::numeric_limits<T>;
    replacement = filters::OutputConverter<T>(static_cast<double>(Limits::lowest()),
                                              static_cast<double>(Limits::max()), values.front())
                      .replacement();
  }

  std::vector<T> samples;
  T replacement;
};

}  // namespace

TileComposer::TileComposer(const MosaicPlan& plan, const RasterSource& like, bool writesMask)
    : plan_(plan),
      type_(like.Type()),
      channels_(like.Channels().size()),
      alphas_(like.Alphas().size()),
      writesMask_(writesMask),
      mapType_(SourceMapType(static_cast<std::int64_t>(plan.scenes.size()))) {}

void TileComposer::Begin(const Window& window, TileBuffers& tile) {
  const auto shape = [&](Plane& plane, std::size_t bytes) {
    plane.Shape(window.width, window.height, bytes);
    std::fill_n(plane.Data(), plane.Size(), std::byte{0});
  };
  tile.image.window = window;
  shape(tile.image.output, channels_ * type_.Bytes());
  shape(tile.image.alphas, alphas_ * type_.Bytes());
  shape(tile.image.fileMask, writesMask_ ? 1 : 0);
  shape(tile.map, mapType_.Bytes());
  tile.spare.Shape(window.width, window.height, plan_.fillsGaps ? channels_ * type_.Bytes() : 0);
  shape(tile.spareMap, plan_.fillsGaps ? mapType_.Bytes() : 0);
  // Tiles come row by row, so these scenes are done.
  std::erase_if(overlays_, [&](const auto& entry) {
    const Window& reach = plan_.scenes[entry.first].reach;
    return reach.y + reach.height <= window.y;
  });
}

TileComposer::Overlay& TileComposer::OverlayOf(std::size_t scene) {
  std::unique_ptr<Overlay>& overlay = overlays_[scene];
  if (!overlay) {
    const filters::CutlineBlendingFactory factory(ParamOf(plan_.scenes[scene].cutline),
                                                  plan_.feather);
    overlay.reset(static_cast<Overlay*>(factory.GetCPUFilter()));
  }
  return *overlay;
}

void TileComposer::Paste(std::size_t scene, GridMover::Slot& pixels, TileBuffers& tile) {
  Overlay& overlay = OverlayOf(scene);
  if (plan_.stopsOnNoData) RequireData(scene, pixels);
  // All that is without data is 0. Where nothing else is, one pass does for both.
  const std::vector<double> empty(channels_, 0.0);
  Select(true, pixels, tile);
  if (SelectionLooksEmpty(tile, pixels.result.window)) {
    Apply(overlay, scene, pixels, tile, selected_, {});
    Select(false, pixels, tile);
    Apply(overlay, scene, pixels, tile, selected_, empty);
  } else {
    Apply(overlay, scene, pixels, tile, pixels.covered, empty);
  }
  if (plan_.fillsGaps) KeepSpare(scene, pixels, tile);
}

void TileComposer::Select(bool withData, const GridMover::Slot& pixels, TileBuffers& tile) {
  const Window& window = pixels.result.window;
  selected_.Shape(window.width, window.height, 1);
  const std::uint8_t* const covered = Bytes(pixels.covered);
  VisitMap(mapType_, tile.map, [&](const auto* numbers) {
    numbers += (window.y - tile.image.window.y) * window.width;
    std::uint8_t* const selected = Bytes(selected_);
    const std::size_t count = selected_.Size();
    for (std::size_t i = 0; i < count; ++i) {
      selected[i] = (numbers[i] != 0) == withData ? covered[i] : std::uint8_t{0};
    }
  });
}

// Whether a pixel of the tile that is selected is 0.
bool TileComposer::SelectionLooksEmpty(const TileBuffers& tile, const Window& window) const {
  const std::byte* const selected = selected_.Data();
  const std::size_t count = selected_.Size();
  if (std::memchr(selected, 1, count) == nullptr) return false;
  bool any = false;
  VisitAnySampleType(type_.code, [&]<typename T>(std::type_identity<T>, std::size_t parts) {
    const std::vector<T> zeros(channels_ * parts, T{0});
    const T* const pixels =
        reinterpret_cast<const T*>(tile.image.output.At(0, window.y - tile.image.window.y));
    for (std::size_t i = 0; i < count && !any; ++i) {
      any = selected[i] != std::byte{0} &&
            filters::PixelNearlyEquals(pixels + i * zeros.size(), zeros.data(), zeros.size());
    }
  });
  return any;
}

void TileComposer::Apply(Overlay& overlay, std::size_t scene, GridMover::Slot& pixels,
                         TileBuffers& tile, const Plane& mask,
                         const std::vector<double>& mosaicNoData) const {
  if (std::memchr(mask.Data(), 1, mask.Size()) == nullptr) return;
  const Window& window = pixels.result.window;
  const std::int64_t row = window.y - tile.image.window.y;
  const auto block = [&](Plane& plane, std::int64_t firstRow, std::size_t channels,
                         gobs::NativeDataTypeCode type) {
    const gobs::RasterInfo info = DescribeBlock(window, channels, type, 0);
    return gobs::Raster(info, plane.At(0, firstRow), info.DescribedSize());
  };
  const gobs::Raster source = block(pixels.result.output, 0, channels_, type_.code);
  gobs::Raster mosaic = block(tile.image.output, row, channels_, type_.code);
  gobs::Raster map = block(tile.map, row, 1, mapType_.code);
  overlay.SetNoDataValues(nullptr, &mosaicNoData);
  overlay.SetSourceMap(&map, 1, static_cast<long>(scene) + 1);
  const filters::FilterResult result =
      overlay.Process(source, mosaic, static_cast<std::uint32_t>(window.x),
                      static_cast<std::uint32_t>(window.y), const_cast<std::uint8_t*>(Bytes(mask)));
  if (!result.Ok()) {
    throw RunError("cannot paste " + plan_.scenes[scene].File() + ": " + result.message);
  }
}

// A copy of the overlay without feather, pasted into nothing, tells what lies inside.
void TileComposer::RequireData(std::size_t scene, const GridMover::Slot& pixels) {
  const Window& window = pixels.result.window;
  inside_.Shape(window.width, window.height, 1);
  std::fill_n(inside_.Data(), inside_.Size(), std::byte{0});
  const gobs::RasterInfo info = DescribeBlock(window, 1, gobs::NativeDataTypeCode::kUInt8, 0);
  Plane ones;
  ones.Shape(window.width, window.height, 1);
  std::fill_n(ones.Data(), ones.Size(), std::byte{1});
  const gobs::Raster source(info, ones.Data(), ones.Size());
  gobs::Raster inside(info, inside_.Data(), inside_.Size());
  const filters::CutlineBlendingFactory factory(ParamOf(plan_.scenes[scene].cutline), 0);
  const std::unique_ptr<filters::IFilter> filter(factory.GetCPUFilter());
  filter->Process(source, inside, static_cast<std::uint32_t>(window.x),
                  static_cast<std::uint32_t>(window.y), nullptr);
  for (std::size_t i = 0; i < inside_.Size(); ++i) {
    if (inside_.Data()[i] == std::byte{0} || pixels.covered.Data()[i] != std::byte{0}) continue;
    const auto offset = static_cast<std::int64_t>(i);
    throw RunError(plan_.scenes[scene].File() + " has no data at column " +
                   std::to_string(window.x + offset % window.width) + ", row " +
                   std::to_string(window.y + offset / window.width) +
                   " of the mosaic, inside of its cutline; move the cutline, or leave out "
                   "--stop-on-nodata");
  }
}

void TileComposer::KeepSpare(std::size_t scene, const GridMover::Slot& pixels,
                             TileBuffers& tile) const {
  const Window& window = pixels.result.window;
  const Window& reach = plan_.scenes[scene].reach;
  const std::size_t bytes = tile.spare.PixelBytes();
  const std::int64_t left = std::max<std::int64_t>(reach.x - window.x, 0);
  const std::int64_t right = std::min(reach.x + reach.width - window.x, window.width);
  VisitMap(mapType_, tile.map, [&]<typename N>(const N* numbers) {
    N* const spares = reinterpret_cast<N*>(tile.spareMap.Data());
    for (std::int64_t row = 0; row < window.height; ++row) {
      const std::int64_t first = (row + window.y - tile.image.window.y) * window.width;
      const std::byte* const covered = pixels.covered.At(0, row);
      for (std::int64_t column = left; column < right; ++column) {
        const auto i = static_cast<std::size_t>(first + column);
        if (covered[column] == std::byte{0} || numbers[i] != 0 || spares[i] != 0) continue;
        spares[i] = static_cast<N>(scene + 1);
        std::memcpy(tile.spare.Data() + i * bytes, pixels.result.output.At(column, row), bytes);
      }
    }
  });
}

void TileComposer::FillGaps(TileBuffers& tile) const {
  const std::size_t bytes = tile.spare.PixelBytes();
  Plane& spare = tile.spareMap;
  VisitMap(mapType_, tile.map, [&]<typename N>(N* numbers) {
    const N* const others = reinterpret_cast<const N*>(spare.Data());
    const std::size_t count = tile.map.Size() / sizeof(N);
    for (std::size_t i = 0; i < count; ++i) {
      if (numbers[i] != 0 || others[i] == 0) continue;
      numbers[i] = others[i];
      std::memcpy(tile.image.output.Data() + i * bytes, tile.spare.Data() + i * bytes, bytes);
    }
  });
}

void TileComposer::SettleNoData(TileBuffers& tile) const {
  if (plan_.noData.empty()) return;
  VisitAnySampleType(type_.code, [&]<typename T>(std::type_identity<T>, std::size_t parts) {
    const NoDataPixel<T> noData(plan_.noData, parts);
    const std::size_t samples = noData.samples.size();
    T* const pixels = reinterpret_cast<T*>(tile.image.output.Data());
    VisitMap(mapType_, tile.map, [&]<typename N>(const N* numbers) {
      const auto settle = [&](std::size_t begin, std::size_t end) {
        for (std::size_t i = begin; i < end; ++i) {
          T* const pixel = pixels + i * samples;
          if (numbers[i] == 0) {
            std::copy(noData.samples.begin(), noData.samples.end(), pixel);
          } else if (filters::PixelEquals(pixel, noData.samples.data(), samples)) {
            *pixel = noData.replacement;
          }
        }
      };
      // Most stretches have data everywhere, and none that looks like no-data.
      constexpr std::size_t kStretch = 256;
      const std::size_t count = tile.map.Size() / sizeof(N);
      for (std::size_t begin = 0; begin < count; begin += kStretch) {
        const std::size_t size = std::min(kStretch, count - begin);
        if (filters::AnySampleEquals(numbers + begin, size, N{0}) ||
            filters::AnySampleEquals(pixels + begin * samples, size * samples,
                                     noData.samples.front())) {
          settle(begin, begin + size);
        }
      }
    });
  });
}

void TileComposer::MarkCoverage(TileBuffers& tile) const {
  WindowBuffers& image = tile.image;
  VisitMap(mapType_, tile.map, [&]<typename N>(const N* numbers) {
    const std::size_t count = tile.map.Size() / sizeof(N);
    if (image.fileMask.Used()) {
      for (std::size_t i = 0; i < count; ++i) {
        image.fileMask.Data()[i] = numbers[i] == 0 ? std::byte{0} : std::byte{255};
      }
    }
    if (!image.alphas.Used()) return;
    VisitAnySampleType(type_.code, [&]<typename T>(std::type_identity<T>, std::size_t parts) {
      constexpr T kOpaque = OpaqueAlpha<T>();
      T* const alphas = reinterpret_cast<T*>(image.alphas.Data());
      const std::size_t samples = alphas_ * parts;
      for (std::size_t i = 0; i < count * samples; ++i) {
        if (numbers[i / samples] != 0) alphas[i] = kOpaque;
      }
    });
  });
}

void TileComposer::Finish(TileBuffers& tile) const {
  if (plan_.fillsGaps) FillGaps(tile);
  SettleNoData(tile);
  MarkCoverage(tile);
}

}  // namespace zarn::app
