// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/updatedraster.h"

#include <cpl_error.h>
#include <cpl_string.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <system_error>
#include <utility>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/outputformat.h"
#include "apps/zarn/stagedoutput.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

// The files of a raster that lie in its folder, so that a copy elsewhere finds them by their names.
std::vector<fs::path> FilesBeside(const fs::path& file) {
  std::vector<fs::path> files;
  const DatasetPtr dataset = OpenRaster(file);
  const CPLStringList parts(dataset->GetFileList());
  for (int i = 0; i < parts.size(); ++i) {
    std::error_code error;
    const fs::path part(parts[i]);
    if (fs::is_regular_file(part, error) && part.parent_path() == file.parent_path()) {
      files.push_back(part);
    }
  }
  return files;
}

std::unique_ptr<StagingFolder> StageCopy(const std::string& name) {
  std::error_code error;
  if (!fs::is_regular_file(name, error)) {
    throw RunError(name + " is not a file, so no copy of it can be changed; add --in-place");
  }
  auto staging = std::make_unique<StagingFolder>(name, true);
  RenameInMessages(staging->StagedFile().string(), name);
  const std::vector<fs::path> files = FilesBeside(staging->Target());
  RefuseReplacingInputs(staging->Target(), files);
  for (const fs::path& file : files) {
    const fs::path copy = staging->StagedFile().parent_path() / file.filename();
    if (!fs::copy_file(file, copy, error)) {
      errno = error.value();
      FailWriting(name, error.message());
    }
    // A file that is protected against writing is replaced all the same, as everywhere.
    fs::permissions(copy, fs::perms::owner_write, fs::perm_options::add, error);
  }
  return staging;
}

DatasetPtr OpenForUpdate(const std::string& file, const std::string& name) {
  CPLErrorReset();
  DatasetPtr dataset(
      GDALDataset::Open(file.c_str(), GDAL_OF_RASTER | GDAL_OF_UPDATE | GDAL_OF_VERBOSE_ERROR));
  if (!dataset) throw RunError("cannot change " + name + ": " + LastGdalMessage(name));
  return dataset;
}

}  // namespace

UpdatedRaster::Opened UpdatedRaster::Open(const std::string& name, bool inPlace) {
  if (inPlace) {
    RefuseReplacingInputs(name, {name});
    return {nullptr, OpenForUpdate(name, name)};
  }
  std::unique_ptr<StagingFolder> staging = StageCopy(name);
  DatasetPtr dataset = OpenForUpdate(staging->StagedFile(), name);
  return {std::move(staging), std::move(dataset)};
}

UpdatedRaster::Opened UpdatedRaster::Create(const std::string& name, const RasterSource& like,
                                            const SampleType& type) {
  const OutputFormat format("", name, {});
  if (!format.WritesBlocks()) {
    throw UsageError(name + ": the format " + format.Name() +
                     " cannot be changed once written; name a .tif");
  }
  format.RequireSamples(type);
  auto staging = std::make_unique<StagingFolder>(name, false);
  RenameInMessages(staging->StagedFile().string(), name);
  CPLStringList options = format.OptionsFor(type);
  CPLErrorReset();
  DatasetPtr dataset(format.Driver().Create(staging->StagedFile().c_str(), like.Width(),
                                            like.Height(), 1, type.gdal, options.List()));
  if (!dataset) FailWriting(name, LastGdalMessage(name));
  std::array<double, 6> transform{};
  if (like.Dataset().GetSpatialRef() != nullptr) {
    dataset->SetSpatialRef(like.Dataset().GetSpatialRef());
  }
  if (like.Dataset().GetGeoTransform(transform.data()) == CE_None) {
    dataset->SetGeoTransform(transform.data());
  }
  dataset->GetRasterBand(1)->SetNoDataValue(0);
  return {std::move(staging), std::move(dataset)};
}

UpdatedRaster::UpdatedRaster(const std::string& name, Opened opened, bool created)
    : staging_(std::move(opened.staging)),
      source_(name, std::move(opened.dataset)),
      reader_(source_, unused_, {}),
      writer_(source_, source_.Dataset(), name),
      changed_(created) {
  if (source_.Masks().size() > 1) {
    throw RunError(name + " has a mask for each band; give it one for all of them");
  }
}

UpdatedRaster::UpdatedRaster(const std::string& name, bool inPlace)
    : UpdatedRaster(name, Open(name, inPlace), false) {}

UpdatedRaster::UpdatedRaster(const std::string& name, const RasterSource& like,
                             const SampleType& type)
    : UpdatedRaster(name, Create(name, like, type), true) {}

void UpdatedRaster::Read(const Window& window, WindowBuffers& buffers) {
  const std::lock_guard lock(mutex_);
  reader_.Read(window, nullptr, buffers);
  std::memcpy(buffers.output.Data(), buffers.samples.Data(), buffers.samples.Size());
}

void UpdatedRaster::Write(const WindowBuffers& buffers, bool sidesChanged) {
  const Plane& before = buffers.samples;
  if (!sidesChanged && std::memcmp(before.Data(), buffers.output.Data(), before.Size()) == 0) {
    return;
  }
  const std::lock_guard lock(mutex_);
  changed_ = true;
  writer_.Write(buffers);
}

void UpdatedRaster::Close() {
  // Statistics speak of the old pixels.
  if (changed_) source_.Dataset().ClearStatistics();
  const bool hasOverviews =
      source_.Dataset().GetRasterBand(source_.Channels().front())->GetOverviewCount() > 0;
  CloseChecked(source_.TakeDataset(), source_.Name());
  if (changed_ && hasOverviews) {
    Warn("the overviews of " + source_.Name() +
         " still show the old pixels; renew them with "
         "gdaladdo");
  }
}

void UpdatedRaster::Publish() {
  if (staging_ && changed_) staging_->Publish();
}

}  // namespace zarn::app
