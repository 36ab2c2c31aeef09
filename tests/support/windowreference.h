// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <vector>

#include "tests/support/conversionreference.h"
#include "tests/support/orderreference.h"
#include "tests/support/testblock.h"

namespace zarn::testsupport {

struct WindowParameters {
  int kernelSize = 3;
  std::optional<double> background = {};
  std::vector<double> inputNoData = {};
  std::vector<double> outputNoData = {};
};

/// Which pixels of a block a window filter looks at and which it leaves alone, in plain loops.
/// `mask` is empty or has a byte for each pixel of the full input block.
template <typename T>
class ReferencePixels {
 public:
  ReferencePixels(const WindowParameters& parameters, const TestBlock<T>& input,
                  const std::vector<std::uint8_t>& mask)
      : input_(input),
        mask_(mask),
        hasBackground_(parameters.background.has_value()),
        background_(ReferenceBackground<T>(parameters.background.value_or(0))) {
    for (const double v : parameters.inputNoData) noData_.push_back(ReferenceListEntry<T>(v));
    for (const double v : parameters.outputNoData) written_.push_back(ReferenceListEntry<T>(v));
  }

  bool IsMasked(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return !mask_.empty() && mask_[static_cast<std::size_t>(input_.shape().PixelIndex(x, y))] == 0;
  }
  bool IsNoData(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return !noData_.empty() && Count(x, y, [&](std::size_t c) { return noData_[c]; });
  }
  bool IsBackground(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return hasBackground_ && Count(x, y, [&](std::size_t) { return background_; });
  }
  bool Counts(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return !IsMasked(x, y) && !IsNoData(x, y) && !IsBackground(x, y);
  }
  T Background() const { return background_; }
  /// What no-data pixels become; empty: they stay unwritten.
  const std::vector<T>& Written() const { return written_; }

 private:
  template <class ValueOf>
  bool Count(std::ptrdiff_t x, std::ptrdiff_t y, const ValueOf& valueOf) const {
    std::size_t equal = 0;
    for (std::size_t c = 0; c < input_.shape().channels; ++c) {
      if (input_.Pixel(x, y)[c] == valueOf(c)) ++equal;
    }
    return equal == input_.shape().channels;
  }

