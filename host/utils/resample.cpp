// SPDX-License-Identifier: Apache-2.0
#include "host/utils/resample.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>
#include <memory>
#include <type_traits>
#include <vector>

#include "host/core/exception.h"
#include "host/gobs/saturatecast.h"
#include "host/sys/parallel.h"
#include "host/sys/vectorised.h"
#include "host/utils/realof.h"
#if ZARN_SIMD
#include "host/utils/resample_simd.h"
#endif

namespace zarn::utils {
namespace {

constexpr std::size_t kMostTaps = 4;

/// The pixels along one axis that a position draws on, and their weights.
template <typename Real>
struct Taps {
  std::ptrdiff_t first;
  std::size_t count;
  bool onCentre;  ///< the position is the centre of a pixel
  std::array<Real, kMostTaps> weights;
};

template <typename Real>
Taps<Real> BilinearTaps(double position) {
  const double t = position - 0.5;
  const double left = std::floor(t);
  const auto f = static_cast<Real>(t - left);
  return {static_cast<std::ptrdiff_t>(left), 2, t == left, {Real(1.0) - f, f}};
}

template <typename Real>
Taps<Real> CubicTaps(double position) {
  const double t = position - 0.5;
  const double left = std::floor(t);
  const auto f = static_cast<Real>(t - left);
  constexpr auto kHalf = Real(0.5);
  constexpr auto kThreeHalves = Real(1.5);
  return {static_cast<std::ptrdiff_t>(left) - 1,
          4,
          t == left,
          {((Real(1.0) - kHalf * f) * f - kHalf) * f,
           (kThreeHalves * f - Real(2.5)) * f * f + Real(1.0),
           ((Real(2.0) - kThreeHalves * f) * f + kHalf) * f, (kHalf * f - kHalf) * f * f}};
}

/// A computed value as a sample.
template <typename T>
T ToSample(RealOf<T> value) {
  if constexpr (std::is_floating_point_v<T>) {
    return static_cast<T>(value);
  } else {
    return gobs::SaturateCast<T>(static_cast<double>(std::nearbyint(value)));
  }
}

template <typename T>
T OneStepOff(T value) {
  using Limits = std::numeric_limits<T>;
  const bool up = value < Limits::max();
  if constexpr (std::is_floating_point_v<T>) {
    return std::nextafter(value, up ? Limits::infinity() : -Limits::infinity());
  } else {
    return static_cast<T>(up ? value + 1 : value - 1);
  }
}

/// The source; the parts of complex samples count as samples.
template <typename T>
struct Source {
  bool Contains(double x, double y) const {
    return x >= 0.0 && y >= 0.0 && x < static_cast<double>(width) &&
           y < static_cast<double>(height);
  }
  bool Exists(std::ptrdiff_t column, std::ptrdiff_t row) const {
    return column >= 0 && row >= 0 && column < width && row < height;
  }
  bool IsValid(std::ptrdiff_t column, std::ptrdiff_t row) const {
    return mask == nullptr || mask[row * width + column] != 0;
  }
  const T* Pixel(std::ptrdiff_t column, std::ptrdiff_t row) const {
    return samples + (row * width + column) * channels;
  }

  const T* samples;
  const unsigned char* mask;
  std::ptrdiff_t width;
  std::ptrdiff_t height;
  std::ptrdiff_t channels;
};

/// The weights of the pixels around a position, 0 for those that take no part.
template <typename Real>
class Weights {
 public:
  template <typename T>
  Weights(const Source<T>& source, const Taps<Real>& columns, const Taps<Real>& rows)
      : columns_(columns), rows_(rows) {
    Real existing = 0;
    for (std::size_t j = 0; j < rows.count; ++j) {
      Real existingInRow = 0;
      Real validInRow = 0;
      for (std::size_t i = 0; i < columns.count; ++i) {
        const std::ptrdiff_t column = columns.first + static_cast<std::ptrdiff_t>(i);
        const std::ptrdiff_t row = rows.first + static_cast<std::ptrdiff_t>(j);
        Real weight = columns.weights[i];
        const bool exists = source.Exists(column, row);
        if (exists) existingInRow += weight;
        if (!exists || !source.IsValid(column, row)) {
          complete_ = complete_ && (weight == 0 || rows.weights[j] == 0);
          weight = 0;
        }
        validInRow += weight;
        inRow_[j][i] = weight;
      }
      existing += rows.weights[j] * existingInRow;
      valid_ += rows.weights[j] * validInRow;
    }
    covers_ = valid_ > 0 && valid_ >= Real(0.5) * existing;
  }

