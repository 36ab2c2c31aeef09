// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/stagedoutput.h"

#include <cpl_error.h>

#include <cstdint>
#include <string>
#include <system_error>

#include "apps/zarn/carryover.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

const OutputOptions& RefusingInputs(const OutputOptions& options, const RasterSource& source) {
  const CPLStringList files(source.Dataset().GetFileList());
  for (int i = 0; i < files.size(); ++i) {
    std::error_code error;
    if (fs::equivalent(files[i], options.target, error)) {
      throw UsageError("the output " + options.target + " is a file of the input " + source.Name() +
                       "; name another output");
    }
  }
  return options;
}

int CPL_STDCALL UpdateCounter(double fraction, const char*, void* counter) {
  static_cast<nspio::Counter*>(counter)->Update(fraction);
  return TRUE;
}

void CloseChecked(DatasetPtr dataset, const std::string& name) {
  // Closing has no result of its own; a full disk shows only as a reported failure.
  const GdalFailureWatch watch;
  CPLErrorReset();
  dataset->FlushCache(true);
  dataset.reset();
  if (!watch.First().empty()) FailWriting(name, watch.First());
}

}  // namespace

void FailWriting(const std::string& name, const std::string& reason) {
  std::error_code error;
  const fs::path folder = fs::absolute(name, error).parent_path();
  const fs::space_info space = fs::space(folder, error);
  constexpr std::uintmax_t kNothingLeft = 1 << 16;
  const bool full = !error && space.available < kNothingLeft;
  throw RunError("cannot write " + name + ": " +
                 (full             ? "the disk is full; free some space or write elsewhere"
                  : reason.empty() ? "the file system refused it"
                                   : reason));
}

StagedOutput::StagedOutput(const OutputOptions& options, const RasterSource& like,
                           const std::vector<double>& noData)
    : format_(options.format, RefusingInputs(options, like).target, options.creation),
      staging_(options.target, options.overwrite) {
  RenameInMessages(staging_.StagedFile().string(), Name());
  RenameInMessages(staging_.Scratch().string(), Name());
  format_.RequireSamples(like.Type());
  Create(like);
  CarryOver(like, noData, *dataset_);
}

void StagedOutput::Create(const RasterSource& like) {
  const bool direct = format_.WritesBlocks();
  options_ = format_.OptionsFor(like);
  GDALDriver& driver =
      direct ? format_.Driver() : *GetGDALDriverManager()->GetDriverByName("GTiff");
  CPLStringList options = direct ? options_ : OutputFormat::ScratchOptionsFor(like);
  const fs::path file = direct ? staging_.StagedFile() : staging_.Scratch();
  CPLErrorReset();
  dataset_.reset(driver.Create(file.c_str(), like.Width(), like.Height(),
                               like.Dataset().GetRasterCount(), like.Type().gdal, options.List()));
  if (!dataset_) {
    throw RunError("cannot write " + Name() + ": " + LastGdalMessage(Name()));
  }
}

void StagedOutput::Publish(nspio::Counter& progress) {
  CloseChecked(std::move(dataset_), Name());
  if (!format_.WritesBlocks()) CopyToFormat(progress);
  staging_.Publish();
  progress.Update(1);
}

void StagedOutput::CopyToFormat(nspio::Counter& progress) {
  DatasetPtr scratch = OpenRaster(staging_.Scratch());
  CPLErrorReset();
  DatasetPtr copy(format_.Driver().CreateCopy(staging_.StagedFile().c_str(), scratch.get(), FALSE,
                                              options_.List(), UpdateCounter, &progress));
  if (!copy) FailWriting(Name(), LastGdalMessage(Name()));
  CloseChecked(std::move(copy), Name());
  scratch.reset();
  fs::remove(staging_.Scratch());
  fs::remove(staging_.Scratch().string() + ".aux.xml");
}

}  // namespace zarn::app
