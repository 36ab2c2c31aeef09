// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/stagingfolder.h"

namespace zarn::app {

/// Throws `UsageError` when `target` is one of the files of `sources`.
void RefuseAsOutput(const std::string& target, const std::vector<RasterSource>& sources);

/// A parameter file for another command. It is written in a temporary place and appears at its
/// target, whole, with `Publish`; destroyed before that it leaves no trace.
class StagedJson {
 public:
  /// Throws `RunError` when the target exists (unless `overwrite`) or cannot be written.
  StagedJson(const std::string& target, bool overwrite) : staging_(target, overwrite) {}

  std::string Name() const { return staging_.Target().string(); }
  /// Throws `RunError` when the file cannot be written whole.
  void Write(const nlohmann::ordered_json& content);
  void Publish() { staging_.Publish(); }

 private:
  StagingFolder staging_;
};

}  // namespace zarn::app
