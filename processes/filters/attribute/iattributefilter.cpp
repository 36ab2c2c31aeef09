// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/attribute/iattributefilter.h"

namespace zarn::processes::filters {

IAttributeFilter::~IAttributeFilter() = default;

FilterResult IAttributeFilter::Process(const gobs::Raster& in, gobs::Raster& out,
                                       const unsigned char* inputMask,
                                       const unsigned char* outputMask) {
  const gobs::Raster placeholder(gobs::RasterInfo(1, 1, 1, gobs::NativeDataTypeCode::kUInt8));
  return ProcessBlocks(in, placeholder, out, 1, inputMask, outputMask);
}

FilterResult IAttributeFilter::ProcessWithAttributes(const gobs::Raster& in,
                                                     const gobs::Raster& attr, gobs::Raster& out,
                                                     int attrScale, const unsigned char* inputMask,
                                                     const unsigned char* outputMask) {
  return ProcessBlocks(in, attr, out, attrScale, inputMask, outputMask);
}

}  // namespace zarn::processes::filters
