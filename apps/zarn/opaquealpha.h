// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <limits>
#include <type_traits>

namespace zarn::app {

/// The alpha of a pixel that hides what is below it; 255 for floating types, as GDAL has it.
template <typename T>
constexpr T OpaqueAlpha() {
  if constexpr (std::is_floating_point_v<T>) return T{255};
  return std::numeric_limits<T>::max();
}

}  // namespace zarn::app
