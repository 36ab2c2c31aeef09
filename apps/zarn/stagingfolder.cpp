// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/stagingfolder.h"

#include <stdlib.h>

#include <cerrno>
#include <string>
#include <system_error>
#include <vector>

#include "apps/zarn/errors.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

// A symbolic link stays one: the file that it names is what gets replaced.
fs::path Resolved(const fs::path& target) {
  return fs::is_symlink(target) ? fs::weakly_canonical(target) : target;
}

void CheckTarget(const fs::path& target, bool overwrite) {
  std::error_code error;
  const fs::file_status status = fs::status(target, error);
  if (fs::exists(status) && !fs::is_regular_file(status)) {
    throw RunError(target.string() + " is not a regular file; name another output");
  }
  if (fs::exists(status) && !overwrite) {
    throw RunError(target.string() + " exists; add --overwrite to replace it");
  }
  const fs::path folder = target.parent_path();
  if (!folder.empty() && !fs::is_directory(folder, error)) {
    throw RunError("cannot write " + target.string() + ": there is no folder " + folder.string());
  }
}

// What GDAL keeps beside a file. Left over from the replaced file, it would be taken for the new
// one's.
void RemoveOldSidecars(const fs::path& target) {
  std::error_code error;
  for (const char* const suffix : {".aux.xml", ".msk", ".ovr", ".msk.ovr"}) {
    fs::remove(target.string() + suffix, error);
  }
}

}  // namespace

StagingFolder::StagingFolder(const fs::path& target, bool overwrite) : target_(Resolved(target)) {
  CheckTarget(target_, overwrite);
  std::string name = target_.string() + ".zarn-XXXXXX";
  const HoldInterruptions hold;
  if (mkdtemp(name.data()) == nullptr) {
    throw RunError("cannot write " + target_.string() + ": " +
                   std::generic_category().message(errno));
  }
  folder_ = name;
  removal_.emplace(folder_);
}

StagingFolder::~StagingFolder() {
  const HoldInterruptions hold;
  std::error_code error;
  fs::remove_all(folder_, error);
  removal_.reset();
}

fs::path StagingFolder::Scratch() const { return folder_ / (target_.filename() += ".scratch.tif"); }

void StagingFolder::Publish() {
  const HoldInterruptions hold;
  try {
    std::vector<fs::path> sidecars;
    for (const auto& entry : fs::directory_iterator(folder_)) {
      if (entry.path() != StagedFile()) sidecars.push_back(entry.path());
    }
    if (!fs::exists(StagedFile())) throw RunError("the format wrote no file");
    RemoveOldSidecars(target_);
    for (const fs::path& sidecar : sidecars) {
      fs::rename(sidecar, target_.parent_path() / sidecar.filename());
    }
    fs::rename(StagedFile(), target_);
  } catch (const std::exception& error) {
    throw RunError("cannot write " + target_.string() + ": " + error.what());
  }
}

}  // namespace zarn::app
