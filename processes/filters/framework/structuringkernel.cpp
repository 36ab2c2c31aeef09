// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/structuringkernel.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <limits>
#include <stdexcept>

namespace zarn::processes::filters {

void SetupKernelSE(float size, std::vector<int>& offsets, KernelShape shape) {
  if (size > kMaxKernelSize) throw std::length_error("Structuring kernel is too large.");
  offsets.clear();
  if (!(size > 0)) return;
  const int half = static_cast<int>(std::ceil(size)) / 2;
  const float radiusSquared = size * size * 0.25F;
  const auto side = static_cast<std::size_t>(2 * half + 1);
  offsets.reserve(2 * side * side);
  for (int dx = -half; dx <= half; ++dx) {
    for (int dy = -half; dy <= half; ++dy) {
      if (shape == KernelShape::kDisc && static_cast<float>(dx * dx + dy * dy) > radiusSquared) {
        continue;
      }
      offsets.push_back(dx);
      offsets.push_back(dy);
    }
  }
}

void Vec2ArrSE(const std::vector<int>& offsets, int*& array, int& count) {
  if (offsets.size() > static_cast<std::size_t>(std::numeric_limits<int>::max())) {
    throw std::length_error("Offset list is too long.");
  }
  array = new int[offsets.size()];
  std::copy(offsets.begin(), offsets.end(), array);
  count = static_cast<int>(offsets.size());
}

}  // namespace zarn::processes::filters
