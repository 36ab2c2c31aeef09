// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <filesystem>
#include <memory>
#include <mutex>
#include <string>

#include "apps/zarn/blockreader.h"
#include "apps/zarn/blockwriter.h"
#include "apps/zarn/dataset.h"
#include "apps/zarn/nodata.h"
#include "apps/zarn/stagingfolder.h"
#include "apps/zarn/windowbuffers.h"

namespace zarn::app {

/// A raster of which windows are read, changed and written back. The changes go to a copy beside it
/// that takes its place with `Publish`; destroyed before that, it leaves the raster as it was.
class UpdatedRaster {
 public:
  /// A raster that exists; `inPlace`: the changes go to the file itself, at once. Throws
  /// `UsageError` when it is a file of another raster that is open, `RunError` when it cannot be
  /// changed.
  UpdatedRaster(const std::string& name, bool inPlace);
  /// A new raster of one band on the grid of `like`, all 0, which it declares as no-data. Throws
  /// `UsageError` for a format that cannot be changed once written, `RunError` when there is a file
  /// already.
  UpdatedRaster(const std::string& name, const RasterSource& like, const SampleType& type);

  const RasterSource& Source() const { return source_; }
  /// Bytes that the buffers of a window take per pixel.
  std::size_t BytesPerPixel() const { return 2 * reader_.SampleBytes() + reader_.SideBytes(); }

  // One thread may read while another one writes.

  /// Fills `buffers`; their `output` is equal to their `samples`. Throws `RunError`.
  void Read(const Window& window, WindowBuffers& buffers);
  /// Writes `output`, alphas and mask, unless `output` is still equal to `samples` and
  /// `sidesChanged`, which speaks of the other two, is false. Throws `RunError`.
  void Write(const WindowBuffers& buffers, bool sidesChanged);

  /// Completes the file; nothing can be read or written any more. Throws `RunError` when anything
  /// was not written.
  void Close();
  /// Puts what `Close` has completed in its place.
  void Publish();

 private:
  struct Opened {
    std::unique_ptr<StagingFolder> staging;  ///< null: in place
    DatasetPtr dataset;
  };

  static Opened Open(const std::string& name, bool inPlace);
  static Opened Create(const std::string& name, const RasterSource& like, const SampleType& type);
  UpdatedRaster(const std::string& name, Opened opened, bool created);

  std::unique_ptr<StagingFolder> staging_;
  RasterSource source_;
  NoDataValues unused_;
  BlockReader reader_;
  BlockWriter writer_;
  std::mutex mutex_;
  bool changed_;
};

}  // namespace zarn::app
