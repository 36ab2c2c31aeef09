// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <filesystem>
#include <optional>

#include "apps/zarn/interruption.h"

namespace zarn::app {

/// A temporary folder beside an output file, in which the file and whatever a format puts next to
/// it (headers, auxiliary files) are written under their final names. `Publish` moves them into
/// place when they are whole. Otherwise, on an error or an interruption, the folder vanishes with
/// them and an existing output stays as it was.
class StagingFolder {
 public:
  /// Throws `RunError` when `target` exists (unless `overwrite`), is no regular file, or when its
  /// folder does not exist or cannot be written.
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

  /// Throws `RunError` when a file cannot be moved.
  void Publish();

 private:
  std::filesystem::path target_;
  std::filesystem::path folder_;
  std::optional<RemoveWhenInterrupted> removal_;
};

}  // namespace zarn::app
