// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/pasting.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>
#include <memory>
#include <optional>

#include "apps/zarn/anysampletype.h"
#include "apps/zarn/blockreader.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/opaquealpha.h"
#include "apps/zarn/pipeline.h"
#include "apps/zarn/progress.h"
#include "apps/zarn/streamer.h"
#include "host/sys/openmp.h"
#include "processes/filters/cutline/cutlineblendingbase.h"

namespace zarn::app {
namespace {

using processes::filters::CutlineBlendingBase;
using processes::filters::FilterResult;

// So many that the filter shares them out among threads.
constexpr std::int64_t kFewestRows = 256;

std::unique_ptr<CutlineBlendingBase> MakeFilter(const Pasting& pasting) {
  // The factory makes no other kind.
  return std::unique_ptr<CutlineBlendingBase>(
      static_cast<CutlineBlendingBase*>(pasting.shape.GetCPUFilter()));
}

/// One window on its way.
struct Slot {
  Window window;  ///< of the mosaic; of no size where a piece misses the area
  WindowBuffers source;
  WindowBuffers mosaic;
  WindowBuffers map;
  bool sidesChanged = false;  ///< alphas or mask of the mosaic

  bool Empty() const { return window.width <= 0 || window.height <= 0; }
};

std::uint8_t* Bytes(Plane& plane) { return reinterpret_cast<std::uint8_t*>(plane.Data()); }

class Paster {
 public:
  Paster(const Pasting& pasting, UpdatedRaster& mosaic, UpdatedRaster* map)
      : pasting_(pasting),
        source_(pasting.source),
        mosaic_(mosaic),
        map_(map),
        reader_(source_, unused_, {.mask = pasting.mask, .preparesOutput = false}),
        filter_(MakeFilter(pasting)) {
    filter_->SetNoDataValues(&pasting.sourceNoData, &pasting.mosaicNoData);
    filter_->SetStopOnNodata(pasting.stopOnNoData);
    if (map == nullptr) return;
    VisitAnySampleType(map->Source().Type().code,
                       [&]<typename T>(std::type_identity<T>, std::size_t) {
                         const T id = static_cast<T>(pasting.sourceId);
                         std::memcpy(id_.data(), &id, sizeof(T));
                       });
  }

  std::size_t SampleBytes() const { return reader_.SampleBytes(); }
  /// What a pixel takes beside its samples before and after.
  std::size_t SideBytes() const {
    constexpr std::size_t kHelpers = 3;
    return reader_.SideBytes() + mosaic_.BytesPerPixel() +
           (map_ != nullptr ? map_->BytesPerPixel() : 0) + kHelpers + AlphaBytes();
  }

  /// Finds out whether the work would have to stop.
  void Check(const WindowPlan& plan, const Window& frame, nspio::Counter& progress) {
    filter_->SetSourceMap(nullptr, 0, 0);
    Stream(
        plan, frame, [&](Slot& slot) { ReadSource(slot); },
        [&](Slot& slot) {
          gobs::Raster block = SourceBlock(slot);
          // What it is pasted into does not matter.
          Require(filter_->Process(block, block, Column(slot), Row(slot), Valid(slot.source)));
        },
        [](Slot&) {}, progress);
  }

  void Run(const WindowPlan& plan, const Window& frame, nspio::Counter& progress) {
    Stream(
        plan, frame, [&](Slot& slot) { Read(slot); }, [&](Slot& slot) { Blend(slot); },
        [&](Slot& slot) { Write(slot); }, progress);
  }

 private:
  template <typename ReadSlot, typename Work, typename WriteSlot>
  void Stream(const WindowPlan& plan, const Window& frame, const ReadSlot& read, const Work& work,
              const WriteSlot& write, nspio::Counter& progress) {
    const auto unlessEmpty = [&](const auto& use) {
      return [&](std::size_t, std::size_t slot) {
        if (!slots_[slot].Empty()) use(slots_[slot]);
      };
    };
    const Stage enter = [&](std::size_t index, std::size_t slot) {
      slots_[slot].window = InArea(plan.At(index), frame);
      unlessEmpty(read)(index, slot);
    };
    const Stage leave = [&](std::size_t index, std::size_t slot) {
      unlessEmpty(write)(index, slot);
      progress.Update(static_cast<double>(index + 1) / static_cast<double>(plan.Count()));
    };
    RunPipeline(plan.Count(), kStreamSlots, {enter, unlessEmpty(work), leave}, 1);
  }

  Window InArea(const Window& piece, const Window& frame) const {
    const Window& area = pasting_.area;
    const std::int64_t x = std::max(piece.x + frame.x, area.x);
    const std::int64_t y = std::max(piece.y + frame.y, area.y);
    return {x, y, std::min(piece.x + frame.x + piece.width, area.x + area.width) - x,
            std::min(piece.y + frame.y + piece.height, area.y + area.height) - y};
  }

