// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gdal_priv.h>

#include <filesystem>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/outputformat.h"
#include "apps/zarn/outputgrid.h"
#include "apps/zarn/stagingfolder.h"
#include "host/nspio/counter.h"

namespace zarn::app {

struct OutputOptions {
  std::string target;
  std::string format;                 ///< a GDAL driver name; empty: by the target's extension
  std::vector<std::string> creation;  ///< KEY=VALUE
  bool overwrite = false;
  /// That no file of an input is replaced is known. Otherwise all rasters that are open are looked
  /// at, which no other thread may open or close meanwhile.
  bool apartFromInputs = false;
};

/// An output raster with the bands of a source and its size, or on a grid of its own. It is written
/// in a temporary place and appears at its target, whole, with `Publish`; destroyed before that it
/// leaves no trace.
class StagedOutput {
 public:
  /// For `grid` and `masked` see `CarryOver`. Throws `UsageError` when the target or a file that
  /// goes with it is a file of a raster that is open, `RunError` when it cannot be written.
  StagedOutput(const OutputOptions& options, const RasterSource& like,
               const std::vector<double>& noData, const OutputGrid* grid = nullptr,
               bool masked = false);

  /// The raster to write to.
  GDALDataset& Dataset() { return *dataset_; }
  std::string Name() const { return staging_.Target().string(); }

  /// Whether `Publish` still has the larger part of the writing to do.
  bool CopiesAtTheEnd() const { return !format_.WritesBlocks(); }

  /// Completes the file (copies it, for formats that cannot be written by blocks) and moves it to
  /// its target. Throws `RunError` when anything was not written.
  void Publish(nspio::Counter& progress);

 private:
  void Create(const RasterSource& like, const OutputGrid* grid);
  void CopyToFormat(nspio::Counter& progress);

  bool apartFromInputs_;
  OutputFormat format_;
  StagingFolder staging_;
  CPLStringList options_;
  DatasetPtr dataset_;
};

/// Throws `UsageError` when one of `files`, which an output at `target` is going to replace, is a
/// file of a raster that is open. Every such raster is being read: the input, a mask, whatever else
/// a command works with.
void RefuseReplacingInputs(const std::filesystem::path& target,
                           const std::vector<std::filesystem::path>& files);

/// Closes a dataset that was written; throws as `FailWriting` does when only that shows that
/// something was not.
void CloseChecked(DatasetPtr dataset, const std::string& name);

/// Throws `RunError` "cannot write ..." with `reason`, or the full disk, the used quota or the
/// largest size of a file where that is why.
[[noreturn]] void FailWriting(const std::string& name, const std::string& reason);

}  // namespace zarn::app