  bool Covers() const { return covers_; }

  /// Sample `c` of the pixel.
  template <typename T>
  Real Apply(const Source<T>& source, std::ptrdiff_t c) const {
    Real sum = 0;
    for (std::size_t j = 0; j < rows_.count; ++j) {
      if (rows_.weights[j] == 0) continue;
      Real rowSum = 0;
      for (std::size_t i = 0; i < columns_.count; ++i) {
        if (inRow_[j][i] == 0) continue;
        const T* const pixel = source.Pixel(columns_.first + static_cast<std::ptrdiff_t>(i),
                                            rows_.first + static_cast<std::ptrdiff_t>(j));
        rowSum += inRow_[j][i] * static_cast<Real>(pixel[c]);
      }
      sum += rows_.weights[j] * rowSum;
    }
    return complete_ ? sum : sum / valid_;
  }

 private:
  const Taps<Real>& columns_;
  const Taps<Real>& rows_;
  std::array<std::array<Real, kMostTaps>, kMostTaps> inRow_{};
  Real valid_ = 0;
  bool complete_ = true;  ///< nothing that has a weight is missing
  bool covers_ = false;
};

/// The definition of one pixel.
template <typename T>
class Interpolator {
 public:
  using Real = RealOf<T>;

  Interpolator(const Source<T>& source, bool cubic, const std::vector<T>& noData)
      : source_(source), tapsAt_(cubic ? CubicTaps<Real> : BilinearTaps<Real>), noData_(noData) {}

  /// Writes the pixel at a position, unless it is uncovered.
  bool operator()(double x, double y, T* pixel) const {
    if (!source_.Contains(x, y)) return false;
    const Taps<Real> columns = tapsAt_(x);
    const Taps<Real> rows = tapsAt_(y);
    if (columns.onCentre && rows.onCentre) {
      const auto column = static_cast<std::ptrdiff_t>(x);
      const auto row = static_cast<std::ptrdiff_t>(y);
      if (!source_.IsValid(column, row)) return false;
      std::copy_n(source_.Pixel(column, row), source_.channels, pixel);
      return true;
    }
    const Weights<Real> weights(source_, columns, rows);
    if (!weights.Covers()) return false;
    for (std::ptrdiff_t c = 0; c < source_.channels; ++c) {
      pixel[c] = ToSample<T>(weights.Apply(source_, c));
    }
    if (!noData_.empty() && std::equal(noData_.begin(), noData_.end(), pixel)) {
      std::transform(noData_.begin(), noData_.end(), pixel, OneStepOff<T>);
    }
    return true;
  }

 private:
  Source<T> source_;
  Taps<Real> (*tapsAt_)(double);
  const std::vector<T>& noData_;
};

// Columns that are filled together, row by row.
constexpr std::ptrdiff_t kStrip = 512;

template <typename T>
struct Target {
  T* Pixel(std::ptrdiff_t i) const { return samples + i * channels; }
  void Settle(std::ptrdiff_t i, bool covered) const {
    if (!covered) std::copy(noData.begin(), noData.end(), Pixel(i));
    if (mask != nullptr) mask[i] = covered ? 1 : 0;
  }