  void ReadSource(Slot& slot) {
    const Window& window = slot.window;
    reader_.Read({window.x - pasting_.place.column, window.y - pasting_.place.row, window.width,
                  window.height},
                 nullptr, slot.source);
  }

  void Read(Slot& slot) {
    ReadSource(slot);
    mosaic_.Read(slot.window, slot.mosaic);
    if (map_ != nullptr) map_->Read(slot.window, slot.map);
    slot.sidesChanged = false;
  }

  void Write(Slot& slot) {
    mosaic_.Write(slot.mosaic, slot.sidesChanged);
    if (map_ != nullptr) map_->Write(slot.map, false);
  }

  static std::uint32_t Column(const Slot& slot) {
    return static_cast<std::uint32_t>(slot.window.x);
  }
  static std::uint32_t Row(const Slot& slot) { return static_cast<std::uint32_t>(slot.window.y); }
  static std::uint8_t* Valid(WindowBuffers& buffers) {
    return buffers.masked ? Bytes(buffers.valid) : nullptr;
  }

  static gobs::Raster Block(const Slot& slot, Plane& plane, std::size_t channels,
                            gobs::NativeDataTypeCode type) {
    return gobs::Raster(DescribeBlock(slot.window, channels, type, 0), plane.Data(), plane.Size());
  }
  gobs::Raster SourceBlock(Slot& slot) const {
    return Block(slot, slot.source.samples, source_.Channels().size(), source_.Type().code);
  }

  void Require(const FilterResult& result) const {
    if (result.Ok()) return;
    const bool stopped = result.message == CutlineBlendingBase::NoDataErrorMessage();
    throw RunError("cannot paste " + source_.Name() + " into " + mosaic_.Source().Name() + ": " +
                   result.message +
                   (stopped ? " It has pixels without data inside of the cutline; without "
                              "--stop-on-nodata they are left out"
                            : ""));
  }

  void Blend(Slot& slot) {
    const gobs::Raster source = SourceBlock(slot);
    gobs::Raster mosaic =
        Block(slot, slot.mosaic.output, source_.Channels().size(), source_.Type().code);
    std::optional<gobs::Raster> map;
    if (map_ != nullptr) {
      map.emplace(Block(slot, slot.map.output, 1, map_->Source().Type().code));
      filter_->SetSourceMap(&*map, 1, pasting_.sourceId);
    }
    Require(filter_->Process(source, mosaic, Column(slot), Row(slot), Valid(slot.source)));
    const bool alphasDiffer = slot.mosaic.alphas.Used() && MarkDifferentAlphas(slot);
    if (!slot.mosaic.masked && !alphasDiffer) return;
    FindTouched(slot);
    if (slot.mosaic.masked) FillInvalid(slot);
    if (alphasDiffer) BlendAlphas(slot);
  }

  // The filter knows of the mosaic's no-data value only. What else the mosaic is without is found
  // and mended after it, with a second filter that tells which pixels it would touch at all.

  std::size_t AlphaBytes() const {
    return mosaic_.Source().Alphas().size() * source_.Type().Bytes();
  }

  CutlineBlendingBase& Helper() {
    if (!helper_) {
      helper_ = MakeFilter(pasting_);
      const std::vector<double> zeros(std::max<std::size_t>(1, mosaic_.Source().Alphas().size()));
      helper_->SetNoDataValues(nullptr, &zeros);
    }
    return *helper_;
  }

  void FindTouched(Slot& slot) {
    const Window& window = slot.window;
    touched_.Shape(window.width, window.height, 1);
    blank_.Shape(window.width, window.height, 1);
    std::memset(touched_.Data(), 0, touched_.Size());
    std::memset(blank_.Data(), 0, blank_.Size());
    // All of the blank block is no-data, so every pixel that is touched is filled and recorded.
    gobs::Raster blank = Block(slot, blank_, 1, gobs::NativeDataTypeCode::kUInt8);
    gobs::Raster touched = Block(slot, touched_, 1, gobs::NativeDataTypeCode::kUInt8);
    Helper().SetSourceMap(&touched, 1, 1);
    Require(Helper().Process(blank, blank, Column(slot), Row(slot), Valid(slot.source)));
    Helper().SetSourceMap(nullptr, 0, 0);
  }

  void FillInvalid(Slot& slot) {
    const std::size_t pixelBytes = slot.source.samples.PixelBytes();
    Plane& fileMask = slot.mosaic.fileMask;
    for (std::size_t i = 0; i < touched_.Size(); ++i) {
      if (touched_.Data()[i] == std::byte{0} || Bytes(slot.mosaic.valid)[i] != 0) continue;
      std::memcpy(slot.mosaic.output.Data() + i * pixelBytes,
                  slot.source.samples.Data() + i * pixelBytes, pixelBytes);
      if (fileMask.Used() && fileMask.Data()[i] == std::byte{0}) {
        fileMask.Data()[i] = std::byte{255};
        slot.sidesChanged = true;
      }
      if (map_ != nullptr) RecordSource(slot.map.output, i);
    }
  }

