// SPDX-License-Identifier: Apache-2.0
#include "host/mosaic/mosdodgingsurface.h"

#include <cstddef>
#include <vector>

void MOSDodgingSurface::GetBilinearRun(unsigned column, unsigned row, unsigned count, float* values,
                                       unsigned pitch) const {
  std::vector<float> pixel(Channels());
  for (unsigned k = 0; k < count; ++k) {
    GetBilinearValue(column + k, row, pixel.data());
    for (std::size_t c = 0; c < pixel.size(); ++c) values[c * pitch + k] = pixel[c];
  }
}
