// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <limits>
#include <type_traits>

namespace zarn::app {

/// The alpha of a pixel that hides what is below it; 255 for floating types, as GDAL has it.
template <typename T>
constexpr T OpaqueAlpha() {
  return std::is_floating_point_v<T> ? T{255} : std::numeric_limits<T>::max();
}

}  // namespace zarn::app