  T* samples;
  unsigned char* mask;
  std::ptrdiff_t width;
  std::ptrdiff_t height;
  std::ptrdiff_t channels;
  const std::vector<T>& noData;  ///< empty: uncovered pixels stay as they are
};

// The pixels that positions lie in; -1 for those outside.
ZARN_VECTORISED
void FindPixels(const double* x, const double* y, std::ptrdiff_t count, int width, int height,
                int* columns, int* rows) {
  const double right = width;
  const double bottom = height;
  for (std::ptrdiff_t i = 0; i < count; ++i) {
    const bool inside = (x[i] >= 0.0) & (y[i] >= 0.0) & (x[i] < right) & (y[i] < bottom);
    columns[i] = static_cast<int>(inside ? x[i] : -1.0);
    rows[i] = static_cast<int>(inside ? y[i] : -1.0);
  }
}

/// Rows of the nearest pixels. Pixels of a known number of bytes are copied fastest; 0 stands for
/// any number.
template <typename T, std::size_t kBytes>
class NearestRows {
 public:
  NearestRows(const Source<T>& source, const Target<T>& target)
      : source_(source), target_(target) {}

  void operator()(std::ptrdiff_t first, const double* x, const double* y, std::ptrdiff_t count,
                  std::ptrdiff_t ahead) {
    FindPixels(x, y, count, static_cast<int>(source_.width), static_cast<int>(source_.height),
               columns_.data(), rows_.data());
    Copy(first, count, ahead);
  }

 private:
  // Bytes may be anything to the compiler: what the loop needs stands in variables of its own.
  void Copy(std::ptrdiff_t first, std::ptrdiff_t count, std::ptrdiff_t ahead) const {
    const Source<T> from = source_;
    T* const to = target_.Pixel(first);
    const int* const columns = columns_.data();
    const int* const rows = rows_.data();
    const std::ptrdiff_t channels =
        kBytes != 0 ? static_cast<std::ptrdiff_t>(kBytes / sizeof(T)) : from.channels;
    const std::ptrdiff_t last = std::max<std::ptrdiff_t>(from.width * from.height - 1, 0);
    const bool settles = target_.mask != nullptr;
    for (std::ptrdiff_t i = 0; i < count; ++i) {
      const std::ptrdiff_t index = rows[i] * from.width + columns[i];
      if (i % 4 == 0) {
        const std::ptrdiff_t soon = std::clamp<std::ptrdiff_t>(index + ahead, 0, last);
        __builtin_prefetch(from.samples + soon * channels);
      }
      const bool covered = columns[i] >= 0 && (from.mask == nullptr || from.mask[index] != 0);
      if (covered) {
        std::memcpy(to + i * channels, from.samples + index * channels,
                    static_cast<std::size_t>(channels) * sizeof(T));
      }
      if (!covered || settles) target_.Settle(first + i, covered);
    }
  }

  Source<T> source_;
  Target<T> target_;
  std::array<int, kStrip> columns_{};
  std::array<int, kStrip> rows_{};
};

/// Rows of interpolated pixels, in runs where the machine has vectors for the sample type.
template <typename T>
class InterpolatedRows {
 public:
  InterpolatedRows(const Source<T>& source, const Target<T>& target, bool cubic)
      : source_(source),
        target_(target),
        cubic_(cubic),
        interpolate_(source, cubic, target.noData) {
#if ZARN_SIMD
    if (!kHasKernel || !HasResampleVectors()) return;
    scratch_ = std::make_unique<RunScratch>();
    pixels_.resize(kResampleRun * static_cast<std::size_t>(source.channels));
#endif
  }

  void operator()(std::ptrdiff_t first, const double* x, const double* y, std::ptrdiff_t count,
                  [[maybe_unused]] std::ptrdiff_t ahead) {
#if ZARN_SIMD
    if constexpr (kHasKernel) {
      if (scratch_) {
        constexpr auto kRun = static_cast<std::ptrdiff_t>(kResampleRun);
        for (std::ptrdiff_t begin = 0; begin < count; begin += kRun) {
          FillRun(first + begin, x + begin, y + begin, std::min(count - begin, kRun), ahead);
        }
        return;
      }
    }
#endif
    for (std::ptrdiff_t i = 0; i < count; ++i) FillPixel(first + i, x[i], y[i]);
  }

