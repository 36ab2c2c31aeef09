// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <vector>

namespace zarn::app {

/// Closed rings by the even-odd rule, in pixels of a mosaic.
struct Polygon {
  std::vector<double> vertices;      ///< x and y of each, ring after ring
  std::vector<std::int32_t> starts;  ///< index of each ring's first vertex

  bool Empty() const { return vertices.empty(); }
};

}  // namespace zarn::app
