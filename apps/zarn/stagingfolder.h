// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <filesystem>
#include <optional>
#include <vector>

#include "apps/zarn/interruption.h"

namespace zarn::app {

/// Files beside `target` that GDAL would take for parts of it by their names, whether they exist or
/// not. When a file is replaced those of the old one are removed.
std::vector<std::filesystem::path> SideFiles(const std::filesystem::path& target);

/// A temporary folder beside an output file, in which the file and whatever a format puts next to
/// it (headers, auxiliary files) are written under their final names. `Publish` moves them into
/// place when they are whole. Otherwise, on an error or an interruption, the folder vanishes with
/// them and an existing output stays as it was.
class StagingFolder {
 public:
  /// Throws `RunError` when `target` or one of its `SideFiles` exists (unless `overwrite`), when it
  /// is no regular file, or when its folder does not exist or cannot be written.
  StagingFolder(const std::filesystem::path& target, bool overwrite);
  ~StagingFolder();
  StagingFolder(const StagingFolder&) = delete;
  StagingFolder& operator=(const StagingFolder&) = delete;

  /// The file in its final place.
  const std::filesystem::path& Target() const { return target_; }
  /// Where to write the file.
  std::filesystem::path StagedFile() const { return folder_ / target_.filename(); }
  /// A further temporary file, to be removed before `Publish`.
  std::filesystem::path Scratch() const;

  /// What `Publish` is going to put into place: the file and what the format wrote beside it.
  std::vector<std::filesystem::path> FilesToPublish() const;

  /// Throws `RunError` when a file cannot be moved. Without `overwrite` no file is replaced, also
  /// none that has appeared since; then nothing is published.
  void Publish();
  /// Takes back what was published, for outputs that belong together. What has replaced a file
  /// stays.
  void Withdraw();

 private:
  // The main file last: once it is there, it is complete.
  std::vector<std::filesystem::path> StagedNames() const;
  void ReplaceOldFiles();
  void MoveToFreePlaces();

  std::filesystem::path target_;
  bool overwrite_;
  std::filesystem::path folder_;
  std::vector<std::filesystem::path> created_;
  std::optional<RemoveWhenInterrupted> removal_;
};

}  // namespace zarn::app
