// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/attribute/poolblock.h"

#include <algorithm>

#include "processes/filters/framework/messages.h"

namespace zarn::processes::filters {
namespace {

constexpr const char* kAttributeMarginsTooSmall = "Attribute raster margins are too small.";

bool CoversOutput(const gobs::RasterInfo& attr, std::int64_t scale, const gobs::RasterInfo& out) {
  return scale > 0 && attr.Width() * scale >= out.Width() && attr.Height() * scale >= out.Height();
}

// Whether labels are there for all pixels that exist up to `reach` from the output, along one axis.
bool CoversNeighbours(std::int64_t labels, std::int64_t labelMargin, std::int64_t scale,
                      std::int64_t pixels, std::int64_t inputMargin, std::int64_t reach) {
  const std::int64_t beyond = std::min(inputMargin, reach);
  return beyond / scale <= labelMargin && (pixels - 1 + beyond) / scale < labels + labelMargin;
}

}  // namespace

std::vector<PoolOffset> PoolOffsets(const std::vector<int>& pairs) {
  std::vector<PoolOffset> offsets;
  offsets.reserve(pairs.size() / 2);
  for (std::size_t i = 0; i + 1 < pairs.size(); i += 2) {
    offsets.push_back({pairs[i], pairs[i + 1]});
  }
  return offsets;
}

PoolReach ReachOf(const std::vector<PoolOffset>& offsets) {
  PoolReach reach;
  for (const PoolOffset& offset : offsets) {
    reach.x = std::max({reach.x, offset.dx, -offset.dx});
    reach.y = std::max({reach.y, offset.dy, -offset.dy});
  }
  return reach;
}

bool IsHandledType(gobs::NativeDataTypeCode code) {
  return VisitSampleType(code, "", [](auto) { return FilterResult::Success(); }).Ok();
}

blockchecks::Refusal CheckPoolCall(const PoolCall& call, const std::vector<PoolOffset>& offsets) {
  const gobs::Raster& in = call.in;
  const gobs::Raster& attr = call.attr;
  const gobs::Raster& out = call.out;
  const std::int64_t scale = call.attrScale;
  const bool useAttributes = call.settings.useAttributes;
  if (auto refusal = blockchecks::CheckCoversOutput(in, out)) return refusal;
  if (useAttributes && !CoversOutput(attr, scale, out)) {
    return FilterResult::Failure(messages::kSizesDiffer);
  }
  if (useAttributes && !offsets.empty()) {
    const PoolReach reach = ReachOf(offsets);
    const bool anyPixels = out.Width() > 0 && out.Height() > 0;
    if (anyPixels && (!CoversNeighbours(attr.Width(), attr.MarginX(), scale, out.Width(),
                                        in.MarginX(), reach.x) ||
                      !CoversNeighbours(attr.Height(), attr.MarginY(), scale, out.Height(),
                                        in.MarginY(), reach.y))) {
      return FilterResult::Failure(kAttributeMarginsTooSmall);
    }
  }
  if (auto refusal = blockchecks::CheckBlocks(in, out, {}, {}, blockchecks::Aliasing::kForbidden)) {
    return refusal;
  }
  return useAttributes ? blockchecks::CheckSecondInput(attr, out, 1) : std::nullopt;
}

}  // namespace zarn::processes::filters