  void RecordSource(Plane& map, std::size_t pixel) const {
    std::memcpy(map.Data() + pixel * map.PixelBytes(), id_.data(), map.PixelBytes());
  }

  // The alphas of the source, or opaque ones.
  Plane& SourceAlphas(Slot& slot) {
    if (slot.source.alphas.Used()) return slot.source.alphas;
    opaque_.Shape(slot.window.width, slot.window.height, AlphaBytes());
    VisitAnySampleType(source_.Type().code, [&]<typename T>(std::type_identity<T>, std::size_t) {
      std::fill_n(reinterpret_cast<T*>(opaque_.Data()), opaque_.Size() / sizeof(T),
                  OpaqueAlpha<T>());
    });
    return opaque_;
  }

  // Equal alphas stay as they are: a mix would lose a level of some.
  bool MarkDifferentAlphas(Slot& slot) {
    const std::size_t bytes = AlphaBytes();
    const Plane& source = SourceAlphas(slot);
    different_.Shape(slot.window.width, slot.window.height, 1);
    bool any = false;
    for (std::size_t i = 0; i < different_.Size(); ++i) {
      const bool differs =
          std::memcmp(source.Data() + i * bytes, slot.mosaic.alphas.Data() + i * bytes, bytes) != 0;
      different_.Data()[i] = std::byte{differs};
      any |= differs;
    }
    return any;
  }

  void BlendAlphas(Slot& slot) {
    for (std::size_t i = 0; i < different_.Size(); ++i) different_.Data()[i] &= touched_.Data()[i];
    if (std::memchr(different_.Data(), 1, different_.Size()) == nullptr) return;
    const std::size_t count = mosaic_.Source().Alphas().size();
    const gobs::Raster source = Block(slot, SourceAlphas(slot), count, source_.Type().code);
    gobs::Raster mosaic = Block(slot, slot.mosaic.alphas, count, source_.Type().code);
    Require(Helper().Process(source, mosaic, Column(slot), Row(slot), Bytes(different_)));
    slot.sidesChanged = true;
  }

  const Pasting& pasting_;
  const RasterSource& source_;
  UpdatedRaster& mosaic_;
  UpdatedRaster* map_;
  NoDataValues unused_;
  BlockReader reader_;
  std::unique_ptr<CutlineBlendingBase> filter_;
  std::unique_ptr<CutlineBlendingBase> helper_;  ///< fills whatever it touches
  std::array<std::byte, 8> id_{};                ///< as the map has it
  std::array<Slot, kStreamSlots> slots_;
  Plane touched_;
  Plane blank_;
  Plane different_;
  Plane opaque_;
};

// The area from the edge of a block of the file on, so that windows fall on whole blocks.
Window FrameOf(const Window& area, const RasterSource& mosaic) {
  const auto aligned = [](std::int64_t start, std::int64_t block, std::int64_t size) {
    return block < size ? start / block * block : start;
  };
  const std::int64_t x = aligned(area.x, mosaic.BlockWidth(), mosaic.Width());
  const std::int64_t y = aligned(area.y, mosaic.BlockHeight(), mosaic.Height());
  return {x, y, area.x + area.width - x, area.y + area.height - y};
}

}  // namespace

void Paste(const Pasting& pasting, const WorkOptions& work, bool checkFirst, UpdatedRaster& mosaic,
           UpdatedRaster* map, nspio::Counter& progress) {
  Paster paster(pasting, mosaic, map);
  const Window frame = FrameOf(pasting.area, mosaic.Source());
  const WindowPlan plan(
      {.image = {frame.width, frame.height},
       .outputBlock = {mosaic.Source().BlockWidth(), mosaic.Source().BlockHeight()},
       .halo = 0,
       .sampleBytes = paster.SampleBytes(),
       .sideBytes = paster.SideBytes(),
       .slots = kStreamSlots,
       .memory = static_cast<std::size_t>(work.memory) << 20,
       .forced = ParseWindow(work.window),
       .fewestRows = kFewestRows});
  FitBlockCache(pasting.source, plan, 0);
  const sys::OMPThreadCount threads(sys::OMPThreadsFor(work.threads));
  const bool checks = checkFirst && pasting.stopOnNoData;
  if (checks) {
    ProgressSpan checking(progress, 0, 0.3);
    paster.Check(plan, frame, checking);
  }
  ProgressSpan pastingSpan(progress, checks ? 0.3 : 0, 1);
  paster.Run(plan, frame, pastingSpan);
}

}  // namespace zarn::app
