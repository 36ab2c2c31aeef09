// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <type_traits>
#include <vector>

#include "host/utils/resampleinfo.h"

namespace zarn::testsupport {

/// An image of pixel-interleaved samples with its mask (empty: all valid).
template <typename T>
struct Picture {
  std::ptrdiff_t width = 0;
  std::ptrdiff_t height = 0;
  std::ptrdiff_t channels = 1;
  std::vector<T> samples = {};
  std::vector<unsigned char> mask = {};

  std::size_t Pixels() const { return static_cast<std::size_t>(width * height); }
  bool Valid(std::ptrdiff_t x, std::ptrdiff_t y) const {
    return mask.empty() || mask[static_cast<std::size_t>(y * width + x)] != 0;
  }
  T At(std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t c) const {
    return samples[static_cast<std::size_t>((y * width + x) * channels + c)];
  }
};

/// Bytes are computed in float.
template <typename T>
using SumOf = std::conditional_t<sizeof(T) == 1, float, double>;

template <typename Sum>
struct AxisWeights {
  std::ptrdiff_t first;
  std::vector<Sum> weights;
};

template <typename Sum>
AxisWeights<Sum> WeightsAt(double position, bool cubic) {
  const double left = std::floor(position - 0.5);
  const auto f = static_cast<Sum>(position - 0.5 - left);
  const auto first = static_cast<std::ptrdiff_t>(left);
  const Sum one = 1;
  const Sum half = one / 2;
  const Sum threeHalves = one + half;
  if (!cubic) return {first, {one - f, f}};
  return {first - 1,
          {((one - half * f) * f - half) * f, (threeHalves * f - (one + threeHalves)) * f * f + one,
           ((one + one - threeHalves * f) * f + half) * f, (half * f - half) * f * f}};
}

template <typename T>
T Rounded(double value) {
  if constexpr (std::is_floating_point_v<T>) {
    return static_cast<T>(value);
  } else {
    using Limits = std::numeric_limits<T>;
    const double nearest = std::nearbyint(value);
    if (nearest <= static_cast<double>(Limits::min())) return Limits::min();
    if (nearest >= static_cast<double>(Limits::max())) return Limits::max();
    return static_cast<T>(nearest);
  }
}

/// One pixel, or nothing when it is uncovered. Rows of weighted samples are summed from left to
/// right and then, weighted, from top to bottom.
template <typename T>
std::optional<std::vector<T>> ReferencePixel(const Picture<T>& image, utils::ResampleMethod method,
                                             double x, double y, std::optional<T> avoided) {
  if (!(x >= 0 && y >= 0 && x < static_cast<double>(image.width) &&
        y < static_cast<double>(image.height))) {
    return {};
  }
  const auto channels = static_cast<std::size_t>(image.channels);
  std::vector<T> pixel(channels);
  const bool onCentre = std::floor(x) + 0.5 == x && std::floor(y) + 0.5 == y;
  if (onCentre || method == utils::ResampleMethod::kNearest) {
    const auto column = static_cast<std::ptrdiff_t>(std::floor(x));
    const auto row = static_cast<std::ptrdiff_t>(std::floor(y));
    if (!image.Valid(column, row)) return {};
    for (std::size_t c = 0; c < channels; ++c) {
      pixel[c] = image.At(column, row, static_cast<std::ptrdiff_t>(c));
    }
    return pixel;
  }
  const bool cubic = method == utils::ResampleMethod::kCubic;
  using Sum = SumOf<T>;
  const AxisWeights<Sum> columns = WeightsAt<Sum>(x, cubic);
  const AxisWeights<Sum> rows = WeightsAt<Sum>(y, cubic);
  Sum existing = 0;
  Sum valid = 0;
  bool complete = true;
  std::vector<Sum> sums(channels, Sum{0});
  for (std::size_t j = 0; j < rows.weights.size(); ++j) {
    Sum existingInRow = 0;
    Sum validInRow = 0;
    std::vector<Sum> rowSums(channels, Sum{0});
    for (std::size_t i = 0; i < columns.weights.size(); ++i) {
      const std::ptrdiff_t column = columns.first + static_cast<std::ptrdiff_t>(i);
      const std::ptrdiff_t row = rows.first + static_cast<std::ptrdiff_t>(j);
      const bool exists = column >= 0 && row >= 0 && column < image.width && row < image.height;
      const Sum weight = columns.weights[i];
      if (exists) existingInRow += weight;
      if (weight == 0 || rows.weights[j] == 0) continue;
      if (!exists || !image.Valid(column, row)) {
        complete = false;
        continue;
      }
      validInRow += weight;
      for (std::size_t c = 0; c < channels; ++c) {
        rowSums[c] +=
            weight * static_cast<Sum>(image.At(column, row, static_cast<std::ptrdiff_t>(c)));
      }
    }
    existing += rows.weights[j] * existingInRow;
    valid += rows.weights[j] * validInRow;
    if (rows.weights[j] == 0) continue;
    for (std::size_t c = 0; c < channels; ++c) sums[c] += rows.weights[j] * rowSums[c];
  }
  if (!(valid > 0) || valid < existing / 2) return {};
  bool isAvoided = avoided.has_value();
  for (std::size_t c = 0; c < channels; ++c) {
    pixel[c] = Rounded<T>(complete ? sums[c] : sums[c] / valid);
    isAvoided = isAvoided && pixel[c] == *avoided;
  }
  for (std::size_t c = 0; c < channels && isAvoided; ++c) {
    if constexpr (std::is_floating_point_v<T>) {
      pixel[c] = std::nextafter(pixel[c], std::numeric_limits<T>::infinity());
    } else {
      pixel[c] =
          static_cast<T>(*avoided == std::numeric_limits<T>::max() ? *avoided - 1 : *avoided + 1);
    }
  }
  return pixel;
}

}  // namespace zarn::testsupport
