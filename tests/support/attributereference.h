// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <type_traits>
#include <utility>
#include <vector>

#include "host/gobs/raster.h"
#include "processes/filters/attribute/filteralgo.h"
#include "tests/support/orderreference.h"

// The attribute filters as plain loops: what the tests compare with, and what the benchmarks race.

namespace zarn::testsupport {

struct AttributeParameters {
  processes::filters::FILTERALGO algo = processes::filters::FILTERALGO::kAverage;
  int size = 3;
  bool disc = false;
  bool useNoData = false;
  double noDataValue = 0.0;
  bool useAttributes = true;
  double attrNoDataValue = 0.0;
  double attrTolerance = 1e-6;
  int scale = 1;
};

inline std::vector<std::pair<int, int>> ReferenceCells(const AttributeParameters& parameters) {
  std::vector<std::pair<int, int>> cells;
  const int half = parameters.size / 2;
  const double most = 0.25 * parameters.size * parameters.size;
  for (int dx = -half; dx <= half && parameters.size > 0; ++dx) {
    for (int dy = -half; dy <= half; ++dy) {
      if (!parameters.disc || dx * dx + dy * dy <= most) cells.emplace_back(dx, dy);
    }
  }
  return cells;
}

/// Truncation towards zero, saturated.
template <typename T>
T ReferenceTruncation(double value) {
  if constexpr (std::is_floating_point_v<T>) {
    return static_cast<T>(value);
  } else {
    if (std::isnan(value)) return 0;
    return static_cast<T>(std::clamp(value, static_cast<double>(std::numeric_limits<T>::min()),
                                     static_cast<double>(std::numeric_limits<T>::max())));
  }
}

template <typename T>
bool ReferenceEqual(T a, T b) {
  if constexpr (std::is_floating_point_v<T>) {
    return std::fabs(static_cast<double>(a) - static_cast<double>(b)) < 2.220446049250313e-16;
  } else {
    return a == b;
  }
}

/// Whether a neighbour's label passes beside the centre's.
template <typename A>
bool ReferenceShares(A centre, A neighbour, A noData, A tolerance) {
  if (ReferenceEqual(centre, noData) || ReferenceEqual(neighbour, noData)) return true;
  if constexpr (std::is_floating_point_v<A>) {
    const A d = neighbour - centre;
    return !(d > tolerance) && !(tolerance + d < 0);
  } else {
    const A d = static_cast<A>(static_cast<std::int64_t>(neighbour) - centre);
    const auto wide = static_cast<std::int64_t>(d);
    return wide <= tolerance && (std::is_unsigned_v<A> || tolerance + wide >= 0);
  }
}

template <typename T>
T ReferenceStatistic(processes::filters::FILTERALGO algo, std::vector<T>& pool) {
  using processes::filters::FILTERALGO;
  const std::size_t n = pool.size();
  if (algo == FILTERALGO::kMedian) {
    const auto middle = pool.begin() + static_cast<std::ptrdiff_t>((n - 1) / 2);
    std::nth_element(pool.begin(), middle, pool.end(), ReferenceOrder<T>);
    return *middle;
  }
  std::size_t k = 0;
  if (algo == FILTERALGO::kTrimmedMean) {
    k = static_cast<std::size_t>(std::floor(static_cast<double>(n) * 0.25));
    std::sort(pool.begin(), pool.end(), ReferenceOrder<T>);
  }
  double sum = 0;
  for (std::size_t i = k; i < n - k; ++i) sum += static_cast<double>(pool[i]);
  return ReferenceTruncation<T>(sum / static_cast<double>(n - 2 * k));
}

/// One block; `out` keeps what it holds where nothing is written. The masks may be null.
template <typename T, typename A>
void ReferenceAttributeFilter(const AttributeParameters& parameters, const gobs::Raster& in,
                              const gobs::Raster& attr, gobs::Raster& out,
                              const std::uint8_t* inputMask, const std::uint8_t* outputMask) {
  const std::vector<std::pair<int, int>> cells = ReferenceCells(parameters);
  const auto* const input = static_cast<const T*>(in.Data());
  const auto* const labels = static_cast<const A*>(attr.Data());
  auto* const output = static_cast<T*>(out.Data());
  const auto channels = static_cast<std::ptrdiff_t>(in.Channels());
  const auto width = static_cast<std::ptrdiff_t>(out.Width());
  const auto height = static_cast<std::ptrdiff_t>(out.Height());
  const auto marginX = static_cast<std::ptrdiff_t>(in.MarginX());
  const auto marginY = static_cast<std::ptrdiff_t>(in.MarginY());
  const std::ptrdiff_t pitch = width + 2 * marginX;
  const std::ptrdiff_t rows = height + 2 * marginY;
  const T noData = ReferenceTruncation<T>(parameters.noDataValue);
  const A attrNoData = ReferenceTruncation<A>(parameters.attrNoDataValue);
  const A tolerance = ReferenceTruncation<A>(parameters.attrTolerance);
  const auto label = [&](std::ptrdiff_t x, std::ptrdiff_t y) {
    const std::ptrdiff_t column =
        x / parameters.scale + static_cast<std::ptrdiff_t>(attr.MarginX());
    const std::ptrdiff_t row = y / parameters.scale + static_cast<std::ptrdiff_t>(attr.MarginY());
    return labels[row * static_cast<std::ptrdiff_t>(attr.FullWidth()) + column];
  };
  const auto isNoData = [&](const T* pixel) {
    for (std::ptrdiff_t c = 0; c < channels; ++c) {
      if (!ReferenceEqual(pixel[c], noData)) return false;
    }
    return true;
  };
  std::vector<T> pool;
  pool.reserve(cells.size());
  for (std::ptrdiff_t i = 0; i < width * height; ++i) {
    const std::ptrdiff_t row = i / width;
    const std::ptrdiff_t column = i % width;
    const std::ptrdiff_t target = (row + static_cast<std::ptrdiff_t>(out.MarginY())) *
                                      static_cast<std::ptrdiff_t>(out.FullWidth()) +
                                  column + static_cast<std::ptrdiff_t>(out.MarginX());
    if (outputMask != nullptr && outputMask[target] == 0) continue;
    const A centre = parameters.useAttributes ? label(column, row) : A{};
    for (std::ptrdiff_t c = 0; c < channels; ++c) {
      pool.clear();
      for (const auto& [dx, dy] : cells) {
        const std::ptrdiff_t x = marginX + column + dx;
        const std::ptrdiff_t y = marginY + row + dy;
        if (x < 0 || x >= pitch || y < 0 || y >= rows) continue;
        if (parameters.useAttributes &&
            !ReferenceShares(centre, label(column + dx, row + dy), attrNoData, tolerance)) {
          continue;
        }
        const std::ptrdiff_t at = y * pitch + x;
        if (inputMask != nullptr && inputMask[at] == 0) continue;
        if (parameters.useNoData && isNoData(input + at * channels)) continue;
        pool.push_back(input[at * channels + c]);
      }
      if (pool.empty()) break;
      output[target * channels + c] = ReferenceStatistic(parameters.algo, pool);
    }
  }
}

}  // namespace zarn::testsupport
