// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cpl_string.h>
#include <gdal_priv.h>

#include <string>
#include <vector>

#include "apps/zarn/dataset.h"

namespace zarn::app {

/// The GDAL driver of an output and its creation options.
class OutputFormat {
 public:
  /// `name` is a GDAL driver name; when empty, the extension of `target` decides, and a GeoTIFF is
  /// written when no format claims it. `options` are KEY=VALUE. Throws `UsageError` for an unknown
  /// or read-only format and for an option that is malformed or not one of the format's.
  OutputFormat(const std::string& name, const std::string& target,
               const std::vector<std::string>& options);

  std::string Name() const { return driver_->GetDescription(); }
  GDALDriver& Driver() const { return *driver_; }
  /// Whether blocks can be written as they come; otherwise the format only copies whole datasets.
  bool WritesBlocks() const;
  /// Throws `RunError` when the format has no such samples.
  void RequireSamples(const SampleType& type) const;
  /// The options for an output with the bands of `like`: the caller's, and for GeoTIFF tiles and
  /// compression where he did not choose himself.
  CPLStringList OptionsFor(const RasterSource& like) const;
  /// The same for an output of bands without colours.
  CPLStringList OptionsFor(const SampleType& type) const;
  /// Options for a quickly written GeoTIFF that a copying format then reads.
  static CPLStringList ScratchOptionsFor(const RasterSource& like);

 private:
  void RefuseUnknownOptions();

  GDALDriver* driver_;
  CPLStringList options_;
};

}  // namespace zarn::app
