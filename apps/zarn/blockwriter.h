// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gdal_priv.h>

#include <cstdint>
#include <string>

#include "apps/zarn/dataset.h"
#include "apps/zarn/windowbuffers.h"

namespace zarn::app {

/// Writes filtered windows, with the alpha bands and the mask that they came with.
class BlockWriter {
 public:
  /// `name` is what failures call the output.
  BlockWriter(const RasterSource& source, GDALDataset& output, std::string name);

  /// Throws `RunError` when anything could not be written.
  void Write(const WindowBuffers& buffers);

 private:
  void WritePart(const WindowBuffers& buffers, const Window& part);
  void WriteBands(const std::vector<int>& bands, const Plane& plane, std::int64_t halo,
                  const WindowBuffers& buffers, const Window& part);
  void Flush();

  const RasterSource& source_;
  GDALDataset& output_;
  std::string name_;
  int blockWidth_ = 1;
  int blockHeight_ = 1;
};

}  // namespace zarn::app
