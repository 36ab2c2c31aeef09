// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/blockchecks.h"

#include "processes/filters/framework/messages.h"

namespace zarn::processes::filters::blockchecks {
namespace {

bool TooShort(const std::vector<double>& list, const gobs::RasterInfo& block) {
  return !list.empty() && list.size() < block.Channels();
}

bool Inconsistent(const gobs::Raster& block) {
  return block.DataSize() < block.DescribedSize() ||
         (block.Data() == nullptr && block.DescribedSize() > 0);
}

bool Overlap(const gobs::Raster& a, const gobs::Raster& b, Aliasing aliasing) {
  if (a.DescribedSize() == 0 || b.DescribedSize() == 0) return false;
  const auto beginA = reinterpret_cast<std::uintptr_t>(a.Data());
  const auto beginB = reinterpret_cast<std::uintptr_t>(b.Data());
  if (aliasing == Aliasing::kSameBlockAllowed && beginA == beginB) return false;
  return beginA < beginB + b.DescribedSize() && beginB < beginA + a.DescribedSize();
}

}  // namespace

Refusal CheckCoversOutput(const gobs::RasterInfo& input, const gobs::RasterInfo& output) {
  if (input.Width() == output.Width() && input.Height() >= output.Height()) return {};
  return FilterResult::Failure(messages::kSizesDiffer);
}

Refusal CheckSameSize(const gobs::RasterInfo& input, const gobs::RasterInfo& output) {
  if (input.Width() == output.Width() && input.Height() == output.Height()) return {};
  return FilterResult::Failure(messages::kSizesDiffer);
}

Refusal CheckMargins(const gobs::RasterInfo& input, std::int64_t half) {
  if (half >= 0 && input.MarginX() >= half && input.MarginY() >= half) return {};
  return FilterResult::Failure(messages::kMarginsTooSmall);
}

Refusal CheckBlocks(const gobs::Raster& input, const gobs::Raster& output,
                    const std::vector<double>& inputNoData, const std::vector<double>& outputNoData,
                    Aliasing aliasing, std::size_t parameterChannels) {
  if (input.Type() != output.Type() || input.Channels() != output.Channels()) {
    return FilterResult::Failure(messages::kTypesDiffer);
  }
  if (TooShort(inputNoData, input) || TooShort(outputNoData, input)) {
    return FilterResult::Failure(messages::kFewNoDataValues);
  }
  if (parameterChannels < input.Channels()) return FilterResult::Failure(messages::kFewParameters);
  if (Inconsistent(input) || Inconsistent(output)) {
    return FilterResult::Failure(messages::kInconsistentBlock);
  }
  if (Overlap(input, output, aliasing)) return FilterResult::Failure(messages::kOverlap);
  return {};
}

Refusal CheckSecondInput(const gobs::Raster& second, const gobs::Raster& output,
                         std::uint32_t channels) {
  if (second.Channels() != channels) return FilterResult::Failure(messages::kTypesDiffer);
  if (Inconsistent(second)) return FilterResult::Failure(messages::kInconsistentBlock);
  if (Overlap(second, output, Aliasing::kForbidden)) {
    return FilterResult::Failure(messages::kOverlap);
  }
  return {};
}

Refusal CheckApart(const gobs::Raster& further, const gobs::Raster& block) {
  if (Inconsistent(further)) return FilterResult::Failure(messages::kInconsistentBlock);
  if (Overlap(further, block, Aliasing::kForbidden)) {
    return FilterResult::Failure(messages::kOverlap);
  }
  return {};
}

}  // namespace zarn::processes::filters::blockchecks
