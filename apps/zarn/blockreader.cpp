// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/blockreader.h"

#include <cpl_error.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <string>
#include <type_traits>

#include "apps/zarn/anysampletype.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "processes/filters/framework/nodata.h"

namespace zarn::app {
namespace {

namespace filters = processes::filters;

// Takes the rows that the window above has in common with this one: its last ones.
void CarryRows(const Plane& above, std::int64_t rows, Plane& plane) {
  const std::size_t bytes = static_cast<std::size_t>(rows) * plane.Stride();
  if (bytes > 0) std::memcpy(plane.Data(), above.Data() + above.Size() - bytes, bytes);
}

// A no-data pixel; values for complex samples are their real parts, the others are 0.
template <typename T>
std::vector<T> NoDataPixel(const std::vector<double>& values, std::size_t parts) {
  std::vector<T> pixel(values.size() * parts, T{0});
  for (std::size_t i = 0; i < values.size(); ++i) {
    pixel[i * parts] = filters::RoundToSample<T>(values[i]);
  }
  return pixel;
}

// Other lists of bands are not read together: GDAL 3.6 confuses the strips of band-interleaved
// GeoTIFFs then, when it decodes with several threads.
bool AreLeadingBands(const std::vector<int>& bands) {
  for (std::size_t i = 0; i < bands.size(); ++i) {
    if (bands[i] != static_cast<int>(i) + 1) return false;
  }
  return true;
}

// The rules for one row of pixels; a NaN or an excluded pixel is one as a whole. Samples have one
// part, or two where they are complex.
template <typename T>
class ValidityRow {
 public:
  ValidityRow(std::size_t channels, std::size_t alphas, std::size_t parts,
              const NoDataValues& noData)
      : channels_(channels * parts),
        alphas_(alphas),
        parts_(parts),
        translate_(noData.translate),
        input_(NoDataPixel<T>(noData.input, parts)),
        output_(NoDataPixel<T>(noData.output, parts)) {}

  void ClearNaN(const T* pixels, std::uint8_t* valid, std::size_t count) const {
    if constexpr (std::is_floating_point_v<T>) {
      for (std::size_t x = 0; x < count; ++x) {
        bool isNaN = false;
        for (std::size_t c = 0; c < channels_; ++c) isNaN |= std::isnan(pixels[x * channels_ + c]);
        valid[x] = isNaN ? std::uint8_t{0} : valid[x];
      }
    }
  }

  void ClearTransparent(const T* alphas, std::uint8_t* valid, std::size_t count) const {
    for (std::size_t i = 0; i < count * alphas_; ++i) {
      if (alphas[i * parts_] == T{0}) valid[i / alphas_] = 0;
    }
  }

  void ClearNoData(const T* pixels, bool exact, std::uint8_t* valid, std::size_t count) const {
    if (input_.empty()) return;
    for (std::size_t x = 0; x < count; x += kStretch) {
      ClearNoDataInStretch(pixels + x * channels_, exact, valid + x, std::min(kStretch, count - x));
    }
  }

  // Excluded pixels enter no mean, so what they become can be put in their place at once.
  void TranslateInvalid(const std::uint8_t* valid, T* pixels, std::size_t count) const {
    if (!translate_) return;
    for (std::size_t x = 0; x < count; ++x) {
      if (valid[x] == 0) Translate(pixels + x * channels_);
    }
  }

  // Pixels that the mask file takes from the filter, which then does not translate them itself.
  void TranslateNoData(const std::uint8_t* valid, T* pixels, std::size_t count) const {
    if (!translate_ || input_.empty()) return;
    for (std::size_t x = 0; x < count; ++x) {
      T* const pixel = pixels + x * channels_;
      if (valid[x] == 0 && filters::PixelEquals(pixel, input_.data(), channels_)) Translate(pixel);
    }
  }

 private:
  // Pixels whose samples are looked at together.
  static constexpr std::size_t kStretch = 256;

  void ClearNoDataInStretch(const T* pixels, bool exact, std::uint8_t* valid,
                            std::size_t count) const {
    const bool equal = exact || std::is_integral_v<T>;
    if (equal && !filters::AnySampleEquals(pixels, count * channels_, input_.front())) return;
    for (std::size_t x = 0; x < count; ++x) {
      const T* const pixel = pixels + x * channels_;
      const bool isNoData = exact ? filters::PixelEquals(pixel, input_.data(), channels_)
                                  : filters::PixelNearlyEquals(pixel, input_.data(), channels_);
      if (isNoData) valid[x] = 0;
    }
  }

