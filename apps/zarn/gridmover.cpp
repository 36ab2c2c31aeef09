// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/gridmover.h"

#include <algorithm>
#include <cstddef>
#include <utility>

namespace zarn::app {
namespace {

std::int64_t Pixels(const Window& window) { return window.width * window.height; }

}  // namespace

MovablePixels AsRead(WindowBuffers& read) {
  return {read.samples,
          read.masked ? reinterpret_cast<const std::uint8_t*>(read.valid.Data()) : nullptr};
}

GridMover::GridMover(const RasterSource& source, BlockReader& reader, Request request)
    : source_(source), reader_(reader), request_(std::move(request)) {}

void GridMover::Read(const Window& window, Slot& slot) {
  Shape(window, slot);
  slot.drawsOnSource = false;
  slot.mover->Enter(window);
  slot.filled = !Fits(slot.mover->SourceOf(window));
  if (slot.filled) {
    FillInParts(slot, window);
  } else {
    ReadSource(slot, window);
  }
}

void GridMover::Fill(Slot& slot) const {
  if (!slot.filled) FillPart(slot, slot.result.window);
}

bool GridMover::Fits(const Window& source) const {
  return Pixels(source) <= request_.mostSourcePixels;
}

void GridMover::Shape(const Window& window, Slot& slot) const {
  const std::size_t bytes = source_.Type().Bytes();
  WindowBuffers& result = slot.result;
  result.window = window;
  result.output.Shape(window.width, window.height, source_.Channels().size() * bytes);
  result.alphas.Shape(window.width, window.height,
                      request_.movesAlphas ? source_.Alphas().size() * bytes : 0);
  result.fileMask.Shape(window.width, window.height, request_.writesMask ? 1 : 0);
  slot.covered.Shape(window.width, window.height, 1);
  // What nothing covers must not show another window's pixels.
  std::fill_n(result.output.Data(), result.output.Size(), std::byte{0});
}

void GridMover::ReadSource(Slot& slot, const Window& part) {
  const Window needed = slot.mover->SourceOf(part);
  if (Pixels(needed) > 0) {
    reader_.Read(needed, nullptr, slot.source);
    slot.drawsOnSource = true;
  } else {
    slot.source.window = needed;
    slot.source.masked = false;
  }
}

// Rows first: the parts of a window have to lie together in memory.
void GridMover::FillInParts(Slot& slot, const Window& part) {
  if (Fits(slot.mover->SourceOf(part)) || Pixels(part) == 1) {
    ReadSource(slot, part);
    FillPart(slot, part);
    return;
  }
  Window first = part;
  Window second = part;
  if (part.height > 1) {
    first.height /= 2;
    second.y += first.height;
    second.height -= first.height;
  } else {
    first.width /= 2;
    second.x += first.width;
    second.width -= first.width;
  }
  FillInParts(slot, first);
  FillInParts(slot, second);
}

gobs::Raster GridMover::Block(const Window& window, const std::vector<int>& bands, Plane& plane,
                              const Window& planes) const {
  const gobs::RasterInfo info(static_cast<std::uint32_t>(window.width),
                              static_cast<std::uint32_t>(window.height),
                              static_cast<std::uint32_t>(bands.size()), source_.Type().code,
                              {.marginX = 0,
                               .marginY = 0,
                               .originX = static_cast<std::uint32_t>(window.x),
                               .originY = static_cast<std::uint32_t>(window.y)});
  if (Pixels(window) == 0) return gobs::Raster(info, nullptr, 0);
  return gobs::Raster(info, plane.At(window.x - planes.x, window.y - planes.y),
                      info.DescribedSize());
}

void GridMover::FillPart(Slot& slot, const Window& part) const {
  WindowBuffers& from = slot.source;
  WindowBuffers& to = slot.result;
  const bool any = Pixels(from.window) > 0;
  const MovablePixels pixels = any ? request_.prepare(from) : AsRead(from);
  std::byte* const covered = slot.covered.At(part.x - to.window.x, part.y - to.window.y);
  const auto move = [&](const std::vector<int>& bands, Plane& source, Plane& output,
                        const std::vector<double>& fill) {
    const gobs::Raster input = Block(from.window, bands, source, from.window);
    gobs::Raster block = Block(part, bands, output, to.window);
    slot.mover->Move(input, pixels.mask, fill, block, reinterpret_cast<std::uint8_t*>(covered));
  };
  if (to.alphas.Used()) {
    move(source_.Alphas(), from.alphas, to.alphas,
         std::vector<double>(source_.Alphas().size(), 0.0));
  }
  move(source_.Channels(), pixels.samples, to.output, request_.fill);
  if (to.fileMask.Used()) {
    std::transform(covered, covered + Pixels(part),
                   to.fileMask.At(part.x - to.window.x, part.y - to.window.y),
                   [](std::byte flag) { return flag == std::byte{0} ? flag : std::byte{255}; });
  }
}

}  // namespace zarn::app
