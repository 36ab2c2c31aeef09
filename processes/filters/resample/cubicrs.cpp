// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/resample/cubicrs.h"

namespace zarn::processes::filters {

FilterResult CPUCubicRS::Process(const gobs::Raster& input, gobs::Raster& output,
                                 std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                 const std::uint8_t* inputMask) {
  return SampleBlock(input, output, inputMask);
}

}  // namespace zarn::processes::filters
