// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <vector>

#include "host/gobs/raster.h"
#include "processes/filters/framework/filterresult.h"

namespace zarn::processes::filters {

/// What a filter refuses before it writes anything. Each check returns the failure to hand back, or
/// nothing when the blocks pass.
namespace blockchecks {

using Refusal = std::optional<FilterResult>;

/// Equal widths, and an input at least as high as the output (a taller input is accepted).
Refusal CheckCoversOutput(const gobs::RasterInfo& input, const gobs::RasterInfo& output);

/// Equal widths and heights.
Refusal CheckSameSize(const gobs::RasterInfo& input, const gobs::RasterInfo& output);

/// Both margins of the input reach `half` pixels; no margin is enough for a negative `half`.
Refusal CheckMargins(const gobs::RasterInfo& input, std::int64_t half);

/// Whether a filter may write into its own input.
enum class Aliasing { kForbidden, kSameBlockAllowed };

/// For filters without parameters per channel.
inline constexpr std::size_t kNoParameters = std::numeric_limits<std::size_t>::max();

/// What every family refuses after its own checks, because processing would read or write out of
/// bounds: another type or channel count, short no-data lists (empty lists are fine), parameters
/// for fewer channels, blocks without data or smaller than described, and overlapping memory; in
/// this order.
Refusal CheckBlocks(const gobs::Raster& input, const gobs::Raster& output,
                    const std::vector<double>& inputNoData, const std::vector<double>& outputNoData,
                    Aliasing aliasing, std::size_t parameterChannels = kNoParameters);

/// What is refused of an input of another type that is read beside the first one: another number
/// of channels than `channels`, a block without data or smaller than described, and memory shared
/// with the output.
Refusal CheckSecondInput(const gobs::Raster& second, const gobs::Raster& output,
                         std::uint32_t channels);

/// What is refused of a further block that is written beside `block`: no data or smaller than
/// described, and memory shared with it.
Refusal CheckApart(const gobs::Raster& further, const gobs::Raster& block);

}  // namespace blockchecks
}  // namespace zarn::processes::filters
