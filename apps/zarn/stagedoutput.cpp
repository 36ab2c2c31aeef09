// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/stagedoutput.h"

#include <cpl_error.h>

#include <cerrno>
#include <cstdint>
#include <string>
#include <system_error>
#include <vector>

#include "apps/zarn/carryover.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

// What drivers say that cannot hold one does not tell.
constexpr const char* kMaskAdvice =
    "; if the format has no mask bands, mark pixels without data by a value (--dst-nodata) or "
    "write "
    "a GeoTIFF";

std::string TargetBesideInputs(const OutputOptions& options) {
  if (options.apartFromInputs) return options.target;
  std::vector<fs::path> files = SideFiles(options.target);
  files.emplace_back(options.target);
  RefuseReplacingInputs(options.target, files);
  return options.target;
}

int CPL_STDCALL UpdateCounter(double fraction, const char*, void* counter) {
  static_cast<nspio::Counter*>(counter)->Update(fraction);
  return TRUE;
}

// `last` is the value of errno: some drivers just return after a failed write.
int SpaceErrorAt(const std::string& name, int last) {
  if (const int reported = LastSpaceError(); reported != 0) return reported;
  if (IsSpaceError(last)) return last;
  std::error_code error;
  const fs::space_info space = fs::space(fs::absolute(name, error).parent_path(), error);
  constexpr std::uintmax_t kNothingLeft = 1 << 16;
  return !error && space.available < kNothingLeft ? ENOSPC : 0;
}

}  // namespace

void RefuseReplacingInputs(const fs::path& target, const std::vector<fs::path>& files) {
  int count = 0;
  GDALDataset* const* const inputs = GDALDataset::GetOpenDatasets(&count);
  for (int i = 0; i < count; ++i) {
    const CPLStringList parts(inputs[i]->GetFileList());
    for (int k = 0; k < parts.size(); ++k) {
      for (const fs::path& file : files) {
        std::error_code error;
        if (!fs::equivalent(parts[k], file, error)) continue;
        throw UsageError("the output " + target.string() +
                         (file == target ? " is" : " would replace " + file.string() + ",") +
                         " a file of the input " + inputs[i]->GetDescription() +
                         "; name another output");
      }
    }
  }
}

void FailWriting(const std::string& name, const std::string& reason) {
  const int last = errno;
  std::string cause = reason.empty() ? "the file system refused it" : reason;
  switch (SpaceErrorAt(name, last)) {
    case ENOSPC:
      cause = "the disk is full; free some space or write elsewhere";
      break;
    case EDQUOT:
      cause = "the disk quota is used up; free some space or write elsewhere";
      break;
    case EFBIG:
      cause = "it would be larger than files may become here (see ulimit -f); write elsewhere";
      break;
    default:
      break;
  }
  throw RunError("cannot write " + name + ": " + cause);
}

void CloseChecked(DatasetPtr dataset, const std::string& name) {
  // Closing has no result of its own: a full disk shows as a reported failure, and with drivers
  // that do not look at the last bytes only in what the system has left behind.
  const GdalFailureWatch watch;
  CPLErrorReset();
  errno = 0;
  dataset->FlushCache(true);
  dataset.reset();
  if (!watch.First().empty() || IsSpaceError(errno) || LastSpaceError() != 0)
    FailWriting(name, watch.First());
}

StagedOutput::StagedOutput(const OutputOptions& options, const RasterSource& like,
                           const std::vector<double>& noData, const OutputGrid* grid, bool masked)
    : apartFromInputs_(options.apartFromInputs),
      format_(options.format, TargetBesideInputs(options), options.creation),
      staging_(options.target, options.overwrite) {
  RenameInMessages(staging_.StagedFile().string(), Name());
  RenameInMessages(staging_.Scratch().string(), Name());
  format_.RequireSamples(like.Type());
  Create(like, grid);
  CarryOver(like, noData, *dataset_, grid, masked);
}

void StagedOutput::Create(const RasterSource& like, const OutputGrid* grid) {
  const bool direct = format_.WritesBlocks();
  options_ = format_.OptionsFor(like);
  GDALDriver& driver =
      direct ? format_.Driver() : *GetGDALDriverManager()->GetDriverByName("GTiff");
  CPLStringList options = direct ? options_ : OutputFormat::ScratchOptionsFor(like);
  const fs::path file = direct ? staging_.StagedFile() : staging_.Scratch();
  CPLErrorReset();
  dataset_.reset(driver.Create(file.c_str(), grid != nullptr ? grid->width : like.Width(),
                               grid != nullptr ? grid->height : like.Height(),
                               like.Dataset().GetRasterCount(), like.Type().gdal, options.List()));
  if (!dataset_) FailWriting(Name(), LastGdalMessage(Name()));
}

void StagedOutput::Publish(nspio::Counter& progress) {
  CloseChecked(std::move(dataset_), Name());
  if (!format_.WritesBlocks()) CopyToFormat(progress);
  if (!apartFromInputs_) RefuseReplacingInputs(staging_.Target(), staging_.FilesToPublish());
  staging_.Publish();
  progress.Update(1);
}

void StagedOutput::CopyToFormat(nspio::Counter& progress) {
  DatasetPtr scratch = OpenRaster(staging_.Scratch());
  CPLErrorReset();
  errno = 0;
  DatasetPtr copy(format_.Driver().CreateCopy(staging_.StagedFile().c_str(), scratch.get(), FALSE,
                                              options_.List(), UpdateCounter, &progress));
  if (!copy || IsSpaceError(errno)) {
    const bool masked = scratch->GetRasterBand(1)->GetMaskFlags() == GMF_PER_DATASET;
    FailWriting(Name(), LastGdalMessage(Name()) + (masked ? kMaskAdvice : ""));
  }
  CloseChecked(std::move(copy), Name());
  scratch.reset();
  fs::remove(staging_.Scratch());
  fs::remove(staging_.Scratch().string() + ".aux.xml");
}

}  // namespace zarn::app
