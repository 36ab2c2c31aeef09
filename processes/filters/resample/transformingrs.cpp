// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/resample/transformingrs.h"

#include <limits>

#include "host/core/exception.h"
#include "host/utils/resample.h"
#include "processes/filters/framework/blockchecks.h"
#include "processes/filters/framework/messages.h"

namespace zarn::processes::filters {
namespace {

constexpr const char* kNoTransform = "No source position transform in resampling";
constexpr const char* kMargins = "Raster margins are not supported in resampling.";

bool HasMargins(const gobs::RasterInfo& block) {
  return block.MarginX() != 0 || block.MarginY() != 0;
}

// The host counts in signed 32 bits.
bool FitsHost(const gobs::RasterInfo& block) {
  constexpr std::uint32_t kMost = std::numeric_limits<int>::max();
  return block.Width() <= kMost && block.Height() <= kMost && block.Channels() <= kMost;
}

// The host's buffers do not tell what is only read; a source is.
utils::ResampleBuffer BufferOf(const gobs::Raster& block, const std::uint8_t* mask) {
  return {gobs::GetDataTypeCode(block),
          static_cast<int>(block.Width()),
          static_cast<int>(block.Height()),
          static_cast<int>(block.Channels()),
          const_cast<unsigned char*>(static_cast<const unsigned char*>(block.Data())),
          const_cast<unsigned char*>(mask),
          false};
}

}  // namespace

TransformingRS::~TransformingRS() {
  if (ownsTransform != 0) delete transform;
}

FilterResult TransformingRS::SampleBlock(const gobs::Raster& input, gobs::Raster& output,
                                         const std::uint8_t* inputMask) const {
  if (transform == nullptr) return FilterResult::Failure(kNoTransform);
  if (HasMargins(input) || HasMargins(output)) return FilterResult::Failure(kMargins);
  if (auto refusal = blockchecks::CheckBlocks(input, output, inputNoData, outputNoData,
                                              blockchecks::Aliasing::kForbidden)) {
    return *refusal;
  }
  if (!FitsHost(input) || !FitsHost(output)) {
    return FilterResult::Failure(messages::kInconsistentBlock);
  }
  const utils::ResampleBuffer source = BufferOf(input, inputMask);
  utils::ResampleBuffer destination = BufferOf(output, nullptr);
  utils::ResampleInfo info;
  info.method = GetResampleMethod();
  info.hasNoData = !outputNoData.empty();
  info.noData = info.hasNoData ? outputNoData.front() : 0.0;
  try {
    utils::Resample(source, destination, transform, info);
  } catch (const Exception& failure) {
    return FilterResult::Failure(failure.Message());
  }
  return FilterResult::Success();
}

}  // namespace zarn::processes::filters
