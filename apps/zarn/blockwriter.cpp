// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/blockwriter.h"

#include <algorithm>
#include <utility>

#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/stagedoutput.h"

namespace zarn::app {
namespace {

// Pixels handed to GDAL before its cache is emptied into the file.
constexpr std::int64_t kPartBytes = 16 << 20;

void Check(CPLErr result, const std::string& name) {
  if (result != CE_None) FailWriting(name, LastGdalMessage());
}

}  // namespace

BlockWriter::BlockWriter(const RasterSource& source, GDALDataset& output, std::string name)
    : source_(source), output_(output), name_(std::move(name)) {
  output_.GetRasterBand(1)->GetBlockSize(&blockWidth_, &blockHeight_);
}

void BlockWriter::Write(const WindowBuffers& buffers) {
  const GdalFailureWatch watch;
  CPLErrorReset();
  const Window& window = buffers.window;
  const bool wholeBlocks =
      window.x % blockWidth_ == 0 && window.y % blockHeight_ == 0 &&
      (window.width % blockWidth_ == 0 || window.x + window.width == output_.GetRasterXSize()) &&
      (window.height % blockHeight_ == 0 || window.y + window.height == output_.GetRasterYSize());
  if (!wholeBlocks) {
    // The cache has to bring the parts of a block together.
    WritePart(buffers, window);
  } else {
    // Emptying the cache after every few blocks keeps all bands of a block in it until they are
    // written together, however wide the image is.
    const std::int64_t blockBytes = std::int64_t{blockWidth_} * blockHeight_ *
                                    output_.GetRasterCount() *
                                    static_cast<std::int64_t>(source_.Type().Bytes());
    const std::int64_t partWidth =
        blockWidth_ * std::max<std::int64_t>(1, kPartBytes / std::max<std::int64_t>(blockBytes, 1));
    for (std::int64_t y = 0; y < window.height; y += blockHeight_) {
      for (std::int64_t x = 0; x < window.width; x += partWidth) {
        WritePart(buffers, Window{x + window.x, y + window.y, std::min(partWidth, window.width - x),
                                  std::min<std::int64_t>(blockHeight_, window.height - y)});
        Flush();
      }
    }
  }
  if (!watch.First().empty()) FailWriting(name_, watch.First());
}

void BlockWriter::WritePart(const WindowBuffers& buffers, const Window& part) {
  WriteBands(source_.Channels(), buffers.output, 0, buffers, part);
  if (buffers.alphas.Used()) {
    WriteBands(source_.Alphas(), buffers.alphas, buffers.halo, buffers, part);
  }
  if (buffers.fileMask.Used()) {
    const Plane& plane = buffers.fileMask;
    const std::byte* const data = plane.At(part.x - buffers.window.x + buffers.halo,
                                           part.y - buffers.window.y + buffers.halo);
    Check(output_.GetRasterBand(1)->GetMaskBand()->RasterIO(
              GF_Write, static_cast<int>(part.x), static_cast<int>(part.y),
              static_cast<int>(part.width), static_cast<int>(part.height),
              const_cast<std::byte*>(data), static_cast<int>(part.width),
              static_cast<int>(part.height), GDT_Byte, 1, static_cast<GSpacing>(plane.Stride()),
              nullptr),
          name_);
  }
}

void BlockWriter::WriteBands(const std::vector<int>& bands, const Plane& plane, std::int64_t halo,
                             const WindowBuffers& buffers, const Window& part) {
  const std::byte* const data =
      plane.At(part.x - buffers.window.x + halo, part.y - buffers.window.y + halo);
  Check(output_.RasterIO(GF_Write, static_cast<int>(part.x), static_cast<int>(part.y),
                         static_cast<int>(part.width), static_cast<int>(part.height),
                         const_cast<std::byte*>(data), static_cast<int>(part.width),
                         static_cast<int>(part.height), source_.Type().gdal,
                         static_cast<int>(bands.size()), const_cast<int*>(bands.data()),
                         static_cast<GSpacing>(plane.PixelBytes()),
                         static_cast<GSpacing>(plane.Stride()),
                         static_cast<GSpacing>(source_.Type().Bytes()), nullptr),
        name_);
}

void BlockWriter::Flush() {
  for (int number = 1; number <= output_.GetRasterCount(); ++number) {
    Check(output_.GetRasterBand(number)->FlushCache(false), name_);
  }
  if (!source_.Masks().empty()) {
    Check(output_.GetRasterBand(1)->GetMaskBand()->FlushCache(false), name_);
  }
}

}  // namespace zarn::app
