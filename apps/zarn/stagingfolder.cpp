// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/stagingfolder.h"

#include <fcntl.h>
#include <gdal.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <cerrno>
#include <string>
#include <system_error>
#include <vector>

#include "apps/zarn/errors.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

// A symbolic link stays one: the file that it names is what gets written.
fs::path Resolved(fs::path target) {
  constexpr int kMostLinks = 40;
  std::error_code error;
  for (int links = 0; links < kMostLinks && fs::is_symlink(target, error); ++links) {
    target = target.parent_path() / fs::read_symlink(target, error);
  }
  return target;
}

[[noreturn]] void FailExisting(const fs::path& file) {
  throw RunError(file.string() + " exists; add --overwrite to replace it");
}

void RefuseOldSideFiles(const fs::path& target) {
  std::error_code error;
  for (const fs::path& file : SideFiles(target)) {
    if (!fs::exists(file, error)) continue;
    throw RunError(file.string() + " exists and would be taken for a part of " + target.string() +
                   "; add --overwrite to remove it, or name another output");
  }
}

void CheckTarget(const fs::path& given, const fs::path& target, bool overwrite) {
  std::error_code error;
  const fs::file_status status = fs::status(given, error);
  if (!fs::status_known(status)) {
    throw RunError("cannot write " + given.string() + ": " + error.message());
  }
  // Links below /dev and /proc may lead to an open file that has no name any more.
  const bool named = fs::is_regular_file(status) && fs::equivalent(given, target, error);
  if (fs::exists(status) && !named) {
    throw RunError(given.string() + " is not a regular file; name another output");
  }
  if (fs::exists(status) && !overwrite) FailExisting(target);
  const fs::path folder = target.parent_path();
  if (!folder.empty() && !fs::is_directory(folder, error)) {
    throw RunError("cannot write " + target.string() + ": there is no folder " + folder.string());
  }
  if (!overwrite) RefuseOldSideFiles(target);
}

[[noreturn]] void FailMoving(const fs::path& target, int error) {
  throw RunError("cannot write " + target.string() + ": " + std::generic_category().message(error));
}

// Does not replace a file that has appeared during the run.
void MoveToFree(const fs::path& from, const fs::path& to) {
  if (renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) return;
  // Not all file systems can do that; a second name is not given to an existing file either.
  if ((errno == EINVAL || errno == ENOSYS) && link(from.c_str(), to.c_str()) == 0) {
    unlink(from.c_str());
    return;
  }
  if (errno == EEXIST) FailExisting(to);
  // What cannot do either is left with asking first.
  std::error_code error;
  if (fs::exists(fs::symlink_status(to, error))) FailExisting(to);
  if (rename(from.c_str(), to.c_str()) != 0) FailMoving(to, errno);
}

}  // namespace

std::vector<fs::path> SideFiles(const fs::path& target) {
  const fs::path file = Resolved(target);
  std::vector<fs::path> files;
  for (const char* const suffix : {".aux.xml", ".msk", ".ovr", ".msk.ovr"}) {
    files.emplace_back(file.string() + suffix);
  }
  // Large pixels and pyramids of this format; beside any other they belong to another raster.
  const char* const spilling[] = {"HFA", nullptr};
  if (GDALIdentifyDriverEx(file.c_str(), GDAL_OF_RASTER, spilling, nullptr) != nullptr) {
    for (const char* const extension : {".ige", ".rrd"}) {
      files.push_back(fs::path(file).replace_extension(extension));
    }
  }
  return files;
}

StagingFolder::StagingFolder(const fs::path& target, bool overwrite)
    : target_(Resolved(target)), overwrite_(overwrite) {
  CheckTarget(target, target_, overwrite);
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

std::vector<fs::path> StagingFolder::StagedNames() const {
  std::vector<fs::path> names;
  for (const auto& entry : fs::directory_iterator(folder_)) {
    if (entry.path() != StagedFile()) names.push_back(entry.path().filename());
  }
  names.push_back(target_.filename());
  return names;
}

std::vector<fs::path> StagingFolder::FilesToPublish() const {
  std::vector<fs::path> files;
  for (const fs::path& name : StagedNames()) files.push_back(target_.parent_path() / name);
  return files;
}

void StagingFolder::Publish() {
  const HoldInterruptions hold;
  if (!fs::exists(StagedFile())) {
    throw RunError("cannot write " + target_.string() + ": the format wrote no file");
  }
  if (overwrite_) {
    ReplaceOldFiles();
  } else {
    RefuseOldSideFiles(target_);
    MoveToFreePlaces();
  }
}

void StagingFolder::ReplaceOldFiles() {
  std::error_code error;
  for (const fs::path& file : SideFiles(target_)) {
    // One that is replaced is never missing.
    if (!fs::exists(folder_ / file.filename(), error)) fs::remove(file, error);
  }
  for (const fs::path& name : StagedNames()) {
    const fs::path file = target_.parent_path() / name;
    if (rename((folder_ / name).c_str(), file.c_str()) != 0) FailMoving(file, errno);
  }
}

void StagingFolder::MoveToFreePlaces() try {
  for (const fs::path& name : StagedNames()) {
    const fs::path file = target_.parent_path() / name;
    MoveToFree(folder_ / name, file);
    created_.push_back(file);
  }
} catch (...) {
  Withdraw();
  throw;
}

void StagingFolder::Withdraw() {
  std::error_code error;
  for (const fs::path& file : created_) fs::remove(file, error);
  created_.clear();
}

}  // namespace zarn::app
