// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <utility>
#include <vector>

#include "processes/filters/colorbalance/balancepixels.h"
#include "processes/filters/framework/blockchecks.h"
#include "processes/filters/framework/messages.h"
#include "processes/filters/framework/sampletypes.h"

namespace zarn::processes::filters {

/// Calls `visit` with the sample type where colour balancers and normalisation handle it.
template <typename Visitor>
FilterResult VisitBalanced(gobs::NativeDataTypeCode code, Visitor&& visit) {
  return VisitSampleType(code, messages::kUnknownBalancedType, std::forward<Visitor>(visit));
}

/// What these families refuse before they write anything. `parameters` is the number of channels
/// that all parameters have.
inline blockchecks::Refusal CheckBalanced(const gobs::Raster& input, const gobs::Raster& output,
                                          const std::vector<double>& inputNoData,
                                          const std::vector<double>& outputNoData,
                                          std::size_t parameters) {
  if (auto refusal = blockchecks::CheckSameSize(input, output)) return refusal;
  return blockchecks::CheckBlocks(input, output, inputNoData, outputNoData,
                                  blockchecks::Aliasing::kSameBlockAllowed, parameters);
}

/// Shares out blocks of more than `serialUpTo` pixels.
inline BalanceSharing ShareAbove(std::int64_t serialUpTo, const gobs::RasterInfo& block) {
  const std::int64_t pixels = std::int64_t{block.Width()} * block.Height();
  return {.parallel = pixels > serialUpTo && parallel::MayShareOut()};
}

/// Shares out the rows of blocks of two and more that have more than `serialUpTo` pixels.
inline BalanceSharing ShareRowsAbove(std::int64_t serialUpTo, const gobs::RasterInfo& block) {
  const bool parallel = ShareAbove(serialUpTo, block).parallel && block.Height() >= 2;
  return {.parallel = parallel, .wholeRows = true};
}

/// Shares out every block.
inline BalanceSharing ShareAlways() { return {.parallel = true}; }

}  // namespace zarn::processes::filters
