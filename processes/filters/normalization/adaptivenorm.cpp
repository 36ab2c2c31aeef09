// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/normalization/adaptivenorm.h"

namespace zarn::processes::filters {

FilterResult CPUAdaptiveNorm::Process(const gobs::Raster& /*input*/, gobs::Raster& /*output*/,
                                      std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                      const std::uint8_t* /*inputMask*/) {
  return FilterResult::Success();
}

}  // namespace zarn::processes::filters
