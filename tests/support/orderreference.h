// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cmath>
#include <type_traits>

namespace zarn::testsupport {

/// Whether `a` sorts before `b`: -0 before +0, NaN last.
template <typename T>
bool ReferenceOrder(T a, T b) {
  if constexpr (std::is_floating_point_v<T>) {
    if (std::isnan(a) || std::isnan(b)) return !std::isnan(a);
    if (a == b) return std::signbit(a) && !std::signbit(b);
  }
  return a < b;
}

}  // namespace zarn::testsupport
