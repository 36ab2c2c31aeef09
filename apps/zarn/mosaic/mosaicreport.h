// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "apps/zarn/mosaic/planner.h"
#include "apps/zarn/mosaic/sourcetally.h"
#include "apps/zarn/mosaic/tilecomposer.h"
#include "apps/zarn/stagingfolder.h"

namespace zarn::app {

/// The file of a report in its folder.
std::filesystem::path ReportFile(const std::string& folder);

/// The report of a mosaic: one page that shows what was done and how well the scenes agree.
///
/// It follows the making of the mosaic, so that it is refused before anything long begins, and
/// appears, whole, with `Publish`; destroyed before that it leaves no trace.
class MosaicReport {
 public:
  /// Creates the folder that `options` names where there is none. Throws `RunError` when it cannot
  /// be created or written, or has a report already (unless outputs may be overwritten).
  explicit MosaicReport(const MosaicOptions& options);

  /// To be called once, before the first tile.
  void Begin(const MosaicPlan& plan);
  /// A tile of the mosaic that is done, in any order.
  void Take(const TilePlan& tile, const TileBuffers& buffers);
  /// To be called when the mosaic is in its place. Throws `RunError`.
  void Publish(const Planning& planning);

 private:
  /// Folders that vanish again unless something has come into them.
  class NewFolders {
   public:
    explicit NewFolders(const std::filesystem::path& folder);
    ~NewFolders();
    NewFolders(const NewFolders&) = delete;
    NewFolders& operator=(const NewFolders&) = delete;

   private:
    std::vector<std::filesystem::path> created_;  ///< the innermost first
  };

  const MosaicOptions& options_;
  NewFolders folders_;
  StagingFolder staging_;
  std::optional<SourceTally> sources_;
};

}  // namespace zarn::app
