// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <utility>

namespace zarn::processes::filters {

/// Outcome of one processing call.
struct FilterResult {
  std::int32_t code = 1;  ///< 1 success, 0 failure
  std::string message;    ///< empty on success

  static FilterResult Success() { return {}; }
  static FilterResult Failure(std::string text) { return {0, std::move(text)}; }
  bool Ok() const { return code == 1; }
};

}  // namespace zarn::processes::filters