 private:
  void FillPixel(std::ptrdiff_t i, double x, double y) const {
    target_.Settle(i, interpolate_(x, y, target_.Pixel(i)));
  }

#if ZARN_SIMD
  static constexpr bool kHasKernel = sizeof(T) <= 4 || std::is_same_v<T, double>;

  void FillRun(std::ptrdiff_t first, const double* x, const double* y, std::ptrdiff_t count,
               std::ptrdiff_t ahead) {
    const KernelSource source{reinterpret_cast<const std::byte*>(source_.samples),
                              source_.mask,
                              source_.width,
                              source_.height,
                              static_cast<std::size_t>(source_.channels),
                              ahead};
    InterpolateRun(source, cubic_, x, y, static_cast<std::size_t>(count), *scratch_, pixels_.data(),
                   states_.data());
    if (!target_.noData.empty() && HasNoData(count)) LeaveNoData(count);
    for (std::ptrdiff_t i = 0; i < count;) {
      const std::ptrdiff_t end = EndOfState(i, count);
      const RunPixel state = states_[static_cast<std::size_t>(i)];
      if (state == RunPixel::kDone) {
        std::copy(pixels_.data() + i * target_.channels, pixels_.data() + end * target_.channels,
                  target_.Pixel(first + i));
        if (target_.mask != nullptr)
          std::fill(target_.mask + first + i, target_.mask + first + end, std::uint8_t{1});
        i = end;
      }
      for (; i < end; ++i) {
        if (state == RunPixel::kUncovered) {
          target_.Settle(first + i, false);
        } else {
          FillPixel(first + i, x[i], y[i]);
        }
      }
    }
  }

  // The end of the pixels from i on of which the same has become.
  std::ptrdiff_t EndOfState(std::ptrdiff_t i, std::ptrdiff_t count) const {
    const RunPixel* const states = states_.data();
    const RunPixel state = states[i];
    // Mostly all are done.
    std::array<RunPixel, 8> same;
    same.fill(state);
    for (; i + 8 <= count && std::memcmp(states + i, same.data(), 8) == 0; i += 8) {
    }
    while (i < count && states[i] == state) ++i;
    return i;
  }

  // Whether a pixel of the run may be the no-data value, going by all samples alike.
  bool HasNoData(std::ptrdiff_t count) const {
    const T noData = target_.noData.front();
    const T* const samples = pixels_.data();
    const std::ptrdiff_t end = count * target_.channels;
    bool found = false;
    for (std::ptrdiff_t i = 0; i < end; ++i) found |= samples[i] == noData;
    return found;
  }

  // The definition moves computed pixels off the no-data value, but not those that it copies.
  void LeaveNoData(std::ptrdiff_t count) {
    for (std::ptrdiff_t i = 0; i < count; ++i) {
      RunPixel& state = states_[static_cast<std::size_t>(i)];
      if (state == RunPixel::kDone && std::equal(target_.noData.begin(), target_.noData.end(),
                                                 pixels_.data() + i * target_.channels)) {
        state = RunPixel::kLeft;
      }
    }
  }

  std::unique_ptr<RunScratch> scratch_;
  std::vector<T> pixels_;
  std::array<RunPixel, kResampleRun> states_{};
#endif

  Source<T> source_;
  Target<T> target_;
  [[maybe_unused]] bool cubic_;
  Interpolator<T> interpolate_;
};

/// Guesses how many pixels of the source lie between what a row draws on and what a later one will,
/// for asking for memory ahead: a turned row takes pixels from many rows, which the machine does
/// not foresee.
class LookAhead {
 public:
  explicit LookAhead(std::ptrdiff_t sourceWidth) : width_(static_cast<double>(sourceWidth)) {}

  /// `x` and `y` are the position of the same pixel of every row.
  std::ptrdiff_t operator()(double x, double y) {
    constexpr double kRows = 2.0;
    constexpr double kFar = 0x1p40;
    const double index = y * width_ + x;
    const double ahead = kRows * (index - last_);
    last_ = index;
    return std::abs(ahead) < kFar ? static_cast<std::ptrdiff_t>(ahead) : 0;
  }

