// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <type_traits>

#include "processes/filters/framework/sampletypes.h"

namespace zarn::app {

/// Calls `visit` with the sample type of `code`. Some filters handle 64-bit integers beside the
/// types of `VisitSampleType`; for what has no type of its own nothing is called.
template <typename Visitor>
void VisitAnySampleType(gobs::NativeDataTypeCode code, const Visitor& visit) {
  using enum gobs::NativeDataTypeCode;
  if (code == kInt64) {
    visit(std::type_identity<std::int64_t>{});
  } else if (code == kUInt64) {
    visit(std::type_identity<std::uint64_t>{});
  } else {
    processes::filters::VisitSampleType(code, "", [&](auto type) {
      visit(type);
      return processes::filters::FilterResult::Success();
    });
  }
}

}  // namespace zarn::app
