// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstdint>

#include "apps/zarn/windows.h"

namespace zarn::app {

inline bool IsEmpty(const Window& window) { return window.width <= 0 || window.height <= 0; }

/// What two windows have in common; empty when that is nothing.
inline Window Intersection(const Window& a, const Window& b) {
  const std::int64_t x = std::max(a.x, b.x);
  const std::int64_t y = std::max(a.y, b.y);
  return {x, y, std::min(a.x + a.width, b.x + b.width) - x,
          std::min(a.y + a.height, b.y + b.height) - y};
}

inline bool Meet(const Window& a, const Window& b) { return !IsEmpty(Intersection(a, b)); }

}  // namespace zarn::app