 private:
  double width_;
  double last_ = 0.0;
};

/// Fills the target by what `makeRows` makes, one for each thread: strip by strip, so that what a
/// row draws on is still in the cache when the next row does.
template <typename T, typename MakeRows>
void FillRows(const Target<T>& target, std::ptrdiff_t sourceWidth, IBufPosTfm& transform,
              const MakeRows& makeRows) {
  struct Worker {
    decltype(makeRows()) fill;
    // Vectors read beyond the end.
    std::array<double, kStrip + 64> x{};
    std::array<double, kStrip + 64> y{};
  };
  const std::ptrdiff_t bands =
      transform.IsConcurrent() ? sys::parallel::BandCount(target.height) : 1;
  std::vector<Worker> workers;
  workers.reserve(static_cast<std::size_t>(bands));
  while (workers.size() < workers.capacity()) workers.push_back({makeRows()});
  sys::parallel::ForEachRowBandRethrowing(
      target.height, bands, [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
        auto& [fill, x, y] = workers[static_cast<std::size_t>(band)];
        for (std::ptrdiff_t column = 0; column < target.width; column += kStrip) {
          const std::ptrdiff_t count = std::min(target.width - column, kStrip);
          const auto middle = static_cast<std::size_t>(count / 2);
          LookAhead ahead(sourceWidth);
          for (std::ptrdiff_t row = begin; row < end; ++row) {
            transform.Transform(static_cast<int>(column), static_cast<int>(row),
                                static_cast<int>(count), x.data(), y.data());
            fill(row * target.width + column, x.data(), y.data(), count,
                 ahead(x[middle], y[middle]));
          }
        }
      });
}

// What uncovered pixels become; empty when they stay as they are.
template <typename T>
std::vector<T> NoDataPixel(const ResampleInfo& info, std::ptrdiff_t channels, bool isComplex) {
  if (!info.hasNoData) return {};
  std::vector<T> pixel(static_cast<std::size_t>(channels), T{0});
  const std::size_t step = isComplex ? 2 : 1;
  for (std::size_t i = 0; i < pixel.size(); i += step) {
    pixel[i] =
        gobs::RoundToSample<T>(info.noDataPixel.empty() ? info.noData : info.noDataPixel[i / step]);
  }
  return pixel;
}

template <typename T>
Source<T> SourceOf(const ResampleBuffer& buffer, std::ptrdiff_t channels) {
  return {reinterpret_cast<const T*>(buffer.Data()), buffer.Mask(), buffer.Width(), buffer.Height(),
          channels};
}
template <typename T>
Target<T> TargetOf(ResampleBuffer& buffer, std::ptrdiff_t channels, const std::vector<T>& noData) {
  return {reinterpret_cast<T*>(buffer.Data()),
          buffer.Mask(),
          buffer.Width(),
          buffer.Height(),
          channels,
          noData};
}

// Only the size of samples matters to those that are copied.
template <typename Bits>
void CopyNearest(const ResampleBuffer& source, ResampleBuffer& destination, IBufPosTfm& transform,
                 std::ptrdiff_t channels, const std::vector<Bits>& noData) {
  const Source<Bits> from = SourceOf<Bits>(source, channels);
  const Target<Bits> to = TargetOf(destination, channels, noData);
  const auto fill = [&]<std::size_t kBytes>(std::integral_constant<std::size_t, kBytes>) {
    FillRows(to, from.width, transform, [&] { return NearestRows<Bits, kBytes>(from, to); });
  };
  switch (channels) {
    case 1:
      return fill(std::integral_constant<std::size_t, sizeof(Bits)>());
    case 3:
      return fill(std::integral_constant<std::size_t, 3 * sizeof(Bits)>());
    case 4:
      return fill(std::integral_constant<std::size_t, 4 * sizeof(Bits)>());
    default:
      return fill(std::integral_constant<std::size_t, 0>());
  }
}

template <std::size_t kBytes>
using BitsOfSize = std::conditional_t<
    kBytes == 1, std::uint8_t,
    std::conditional_t<kBytes == 2, std::uint16_t,
                       std::conditional_t<kBytes == 4, std::uint32_t, std::uint64_t>>>;

template <typename T>
void ResampleAs(const ResampleBuffer& source, ResampleBuffer& destination, IBufPosTfm& transform,
                const ResampleInfo& info, bool isComplex) {
  const std::ptrdiff_t channels = std::ptrdiff_t{source.Channels()} * (isComplex ? 2 : 1);
  const std::vector<T> noData = NoDataPixel<T>(info, channels, isComplex);
  if (info.method == ResampleMethod::kNearest) {
    using Bits = BitsOfSize<sizeof(T)>;
    std::vector<Bits> bits(noData.size());
    std::transform(noData.begin(), noData.end(), bits.begin(), std::bit_cast<Bits, T>);
    CopyNearest(source, destination, transform, channels, bits);
    return;
  }
  const Source<T> from = SourceOf<T>(source, channels);
  const Target<T> to = TargetOf(destination, channels, noData);
  FillRows(to, from.width, transform,
           [&] { return InterpolatedRows<T>(from, to, info.method == ResampleMethod::kCubic); });
}

bool HasPixels(const ResampleBuffer& buffer) {
  return buffer.Width() > 0 && buffer.Height() > 0 && buffer.Channels() > 0;
}

void RequireUsable(const ResampleBuffer& buffer) {
  if (buffer.Width() < 0 || buffer.Height() < 0 || buffer.Channels() < 0 ||
      (HasPixels(buffer) && buffer.Data() == nullptr)) {
    throw DataException("Resampling buffer has no data or an inconsistent size.");
  }
}

}  // namespace

void Resample(const ResampleBuffer& source, ResampleBuffer& destination, IBufPosTfm* transform,
              const ResampleInfo& info) {
  using enum gobs::NativeDataTypeCode;
  if (transform == nullptr) throw DataException("Resampling needs a position transform.");
  if (info.method != ResampleMethod::kNearest && info.method != ResampleMethod::kBilinear &&
      info.method != ResampleMethod::kCubic) {
    throw DataException("Unknown resampling method.");
  }
  if (source.Type() != destination.Type() || source.Channels() != destination.Channels()) {
    throw DataException("Resampling buffers differ in data type or number of channels.");
  }
  if (!info.noDataPixel.empty() &&
      info.noDataPixel.size() != static_cast<std::size_t>(source.Channels())) {
    throw DataException("Resampling needs one no-data value per channel.");
  }
  RequireUsable(source);
  RequireUsable(destination);
  const auto resample = [&]<typename T>(std::type_identity<T>, bool isComplex = false) {
    if (HasPixels(destination)) ResampleAs<T>(source, destination, *transform, info, isComplex);
  };
  switch (source.Type()) {
    case kUInt8:
      return resample(std::type_identity<std::uint8_t>());
    case kInt8:
      return resample(std::type_identity<std::int8_t>());
    case kUInt16:
      return resample(std::type_identity<std::uint16_t>());
    case kInt16:
      return resample(std::type_identity<std::int16_t>());
    case kUInt32:
      return resample(std::type_identity<std::uint32_t>());
    case kInt32:
      return resample(std::type_identity<std::int32_t>());
    case kFloat32:
      return resample(std::type_identity<float>());
    case kInt64:
      return resample(std::type_identity<std::int64_t>());
    case kUInt64:
      return resample(std::type_identity<std::uint64_t>());
    case kFloat64:
      return resample(std::type_identity<double>());
    case kComplexInt16:
      return resample(std::type_identity<std::int16_t>(), true);
    case kComplexInt32:
      return resample(std::type_identity<std::int32_t>(), true);
    case kComplexFloat32:
      return resample(std::type_identity<float>(), true);
    case kComplexFloat64:
      return resample(std::type_identity<double>(), true);
    default:
      throw DataException("Unknown data type for resampling.");
  }
}

}  // namespace zarn::utils
