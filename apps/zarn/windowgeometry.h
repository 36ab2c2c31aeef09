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

/// The smallest window that holds both; an empty one adds nothing.
inline Window Union(const Window& a, const Window& b) {
  if (IsEmpty(a)) return b;
  if (IsEmpty(b)) return a;
  const std::int64_t x = std::min(a.x, b.x);
  const std::int64_t y = std::min(a.y, b.y);
  return {x, y, std::max(a.x + a.width, b.x + b.width) - x,
          std::max(a.y + a.height, b.y + b.height) - y};
}

}  // namespace zarn::app
