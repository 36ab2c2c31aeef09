// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/gobs/datatypes.h"
#include "host/hostexport.h"

namespace zarn::utils {

/// The pixels that resampling reads from or writes to: `height` rows of `width` pixels of
/// `channels` samples, pixel-interleaved and without gaps, aligned to the sample type.
///
/// The mask is null or has one byte per pixel. In a source 0 means that the pixel takes no part; a
/// destination gets 1 for pixels that the source covers and 0 for the others.
class ZARN_HOST_EXPORT ResampleBuffer {
 public:
  /// With `ownsMemory` the buffer releases data and mask with array delete; otherwise they are the
  /// caller's and outlive it. Nothing is checked here.
  ResampleBuffer(gobs::NativeDataTypeCode type, int width, int height, int channels,
                 unsigned char* data, unsigned char* mask, bool ownsMemory);
  ResampleBuffer(const ResampleBuffer&) = delete;
  ResampleBuffer& operator=(const ResampleBuffer&) = delete;
  ~ResampleBuffer();

  gobs::NativeDataTypeCode Type() const { return type_; }
  int Width() const { return width_; }
  int Height() const { return height_; }
  int Channels() const { return channels_; }
  unsigned char* Data() { return data_; }
  const unsigned char* Data() const { return data_; }
  unsigned char* Mask() { return mask_; }
  const unsigned char* Mask() const { return mask_; }

 private:
  gobs::NativeDataTypeCode type_;
  int width_;
  int height_;
  int channels_;
  unsigned char* data_;
  unsigned char* mask_;
  bool ownsMemory_;
};

}  // namespace zarn::utils
