// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/resample/directcopyrs.h"

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <functional>
#include <memory>

#include "processes/filters/framework/blockchecks.h"
#include "processes/filters/framework/blockview.h"
#include "processes/filters/framework/extendtypedispatch.h"
#include "processes/filters/framework/nodata.h"
#include "processes/filters/framework/parallel.h"

namespace zarn::processes::filters {
namespace {

// How rows are copied and zeroed.
struct cpu_memcpy {
  void operator()(void* to, const void* from, std::size_t bytes) const {
    std::memcpy(to, from, bytes);
  }
};
struct cpu_memset {
  void operator()(void* to, std::size_t bytes) const { std::memset(to, 0, bytes); }
};

// Blocks of fewer bytes are copied by one thread.
constexpr std::ptrdiff_t kSerialBytes = 1 << 20;

/// The part of the output that the input covers, and where it comes from.
struct Overlap {
  Overlap(const gobs::RasterInfo& input, const gobs::RasterInfo& output, int columnShift,
          int rowShift)
      : dx(std::int64_t{columnShift} + output.OriginX() - std::int64_t{input.OriginX()}),
        dy(std::int64_t{rowShift} + output.OriginY() - std::int64_t{input.OriginY()}),
        firstRow(std::clamp<std::int64_t>(-dy, 0, output.Height())),
        endRow(std::clamp<std::int64_t>(input.Height() - dy, 0, output.Height())),
        left(std::max<std::int64_t>(-dx, 0)),
        end(std::min<std::int64_t>(output.Width(), input.Width() - dx)) {}

  bool HasRows() const { return firstRow < endRow; }
  bool HasColumns() const { return left < end; }

  std::int64_t dx;
  std::int64_t dy;
  std::int64_t firstRow;
  std::int64_t endRow;
  std::int64_t left;
  std::int64_t end;
};

/// Writes the fill pixel, or nothing without one.
template <typename T, typename cpu_memset>
class Filler {
 public:
  Filler(const std::vector<double>* list, std::size_t channels, bool isComplex) {
    if (list == nullptr) return;
    pixel_ = ConvertNoData<T>(*list);
    const std::size_t samples = isComplex ? 2 * channels : channels;
    if (isComplex && pixel_.size() < samples) {
      std::vector<T> withImaginary(samples, T{0});
      for (std::size_t c = 0; c < channels; ++c) withImaginary[2 * c] = pixel_[c];
      pixel_ = withImaginary;
    }
    pixel_.resize(samples);
    isZero_ = std::all_of(pixel_.begin(), pixel_.end(), [](T v) { return v == T{0}; });
    isUniform_ =
        std::adjacent_find(pixel_.begin(), pixel_.end(), std::not_equal_to<T>()) == pixel_.end();
  }

  void operator()(T* to, std::int64_t pixels) const {
    if (pixel_.empty() || pixels <= 0) return;
    const std::size_t samples = static_cast<std::size_t>(pixels) * pixel_.size();
    if (isZero_) return cpu_memset()(to, samples * sizeof(T));
    if (isUniform_) {
      std::fill_n(to, samples, pixel_.front());
      return;
    }
    for (std::size_t i = 0; i < samples; i += pixel_.size()) {
      std::copy(pixel_.begin(), pixel_.end(), to + i);
    }
  }

 private:
  std::vector<T> pixel_;
  bool isZero_ = false;
  bool isUniform_ = false;
};

}  // namespace

namespace details {

template <typename T, typename cpu_memcpy, typename cpu_memset>
class DirectCopyProcBase : public IDirectCopyProc {
 public:
  void Copy(FilterResult& result, const gobs::Raster& input, gobs::Raster& output, int columnShift,
            int rowShift, const std::vector<double>* outputNoData) override {
    result = FilterResult::Success();
    const bool isComplex = output.Type().isComplex != 0;
    const Filler<T, cpu_memset> fill(outputNoData, output.Channels(), isComplex);
    const std::uint32_t samples = output.Channels() * (isComplex ? 2 : 1);
    const auto from =
        BlockView<const T>::Beside(input, static_cast<const T*>(input.Data()), samples);
    const auto to = BlockView<T>::Beside(output, static_cast<T*>(output.Data()), samples);
    const Overlap overlap(input, output, columnShift, rowShift);
    const std::int64_t width = output.Width();
    const std::int64_t height = output.Height();

    fill(to.Pixel(0, 0), width * overlap.firstRow);
    fill(to.Pixel(0, overlap.endRow), width * (height - overlap.endRow));
    if (!overlap.HasRows()) return;
    if (!overlap.HasColumns()) {
      return fill(to.Pixel(0, overlap.firstRow), width * (overlap.endRow - overlap.firstRow));
    }
    const std::size_t bytes =
        static_cast<std::size_t>(overlap.end - overlap.left) * samples * sizeof(T);
    const std::int64_t rows = overlap.endRow - overlap.firstRow;
    const bool shared = static_cast<std::ptrdiff_t>(bytes) * rows > kSerialBytes;
    parallel::ForEachRowBand(
        rows, shared ? parallel::BandCount(rows) : 1,
        [&](std::ptrdiff_t, std::ptrdiff_t begin, std::ptrdiff_t end) {
          for (std::int64_t y = overlap.firstRow + begin; y < overlap.firstRow + end; ++y) {
            cpu_memcpy()(to.Pixel(overlap.left, y),
                         from.Pixel(overlap.left + overlap.dx, y + overlap.dy), bytes);
            fill(to.Pixel(overlap.end, y), width - overlap.end);
            fill(to.Pixel(0, y), overlap.left);
          }
        });
  }
};

template <typename T>
class CPUDirectCopyProcessor : public DirectCopyProcBase<T, cpu_memcpy, cpu_memset> {};

}  // namespace details

FilterResult CPUDirectCopyRS::Process(const gobs::Raster& input, gobs::Raster& output,
                                      std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                      const std::uint8_t* /*inputMask*/) {
  using typedispatch::AllSampleTypes;
  const std::unique_ptr<details::IDirectCopyProc> processor(
      typedispatch::ExtendDispatchTypes<
          typedispatch::Factory1Template<details::CPUDirectCopyProcessor, details::IDirectCopyProc>,
          1, AllSampleTypes, AllSampleTypes, typedispatch::NullDataType>::Dispatch({input.Type()},
                                                                                   true));
  // The input list is not used, so its length does not matter.
  if (auto refusal = blockchecks::CheckBlocks(input, output, {}, outputNoData,
                                              blockchecks::Aliasing::kForbidden)) {
    return *refusal;
  }
  FilterResult result;
  processor->Copy(result, input, output, columnShift, rowShift,
                  outputNoData.empty() ? nullptr : &outputNoData);
  return result;
}

}  // namespace zarn::processes::filters