  void Translate(T* pixel) const { std::copy(output_.begin(), output_.end(), pixel); }

  std::size_t channels_;  ///< all parts of them
  std::size_t alphas_;
  std::size_t parts_;
  bool translate_;
  std::vector<T> input_;
  std::vector<T> output_;
};

}  // namespace

// Rows `firstRow` and below of a window with its halo; `inside` is their part within the image, and
// begins at `column`, `row` of the planes.
struct BlockReader::Fresh {
  std::int64_t firstRow;
  std::int64_t column;
  std::int64_t row;
  Window inside;

  // Zeroes what lies outside of the image; memory must not be left undefined even where masked.
  void ClearOutside(Plane& plane) const {
    const std::size_t pixel = plane.PixelBytes();
    std::byte* const end = plane.Data() + plane.Size();
    std::byte* const rowsEnd = plane.At(0, row + inside.height);
    std::fill(plane.At(0, firstRow), plane.At(0, row), std::byte{0});
    std::fill(rowsEnd, end, std::byte{0});
    for (std::int64_t y = row; y < row + inside.height; ++y) {
      std::byte* const line = plane.At(0, y);
      std::fill_n(line, static_cast<std::size_t>(column) * pixel, std::byte{0});
      std::fill(plane.At(column + inside.width, y), line + plane.Stride(), std::byte{0});
    }
  }
};

BlockReader::BlockReader(const RasterSource& source, const NoDataValues& noData,
                         const BlockRequest& request)
    : source_(source),
      noData_(noData),
      request_(request),
      halo_(request.halo),
      sampleBytes_(source.Channels().size() * source.Type().Bytes()),
      isFloat_(GDALDataTypeIsFloating(source.Type().gdal) != FALSE),
      needsValid_(halo_ > 0 || isFloat_ || request.mask != nullptr || !source.Alphas().empty() ||
                  !source.Masks().empty() || (request.marksNoData && !noData.input.empty())),
      needsWritable_(request.outputMask != nullptr || (request.protectsInvalid && needsValid_)) {}

std::size_t BlockReader::SideBytes() const {
  return source_.Alphas().size() * source_.Type().Bytes() + (source_.Masks().empty() ? 0 : 1) +
         (needsValid_ ? 1 : 0) + (needsWritable_ ? 1 : 0) +
         (request_.labels != nullptr ? request_.labels->Bytes() : 0);
}

void BlockReader::Shape(const Window& window, WindowBuffers& buffers) const {
  const std::int64_t width = window.width + 2 * halo_;
  const std::int64_t height = window.height + 2 * halo_;
  buffers.window = window;
  buffers.halo = halo_;
  buffers.samples.Shape(width, height, sampleBytes_);
  buffers.alphas.Shape(width, height, source_.Alphas().size() * source_.Type().Bytes());
  buffers.fileMask.Shape(width, height, source_.Masks().empty() ? 0 : 1);
  buffers.valid.Shape(width, height, needsValid_ ? 1 : 0);
  buffers.output.Shape(window.width, window.height, request_.preparesOutput ? sampleBytes_ : 0);
  buffers.writable.Shape(window.width, window.height, needsWritable_ ? 1 : 0);
  buffers.labels.Shape(width, height, request_.labels != nullptr ? request_.labels->Bytes() : 0);
  if (request_.labels != nullptr) buffers.labelType = request_.labels->Type();
}

void BlockReader::Read(const Window& window, const WindowBuffers* above, WindowBuffers& buffers) {
  Shape(window, buffers);
  const std::int64_t carried = above == nullptr ? 0 : 2 * halo_;
  if (above != nullptr) {
    CarryRows(above->samples, carried, buffers.samples);
    CarryRows(above->alphas, carried, buffers.alphas);
    CarryRows(above->fileMask, carried, buffers.fileMask);
    CarryRows(above->valid, carried, buffers.valid);
    CarryRows(above->labels, carried, buffers.labels);
  }

  const std::int64_t left = window.x - halo_;
  const std::int64_t top = window.y - halo_;
  const std::int64_t x = std::max<std::int64_t>(left, 0);
  const std::int64_t right =
      std::min<std::int64_t>(window.x + window.width + halo_, source_.Width());
  // Below a carried halo there may be no row left to read.
  const std::int64_t y = std::clamp<std::int64_t>(top + carried, 0, source_.Height());
  const std::int64_t bottom =
      std::min<std::int64_t>(window.y + window.height + halo_, source_.Height());
  const Fresh fresh{carried, x - left, std::max(y - top, carried),
                    Window{x, y, right - x, std::max<std::int64_t>(bottom - y, 0)}};

  ReadBands(fresh, source_.Channels(), buffers.samples);
  ReadBands(fresh, source_.Alphas(), buffers.alphas);
  ReadFileMask(fresh, buffers.fileMask);
  ReadLabels(fresh, buffers.labels);
  MarkValid(fresh, buffers);
  MarkWritable(buffers);
  const Plane& valid = buffers.valid;
  buffers.masked = valid.Used() && std::memchr(valid.Data(), 0, valid.Size()) != nullptr;
  PrepareOutput(buffers);
}

void BlockReader::ReadBands(const Fresh& fresh, const std::vector<int>& bands, Plane& plane) {
  if (!plane.Used()) return;
  fresh.ClearOutside(plane);
  if (fresh.inside.height == 0) return;
  const int width = static_cast<int>(fresh.inside.width);
  const int height = static_cast<int>(fresh.inside.height);
  const auto pixelBytes = static_cast<GSpacing>(plane.PixelBytes());
  const auto stride = static_cast<GSpacing>(plane.Stride());
  const auto sampleBytes = static_cast<GSpacing>(source_.Type().Bytes());
  const GDALDataType type = source_.Type().gdal;
  std::byte* const first = plane.At(fresh.column, fresh.row);
  const auto x = static_cast<int>(fresh.inside.x);
  const auto y = static_cast<int>(fresh.inside.y);
  CPLErrorReset();
  CPLErr result = CE_None;
  if (AreLeadingBands(bands)) {
    result = source_.Dataset().RasterIO(
        GF_Read, x, y, width, height, first, width, height, type, static_cast<int>(bands.size()),
        const_cast<int*>(bands.data()), pixelBytes, stride, sampleBytes, nullptr);
  } else {
    for (std::size_t i = 0; i < bands.size(); ++i) {
      GDALRasterBand& band = *source_.Dataset().GetRasterBand(bands[i]);
      result = std::max(
          result, band.RasterIO(GF_Read, x, y, width, height, first + i * source_.Type().Bytes(),
                                width, height, type, pixelBytes, stride, nullptr));
    }
  }
  if (result != CE_None) {
    throw RunError("cannot read " + source_.Name() + ": " + LastGdalMessage(source_.Name()));
  }
}

void BlockReader::ReadFileMask(const Fresh& fresh, Plane& plane) {
  if (!plane.Used()) return;
  fresh.ClearOutside(plane);
  const auto read = [&](GDALRasterBand& mask, std::int64_t y, std::int64_t height, void* rows) {
    const int width = static_cast<int>(fresh.inside.width);
    CPLErrorReset();
    if (mask.RasterIO(GF_Read, static_cast<int>(fresh.inside.x),
                      static_cast<int>(fresh.inside.y + y), width, static_cast<int>(height), rows,
                      width, static_cast<int>(height), GDT_Byte, 1,
                      static_cast<GSpacing>(plane.Stride()), nullptr) != CE_None) {
      throw RunError("cannot read the mask of " + source_.Name() + ": " +
                     LastGdalMessage(source_.Name()));
    }
  };
  if (fresh.inside.height > 0) {
    read(*source_.Masks().front(), 0, fresh.inside.height, plane.At(fresh.column, fresh.row));
  }
  // Further masks belong to further bands; a pixel is valid where all of them say so.
  maskScratch_.resize(static_cast<std::size_t>(fresh.inside.width));
  for (std::size_t i = 1; i < source_.Masks().size(); ++i) {
    for (std::int64_t y = 0; y < fresh.inside.height; ++y) {
      read(*source_.Masks()[i], y, 1, maskScratch_.data());
      std::byte* const row = plane.At(fresh.column, fresh.row + y);
      std::transform(maskScratch_.begin(), maskScratch_.end(), row, row,
                     [](std::byte a, std::byte b) { return std::min(a, b); });
    }
  }
}

void BlockReader::ReadLabels(const Fresh& fresh, Plane& plane) {
  if (!plane.Used()) return;
  fresh.ClearOutside(plane);
  if (fresh.inside.height == 0) return;
  request_.labels->Read(fresh.inside, plane.At(fresh.column, fresh.row), plane.Stride());
}

void BlockReader::MarkValid(const Fresh& fresh, WindowBuffers& buffers) {
  if (!needsValid_) return;
  fresh.ClearOutside(buffers.valid);
  const auto width = static_cast<std::size_t>(fresh.inside.width);
  const auto forEachRow = [&](auto&& work) {
    for (std::int64_t y = fresh.row; y < fresh.row + fresh.inside.height; ++y) {
      work(reinterpret_cast<std::uint8_t*>(buffers.valid.At(fresh.column, y)), y);
    }
  };
  forEachRow([&](std::uint8_t* valid, std::int64_t) { std::fill_n(valid, width, 1); });

  VisitAnySampleType(source_.Type().code, [&]<typename T>(std::type_identity<T>,
                                                          std::size_t parts) {
    const ValidityRow<T> rules(source_.Channels().size(), source_.Alphas().size(), parts, noData_);
    const auto samples = [&](std::int64_t y) {
      return reinterpret_cast<T*>(buffers.samples.At(fresh.column, y));
    };
    forEachRow([&](std::uint8_t* valid, std::int64_t y) {
      rules.ClearNaN(samples(y), valid, width);
      if (buffers.alphas.Used()) {
        rules.ClearTransparent(reinterpret_cast<const T*>(buffers.alphas.At(fresh.column, y)),
                               valid, width);
      }
      if (buffers.fileMask.Used()) {
        const std::byte* const mask = buffers.fileMask.At(fresh.column, y);
        for (std::size_t x = 0; x < width; ++x) {
          valid[x] = mask[x] == std::byte{0} ? std::uint8_t{0} : valid[x];
        }
      }
      if (request_.marksNoData) {
        rules.ClearNoData(samples(y), request_.exactNoData, valid, width);
      }
      rules.TranslateInvalid(valid, samples(y), width);
    });
    if (request_.mask != nullptr) {
      request_.mask->Exclude(
          fresh.inside, reinterpret_cast<std::uint8_t*>(buffers.valid.At(fresh.column, fresh.row)),
          buffers.valid.Stride());
      forEachRow([&](std::uint8_t* valid, std::int64_t y) {
        rules.TranslateNoData(valid, samples(y), width);
      });
    }
  });
}

void BlockReader::MarkWritable(WindowBuffers& buffers) {
  if (!needsWritable_) return;
  const auto width = static_cast<std::size_t>(buffers.window.width);
  for (std::int64_t y = 0; y < buffers.window.height; ++y) {
    std::byte* const row = buffers.writable.At(0, y);
    if (request_.protectsInvalid && needsValid_) {
      std::memcpy(row, buffers.valid.At(halo_, y + halo_), width);
    } else {
      std::fill_n(row, width, std::byte{1});
    }
  }
  if (request_.outputMask != nullptr) {
    request_.outputMask->Exclude(buffers.window,
                                 reinterpret_cast<std::uint8_t*>(buffers.writable.Data()),
                                 buffers.writable.Stride());
  }
}

void BlockReader::PrepareOutput(WindowBuffers& buffers) const {
  if (!buffers.output.Used()) return;
  const Plane& valid = buffers.valid;
  const bool noDataStays = !noData_.input.empty() && noData_.output.empty();
  for (std::int64_t y = 0; y < buffers.window.height; ++y) {
    const bool rowMasked =
        buffers.masked && std::memchr(valid.At(halo_, y + halo_), 0,
                                      static_cast<std::size_t>(buffers.window.width)) != nullptr;
    const bool rowProtected =
        needsWritable_ && std::memchr(buffers.writable.At(0, y), 0,
                                      static_cast<std::size_t>(buffers.window.width)) != nullptr;
    if (!rowMasked && !rowProtected && !noDataStays) continue;
    std::memcpy(buffers.output.At(0, y), buffers.samples.At(halo_, y + halo_),
                buffers.output.Stride());
  }
}

}  // namespace zarn::app
