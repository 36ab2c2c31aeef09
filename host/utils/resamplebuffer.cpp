// SPDX-License-Identifier: Apache-2.0
#include "host/utils/resamplebuffer.h"

namespace zarn::utils {

ResampleBuffer::ResampleBuffer(gobs::NativeDataTypeCode type, int width, int height, int channels,
                               unsigned char* data, unsigned char* mask, bool ownsMemory)
    : type_(type),
      width_(width),
      height_(height),
      channels_(channels),
      data_(data),
      mask_(mask),
      ownsMemory_(ownsMemory) {}

ResampleBuffer::~ResampleBuffer() {
  if (!ownsMemory_) return;
  delete[] data_;
  delete[] mask_;
}

}  // namespace zarn::utils
