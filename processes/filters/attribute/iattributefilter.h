// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "host/gobs/raster.h"
#include "processes/filters/framework/filterresult.h"

namespace zarn::processes::filters {

/// A filter that pools the neighbours of each pixel that carry the same label in a second raster,
/// the attribute raster, and writes one statistic of them per channel.
///
/// | | |
/// |---|---|
/// | types | integers up to 32 bits, float, double, for samples and labels in any combination |
/// | window | the cells of the structuring kernel; one without cells writes nothing |
/// | input margins | any; neighbours beyond them do not exist |
/// | output size | equal width; the input may be taller |
/// | labels | one channel; see below |
/// | written | pixels with a pool whose output mask byte is not 0; all others are untouched |
/// | parallel | over rows, with dynamic adjustment switched on; the result does not depend on it |
///
/// Pixel (x, y) has the label of pixel (x / attrScale, y / attrScale), rounded towards zero, of the
/// attribute raster, whose margins must reach as far as neighbours exist. Pooled are neighbours
/// that exist, share the centre's label, have no mask byte 0 and are not no-data; whether the
/// centre itself is among them does not matter. Rows of a taller input past the lower margin of the
/// output's height do not exist.
///
/// Refused are unknown types, as each filter says; "Input and output rasters must be the same size
/// (excluding margins).", also when the attribute raster does not cover the output or the scale is
/// not positive; "Attribute raster margins are too small."; another sample type or channel count,
/// more channels of labels, inconsistent or overlapping blocks.
///
/// Failures come back as code 0 with the output untouched; exceptions come only from allocation.
/// Processing changes nothing in the filter: one object may serve several threads at once, each
/// with blocks of its own.
class IAttributeFilter {
 public:
  bool useNoData = false;    ///< never pool pixels whose channels all equal `noDataValue`
  double noDataValue = 0.0;  ///< truncated to the sample type
  /// Restrict neighbours by label. When clear, the attribute raster is not read and the scale does
  /// not matter: the filter sees one label everywhere.
  bool useAttributes = false;
  /// The label of pixels without one: they are pooled with every label, and pool every neighbour
  /// themselves. Truncated to the type of the labels.
  double attrNoDataValue = 0.0;
  /// Greatest difference of labels that are pooled, truncated to their type: by default only equal
  /// integers are. Unsigned labels are pooled from the centre's up to that much more; all others
  /// down to that much less as well.
  double attrTolerance = 1e-6;

  IAttributeFilter() = default;
  IAttributeFilter(const IAttributeFilter&) = delete;
  IAttributeFilter& operator=(const IAttributeFilter&) = delete;
  virtual ~IAttributeFilter();

  /// Filters a block without an attribute raster; `useAttributes` must be clear for blocks of more
  /// than one pixel. The masks are those of `ProcessBlocks`.
  virtual FilterResult Process(const gobs::Raster& in, gobs::Raster& out,
                               const unsigned char* inputMask, const unsigned char* outputMask);

  /// Filters a block with labels: `ProcessBlocks` under the name that callers use.
  virtual FilterResult ProcessWithAttributes(const gobs::Raster& in, const gobs::Raster& attr,
                                             gobs::Raster& out, int attrScale,
                                             const unsigned char* inputMask,
                                             const unsigned char* outputMask);

  /// `out` has the sample type and channels of `in` and overlaps neither of the others. `attrScale`
  /// is the side, in pixels of the image, of a pixel of `attr`. Each mask is null or holds one byte
  /// per pixel of the input's and the output's full block, row by row: with 0, an input pixel is
  /// never pooled and an output pixel is left as it is.
  virtual FilterResult ProcessBlocks(const gobs::Raster& in, const gobs::Raster& attr,
                                     gobs::Raster& out, int attrScale,
                                     const unsigned char* inputMask,
                                     const unsigned char* outputMask) = 0;
};

}  // namespace zarn::processes::filters
