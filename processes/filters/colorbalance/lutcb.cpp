// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/colorbalance/lutcb.h"

#include <algorithm>
#include <cstddef>
#include <type_traits>
#include <utility>

#include "host/core/exception.h"
#include "host/gobs/saturatecast.h"
#include "processes/filters/colorbalance/balanceblock.h"
#include "processes/filters/colorbalance/mapsamples.h"

namespace zarn::processes::filters {
namespace {

// The sample held within the table.
template <typename T>
std::size_t TableIndex(T v) {
  if constexpr (std::is_floating_point_v<T>) {
    return gobs::SaturateCast<std::uint8_t>(static_cast<double>(v));
  } else {
    return static_cast<std::size_t>(std::clamp<std::int64_t>(v, 0, 255));
  }
}

}  // namespace

std::vector<LookUpTable> CopyTables(const std::vector<unsigned char*>& luts) {
  std::vector<LookUpTable> tables(luts.size());
  for (std::size_t c = 0; c < luts.size(); ++c) {
    if (luts[c] == nullptr) {
      throw ParameterException("A look-up table is missing.", "luts", 1,
                               "processes/filters/colorbalance/lutcb", __func__, __LINE__);
    }
    std::copy_n(luts[c], tables[c].size(), tables[c].begin());
  }
  return tables;
}

LUTCBBase::LUTCBBase(std::vector<LookUpTable> tables) : luts(std::move(tables)) {}

FilterResult CPULUTCB::Process(const gobs::Raster& input, gobs::Raster& output,
                               std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                               const std::uint8_t* inputMask) {
  const auto code = gobs::GetDataTypeCode(input);
  return VisitBalanced(code, [&]<typename T>(std::type_identity<T>) {
    if (auto refusal = CheckBalanced(input, output, inputNoData, outputNoData, luts.size())) {
      return *refusal;
    }
    const BalanceJob<T> job(input, output, inputNoData, outputNoData, inputMask, {});
    MapSamples(job, ShareAbove(kLUTSerialUpTo, input),
               [&](T v, std::size_t c) { return static_cast<T>(luts[c][TableIndex(v)]); });
    return FilterResult::Success();
  });
}

}  // namespace zarn::processes::filters