  const TestBlock<T>& input_;
  const std::vector<std::uint8_t>& mask_;
  bool hasBackground_;
  T background_;
  std::vector<T> noData_;
  std::vector<T> written_;
};

/// What the filters over the samples of a window have in common. `output` keeps what it holds where
/// the filter does not write. `compute(channel, centre, visit)` makes a sample; its `visit(use)`
/// calls `use(dx, dy, sample)` for those that count.
template <typename T, class Compute>
void ReferenceWindows(const WindowParameters& parameters, const TestBlock<T>& input,
                      const std::vector<std::uint8_t>& mask, TestBlock<T>& output,
                      const Compute& compute) {
  const auto half = static_cast<std::ptrdiff_t>(parameters.kernelSize / 2);
  const std::size_t channels = input.shape().channels;
  const ReferencePixels<T> pixels(parameters, input, mask);
  const auto width = static_cast<std::ptrdiff_t>(output.shape().width);
  const auto height = static_cast<std::ptrdiff_t>(output.shape().height);
  const std::ptrdiff_t windowedWidth = width + 2 * half;
  std::vector<char> counts(static_cast<std::size_t>(windowedWidth * (height + 2 * half)));
  const auto countsAt = [&](std::ptrdiff_t x, std::ptrdiff_t y) -> char& {
    return counts[static_cast<std::size_t>((y + half) * windowedWidth + x + half)];
  };
  for (std::ptrdiff_t y = -half; y < height + half; ++y) {
    for (std::ptrdiff_t x = -half; x < width + half; ++x) countsAt(x, y) = pixels.Counts(x, y);
  }

  for (std::ptrdiff_t y = 0; y < height; ++y) {
    for (std::ptrdiff_t x = 0; x < width; ++x) {
      if (pixels.IsMasked(x, y)) continue;
      if (pixels.IsNoData(x, y)) {
        for (std::size_t c = 0; c < channels && !pixels.Written().empty(); ++c) {
          output.Pixel(x, y)[c] = pixels.Written()[c];
        }
        continue;
      }
      if (pixels.IsBackground(x, y)) {
        for (std::size_t c = 0; c < channels; ++c) output.Pixel(x, y)[c] = pixels.Background();
        continue;
      }
      for (std::size_t c = 0; c < channels; ++c) {
        const auto visit = [&](auto&& use) {
          for (std::ptrdiff_t dy = -half; dy <= half; ++dy) {
            for (std::ptrdiff_t dx = -half; dx <= half; ++dx) {
              if (countsAt(x + dx, y + dy)) use(dx, dy, input.Pixel(x + dx, y + dy)[c]);
            }
          }
        };
        output.Pixel(x, y)[c] = compute(c, input.Pixel(x, y)[c], visit);
      }
    }
  }
}

template <typename T>
void ReferenceAverage(const WindowParameters& parameters, const TestBlock<T>& input,
                      const std::vector<std::uint8_t>& mask, TestBlock<T>& output) {
  ReferenceWindows(parameters, input, mask, output, [&](std::size_t c, T, const auto& visit) {
    double sum = 0;
    unsigned count = 0;
    visit([&](std::ptrdiff_t, std::ptrdiff_t, T sample) {
      sum += static_cast<double>(sample);
      ++count;
    });
    std::optional<double> avoided;
    if (!parameters.outputNoData.empty()) avoided = parameters.outputNoData[c];
    return ReferenceResult<T>(sum / count, static_cast<double>(std::numeric_limits<T>::lowest()),
                              static_cast<double>(std::numeric_limits<T>::max()), avoided);
  });
}

template <typename T>
void ReferenceMedian(const WindowParameters& parameters, const TestBlock<T>& input,
                     const std::vector<std::uint8_t>& mask, TestBlock<T>& output) {
  std::vector<T> samples;
  ReferenceWindows(parameters, input, mask, output, [&](std::size_t, T, const auto& visit) {
    samples.clear();
    visit([&](std::ptrdiff_t, std::ptrdiff_t, T sample) { samples.push_back(sample); });
    std::sort(samples.begin(), samples.end(), ReferenceOrder<T>);
    const std::size_t n = samples.size();
    return samples[n % 2 != 0 ? n / 2 : n / 2 - 1];
  });
}

template <typename T>
void ReferenceNoise(const WindowParameters& parameters, const TestBlock<T>& input,
                    const std::vector<std::uint8_t>& mask, TestBlock<T>& output) {
  const T removed = ReferenceBackground<T>(parameters.background.value_or(0));
  ReferenceWindows(parameters, input, mask, output, [&](std::size_t, T centre, const auto& visit) {
    int n = 0;
    int k = 0;
    double s = 0;
    double q = 0;
    visit([&](std::ptrdiff_t dx, std::ptrdiff_t dy, T sample) {
      const auto v = static_cast<double>(sample);
      ++n;
      if (dx >= -1 && dx <= 1 && dy >= -1 && dy <= 1) ++k;
      s += v;
      q += v * v;
    });
    if (n < 2 || k < 3) return removed;
    const double mean = s / n;
    const double sd = std::sqrt((q - n * mean * mean) / (n - 1));
    const bool isNoise = std::fabs(static_cast<double>(centre)) > std::fabs(1.5 * sd + mean);
    return isNoise ? removed : centre;
  });
}

template <typename T>
void ReferenceBlobs(const WindowParameters& parameters, const TestBlock<T>& input,
                    const std::vector<std::uint8_t>& mask, TestBlock<T>& output) {
  const auto half = static_cast<std::ptrdiff_t>(parameters.kernelSize / 2);
  const auto width = static_cast<std::ptrdiff_t>(output.shape().width);
  const auto height = static_cast<std::ptrdiff_t>(output.shape().height);
  const ReferencePixels<T> pixels(parameters, input, mask);
  using Map = std::vector<char>;
  const auto at = [&](std::ptrdiff_t x, std::ptrdiff_t y) {
    return static_cast<std::size_t>(y * width + x);
  };
  // Whether the square around (x, y) has a pixel of that kind; outside of the block all are 0.
  const auto isNear = [&](const Map& map, char kind, std::ptrdiff_t x, std::ptrdiff_t y) {
    for (std::ptrdiff_t ny = y - half; ny <= y + half; ++ny) {
      for (std::ptrdiff_t nx = x - half; nx <= x + half; ++nx) {
        const bool inside = nx >= 0 && nx < width && ny >= 0 && ny < height;
        if ((inside ? map[at(nx, ny)] : 0) == kind) return true;
      }
    }
    return false;
  };
  const auto forEach = [&](auto&& use) {
    for (std::ptrdiff_t y = 0; y < height; ++y) {
      for (std::ptrdiff_t x = 0; x < width; ++x) use(x, y);
    }
  };
  Map data(static_cast<std::size_t>(width * height));
  Map eroded(data.size());
  forEach([&](std::ptrdiff_t x, std::ptrdiff_t y) {
    if (pixels.IsMasked(x, y)) return;
    data[at(x, y)] = pixels.IsNoData(x, y) ? !pixels.Written().empty() : !pixels.IsBackground(x, y);
  });
  forEach([&](std::ptrdiff_t x, std::ptrdiff_t y) { eroded[at(x, y)] = !isNear(data, 0, x, y); });
  forEach([&](std::ptrdiff_t x, std::ptrdiff_t y) {
    const bool stays = !pixels.Counts(x, y) || isNear(eroded, 1, x, y);
    for (std::size_t c = 0; c < input.shape().channels; ++c) {
      output.Pixel(x, y)[c] = stays ? input.Pixel(x, y)[c] : pixels.Background();
    }
  });
}

}  // namespace zarn::testsupport
