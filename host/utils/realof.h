// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <type_traits>

namespace zarn::utils {

/// What values of a sample type are interpolated in: bytes in float, whose error is far below their
/// unit, all others in double.
template <typename T>
using RealOf = std::conditional_t<sizeof(T) == 1, float, double>;

}  // namespace zarn::utils
