// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/estimate/ground.h"
#include "apps/zarn/mosaic/polygon.h"
#include "apps/zarn/outputgrid.h"
#include "apps/zarn/stagedoutput.h"
#include "apps/zarn/windows.h"
#include "host/mosaic/griddodgingsurface.h"

namespace zarn::app {

/// A file as it was when the plan was made.
struct FileState {
  std::string name;
  std::uint64_t bytes = 0;
  std::int64_t modified = 0;  ///< nanoseconds of the file system's clock

  /// Of a file that may be any name that GDAL opens; 0 for what is no file.
  static FileState Of(const std::string& name);
  bool operator==(const FileState&) const = default;
};

/// Filters that may run over the scenes before anything else.
struct SceneFilter {
  std::string name;  ///< "average", "median" or empty
  int size = 3;      ///< of the window
};

/// Corrections by surfaces over the mosaic: value -> (value - pivot) * gain + pivot + offset.
struct DodgingPlan {
  std::vector<double> pivots;  ///< per channel
  DodgingGrid gains;           ///< nodes in pixels of the mosaic
  DodgingGrid offsets;
};

/// What becomes of one scene.
struct ScenePlan {
  std::vector<FileState> files;  ///< the raster, then what belongs to it
  std::string label;             ///< what the map's legend and cutlines call it
  std::vector<double> noData;    ///< one per channel, or none
  /// Where its first pixel lies in the mosaic, if its pixels are those of the mosaic.
  std::optional<GridPlace> place;
  std::vector<std::vector<double>> hotSpot;  ///< six coefficients per channel, or none
  std::vector<double> gains;                 ///< per channel, or none
  std::vector<double> offsets;
  std::optional<DodgingPlan> dodging;
  Polygon cutline;  ///< in pixels of the mosaic; none: all of the scene
  Window reach;     ///< pixels of the mosaic that it may change
  Window covers;    ///< pixels of the mosaic that it covers

  const std::string& File() const { return files.front().name; }
};

/// A tile of the mosaic, the unit of work.
struct TilePlan {
  Window window;
  std::vector<std::size_t> scenes;  ///< that may change it, in the order of pasting
};

/// All that decides what a mosaic looks like. Written to a file and read back it gives the same
/// mosaic to the bit.
struct MosaicPlan {
  OutputGrid grid;
  OutputOptions output;
  std::string sourceMap;       ///< file, or empty
  std::vector<double> noData;  ///< of the mosaic, one per channel, or none
  std::string resampling = "cubic";
  double threshold = 0.125;  ///< error of positions allowed, in pixels of a scene
  SceneFilter filter;
  std::uint32_t feather = 0;
  bool fillsGaps = false;  ///< from other scenes, where a scene has no data within its cutline
  bool stopsOnNoData = false;
  std::int64_t tileSide = 1024;
  std::vector<ScenePlan> scenes;  ///< in the order of pasting
  /// The scene listed first: the mosaic's bands are its bands and are described as these are.
  std::size_t leading = 0;

  const ScenePlan& Leading() const { return scenes[leading]; }
  /// Row by row.
  std::vector<TilePlan> Tiles() const;
};

/// The plan as a file has it.
nlohmann::ordered_json ToJson(const MosaicPlan& plan);

/// Reads a plan; throws `UsageError` when the file is none.
MosaicPlan ReadPlan(const std::string& name);

/// A number that tells plans apart: equal plans have equal ones.
std::string Fingerprint(const MosaicPlan& plan);

/// A file's absolute name; other names that GDAL opens stay as they are.
std::string AbsoluteFile(const std::string& name);

/// The file of a raster and those that belong to it.
std::vector<FileState> FilesOf(const RasterSource& source);

/// Whether the output is to be a VRT, which joins tiles that stay files of their own.
bool IsVrt(const OutputOptions& output);

/// Throws `RunError`, naming the first of them, when files of the scenes are not as they were when
/// the plan was made.
void RequireUnchanged(const MosaicPlan& plan);

}  // namespace zarn::app
