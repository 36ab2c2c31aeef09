// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/labelfile.h"
#include "apps/zarn/maskfile.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/windowbuffers.h"
#include "apps/zarn/windows.h"

namespace zarn::app {

/// What a window is made of beside the image's own bands.
struct BlockRequest {
  std::int64_t halo = 0;           ///< pixels around a window on every side
  MaskFile* mask = nullptr;        ///< excludes pixels from processing
  LabelFile* labels = nullptr;     ///< read with the window
  MaskFile* outputMask = nullptr;  ///< names pixels that are not to be written
  /// No-data pixels are found here, like all other invalid ones, instead of by the filter.
  bool marksNoData = false;
  /// These are exactly equal to the no-data value, instead of within the tolerance.
  bool exactNoData = false;
  /// The filter would write pixels that are not processed from their neighbours, and must not.
  bool protectsInvalid = false;
  /// Windows are filtered into an output of their own size; without it `output` stays unused.
  bool preparesOutput = true;
};

/// Reads windows with their halo and finds out which pixels are to be processed.
///
/// Not processed are pixels outside of the image, those that the file declares invalid (NaN in a
/// band, alpha 0, mask 0) and those that a mask file excludes. Their output is prepared here,
/// because filters leave it alone: a copy of the input, or the output no-data value where that was
/// asked for and the file declares the pixel invalid. No-data values are the filters' own business
/// unless the request says otherwise.
class BlockReader {
 public:
  BlockReader(const RasterSource& source, const NoDataValues& noData, const BlockRequest& request);

  /// Bytes of a pixel of the channels.
  std::size_t SampleBytes() const { return sampleBytes_; }
  /// Bytes of what is read and computed beside a pixel.
  std::size_t SideBytes() const;

  /// Fills the planes of `buffers` that the request asks for. `above` holds the window above, where
  /// it is still in memory; the rows that the two share are taken from there. Throws `RunError`.
  void Read(const Window& window, const WindowBuffers* above, WindowBuffers& buffers);

 private:
  struct Fresh;  // the part of a window that has to be read

  void Shape(const Window& window, WindowBuffers& buffers) const;
  void ReadBands(const Fresh& fresh, const std::vector<int>& bands, Plane& plane);
  void ReadFileMask(const Fresh& fresh, Plane& plane);
  void ReadLabels(const Fresh& fresh, Plane& plane);
  void MarkValid(const Fresh& fresh, WindowBuffers& buffers);
  void MarkWritable(WindowBuffers& buffers);
  void PrepareOutput(WindowBuffers& buffers) const;

  const RasterSource& source_;
  const NoDataValues& noData_;
  BlockRequest request_;
  std::int64_t halo_;
  std::size_t sampleBytes_;
  bool isFloat_;
  bool needsValid_;
  bool needsWritable_;
  std::vector<std::byte> maskScratch_;
};

}  // namespace zarn::app
